// All that is known of each option: how it is given, what it takes, what the
// help says, and where its value goes. The help, the completions of shells and
// the reading of the command line are made from these rows.
#pragma once

#include "options.h"

#include <span>
#include <string_view>

/// What the reading of one value needs besides the text.
struct option_input {
    std::string_view value;
    size_t uChoice; ///< which of the row's choices `value` is
    sample_options* pOptions;
    std::string* pStart; ///< kept as text until the time zone is known
    bool* pProfileGiven;
};

struct option_row {
    const char* pName;
    char letter;           ///< 0: no short form
    const char* pValue;    ///< its value in the help; DIR is a directory; null: it takes none
    const char* pChoices;  ///< all that the value may be, a blank between; null: see pExpected
    const char* pExpected; ///< else what the value must be
    const char* pHelp;     ///< lines; the first piece, up to one of ",:;(", is a summary
    bool (*read)(const option_input& in); ///< false: no such value
    const char* pSection = nullptr;       ///< heading of the help that begins here
};

/// In the order of the help. The last one, without a reader, is the help.
std::span<const option_row> option_rows();

/// "YYYY-MM-DD HH:MM:SS" in a zone, or "@SECONDS"; nanoseconds since the epoch.
bool read_start(std::string_view text, int iMinutesWest, uint64_t* pValue);
