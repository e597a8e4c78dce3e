// The command line, read by the rows of the option table; the help, made of them.
#include "options.h"

#include "option_table.h"
#include "trace_file_fmt.h"

#include <algorithm>
#include <cstdio>
#include <getopt.h>
#include <vector>

namespace {

constexpr char DEFAULT_START[] = "2026-03-14 14:03:05";

constexpr char HELP_BEGIN[] = R"(Usage: kelvo_sample [option...]
Makes a directory of sample traces with the template files that print them, or
keeps appending to such traces (--live). The same options make the same bytes.
)";
constexpr char HELP_END[] = R"(
Examples:
  kelvo_sample && kelvo -t kelvo-samples kelvo-samples/*.trc
  kelvo_sample -d big -p mixed -n 8 -r 1000000
  kelvo_sample -d live --live & kelvo -f -t live live/*.trc

The exit status is 0, or 1 after a message on standard error.
)";

void print_help() {
    constexpr int COLUMN = 25; // where texts begin
    fputs(HELP_BEGIN, stdout);
    for (const option_row& row : option_rows()) {
        if (row.pSection != nullptr)
            printf("\n%s:\n", row.pSection);
        std::string sOption = row.letter != 0 ? std::string("  -") + row.letter + ", " : "      ";
        sOption.append("--").append(row.pName);
        if (row.pValue != nullptr)
            sOption.append("=").append(row.pValue);
        std::string_view help = row.pHelp;
        for (bool bMore = true; bMore; sOption.clear()) {
            const std::string_view line = help.substr(0, help.find('\n'));
            printf("%-*s%.*s\n", COLUMN, sOption.c_str(), static_cast<int>(line.size()),
                   line.data());
            bMore = line.size() != help.size();
            help.remove_prefix(std::min(line.size() + 1, help.size()));
        }
    }
    fputs(HELP_END, stdout);
}

/// getopt_long returns the row of an option and this; short forms return their
/// letter.
constexpr int LONG_OPTION = 256;

const option_row* row_of(int code) {
    if (code >= LONG_OPTION)
        return &option_rows()[static_cast<size_t>(code - LONG_OPTION)];
    for (const option_row& row : option_rows())
        if (row.letter != 0 && row.letter == code)
            return &row;
    return nullptr;
}

options_result invalid(const char* pFormat, const char* pName = "", const char* pText = "") {
    fputs("kelvo_sample: ", stderr);
    fprintf(stderr, pFormat, pName, pText);
    fputs("\nTry \"kelvo_sample --help\".\n", stderr);
    return options_result::INVALID;
}

/// What getopt_long wants to know of the rows; the letters go to `*pLetters`.
std::vector<option> long_options(std::string* pLetters) {
    std::vector<option> options;
    for (const option_row& row : option_rows()) {
        const bool bHasValue = row.pValue != nullptr;
        options.push_back({row.pName, bHasValue ? required_argument : no_argument, nullptr,
                           LONG_OPTION + static_cast<int>(options.size())});
        if (row.letter != 0)
            pLetters->append(1, row.letter).append(bHasValue ? ":" : "");
    }
    options.push_back({});
    return options;
}

std::vector<std::string_view> words_of(std::string_view text) {
    std::vector<std::string_view> words;
    for (size_t uEnd = 0; uEnd != text.npos; text.remove_prefix(uEnd + (uEnd != text.npos))) {
        uEnd = text.find(' ');
        words.push_back(text.substr(0, uEnd));
    }
    return words;
}

/// Reads the value of one option; false, with a message, when it has no such value.
bool read_value(const option_row& row, option_input in) {
    std::string sExpected;
    bool bGood = true;
    if (row.pChoices != nullptr) {
        const std::vector<std::string_view> words = words_of(row.pChoices);
        in.uChoice = static_cast<size_t>(std::ranges::find(words, in.value) - words.begin());
        bGood = in.uChoice < words.size();
        for (const std::string_view word : words)
            sExpected.append(sExpected.empty()      ? ""
                             : word == words.back() ? " or "
                                                    : ", ")
                .append(word);
    } else if (row.pExpected != nullptr) {
        sExpected = row.pExpected;
    }
    if (bGood && row.read(in))
        return true;
    sExpected.append(", not \"").append(in.value).append("\"");
    invalid("--%s takes %s", row.pName, sExpected.c_str());
    return false;
}

/// Reads all options. `*pStart` is the text of --start.
options_result read_all(int argc, char** argv, sample_options* pOptions, std::string* pStart,
                        bool* pProfileGiven) {
    std::string sLetters;
    const std::vector<option> options = long_options(&sLetters);
    for (int code;
         (code = getopt_long(argc, argv, sLetters.c_str(), options.data(), nullptr)) != -1;) {
        const option_row* const pRow = row_of(code);
        if (pRow == nullptr) { // getopt_long has said why
            fputs("Try \"kelvo_sample --help\".\n", stderr);
            return options_result::INVALID;
        }
        if (pRow->read == nullptr) {
            print_help();
            return options_result::DONE;
        }
        const char* const pValue = optarg != nullptr ? optarg : "";
        if (!read_value(*pRow, {pValue, 0, pOptions, pStart, pProfileGiven}))
            return options_result::INVALID;
    }
    if (optind < argc)
        return invalid("unexpected argument \"%s\"%s", argv[optind]);
    return options_result::RUN;
}

} // namespace

options_result parse_options(int argc, char** argv, sample_options* pOptions) {
    std::string sStart = DEFAULT_START;
    bool bProfileGiven = false;
    const options_result result = read_all(argc, argv, pOptions, &sStart, &bProfileGiven);
    if (result != options_result::RUN)
        return result;
    const bool bZone = pOptions->iMinutesWest != TRC_TZ_NOT_RECORDED;
    if (!read_start(sStart, bZone ? pOptions->iMinutesWest : 0, &pOptions->uStart))
        return invalid("--start takes \"YYYY-MM-DD HH:MM:SS\" or @SECONDS between 1970 and 2400%s,"
                       " not \"%s\"",
                       "", sStart.c_str());
    if (pOptions->bNumbered && !bProfileGiven)
        pOptions->profile = sample_profile::PLAIN;
    if (pOptions->bNumbered &&
        (pOptions->profile == sample_profile::STORY || pOptions->profile == sample_profile::MIXED))
        return invalid("--numbered goes with the profiles plain, numbers, strings and data%s%s");
    if (!pOptions->bLive && pOptions->uSeconds != 0)
        return invalid("--seconds goes with --live%s%s");
    if (pOptions->bLive && pOptions->damage != sample_damage::NONE)
        return invalid("--damage does not go with --live%s%s");
    return result;
}
