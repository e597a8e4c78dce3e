// The messages of the templates.
#pragma once

#include "kelvo.h"

#include <gtest/gtest.h>

#include <sstream>
#include <string>
#include <string_view>

/// The messages that `action` writes to standard error, without the program
/// name and the newlines, joined by " | ".
template <class Action> std::string messages_of(Action action) {
    constexpr std::string_view PROGRAM = "kelvo: ";
    anchor.pProgName = "kelvo";
    testing::internal::CaptureStderr();
    action();
    std::istringstream captured(testing::internal::GetCapturedStderr());
    std::string messages;
    for (std::string line; std::getline(captured, line);) {
        if (!line.empty())
            messages += (messages.empty() ? "" : " | ") +
                        line.substr(line.starts_with(PROGRAM) ? PROGRAM.size() : 0);
    }
    return messages;
}
