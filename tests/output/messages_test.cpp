#include "messages.h"

#include "handover.h"
#include "insufficient.h"
#include "kelvo.h"
#include "print.h"
#include "stdout_stream.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <string>
#include <thread>

using testing::internal::CaptureStderr;
using testing::internal::CaptureStdout;
using testing::internal::GetCapturedStderr;
using testing::internal::GetCapturedStdout;

namespace {

TEST(Messages, AreWholeOnStandardErrorAndCutOnStandardOutput) {
    std::string expected = "kelvo: 2625-105 File \"x\" is too small to be a trace file.\n\n";
    CaptureStderr();
    output_err_message("%s: 2625-105 File \"%s\" is too small to be a trace file.\n", "kelvo", "x");
    for (const size_t size : {0U, 4068U, 4069U, 4095U, 4096U, 70000U}) {
        const std::string longName(size, 'n');
        output_sys_message("%s", ENOENT, longName.c_str());
        expected += longName + " No such file or directory\n";
    }
    EXPECT_EQ(GetCapturedStderr(), expected);

    CaptureStdout();
    output_message("%s", std::string(5000, 'a').c_str());
    const char* volatile pRefused = "%2147483648d"; // the compiler would warn of it
    output_printf(pRefused, 1);
    stdout_flush();
    EXPECT_EQ(GetCapturedStdout(), std::string(4095, 'a') + "kelvo error in output_vprintf()");
}

// Texts of another thread wait for the main thread, in order, and end a record
// that was given up.
TEST(Handover, KeepsTheOrderForTheMainThread) {
    CaptureStdout();
    CaptureStderr();
    anchor.threadId = pthread_self();
    std::thread([] {
        output_message("%s: in use\n", "kelvo");
        warn_insufficient_resources_during_open("trace", 1L << 40);
        warn_insufficient_resources(nullptr, 1);
        output_message("last\n");
    }).join();
    EXPECT_TRUE(stdout_is_empty());
    anchor.curColumn = 5;
    anchor.currentIndent = 5;
    anchor.outputFlags = OUTPUT_START_PENDING;
    stdout_write("12345");
    write_handed_over_output();
    write_handed_over_output();
    warn_insufficient_resources_during_open("main", 8);
    anchor.threadId = {};
    EXPECT_EQ(GetCapturedStdout(),
              "12345\nkelvo: in use\nlast\n\t[INSUFFICIENT MEMORY TO PROCESS]\n"
              "\t[INSUFFICIENT MEMORY TO PROCESS]\n");
    EXPECT_EQ(GetCapturedStderr(),
              "WARNING: Insufficient memory (size=1099511627776) to process: trace\n"
              "WARNING: Insufficient memory (size=8) to process: main\n");
    EXPECT_EQ(insufficient_resources_warnings(), 2U);
    EXPECT_EQ(insufficient_resources_warnings_during_open(), 2U);
}

} // namespace
