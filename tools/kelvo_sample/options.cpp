// Every option is a row of a table and a small function that reads its value.
#include "options.h"

#include "help.h"
#include "trace_file_fmt.h"

#include <charconv>
#include <chrono>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <getopt.h>
#include <string_view>

namespace {

constexpr uint64_t SECOND_NS = 1'000'000'000;
constexpr char DEFAULT_START[] = "2026-03-14 14:03:05";
constexpr int MAX_MINUTES_WEST = 24 * 60;

/// What the reading of one value needs besides the text.
struct option_input {
    std::string_view value;
    sample_options* pOptions;
    std::string* pStart; ///< kept as text until the time zone is known
    bool* pProfileGiven;
};

bool read_number(std::string_view text, uint64_t uMin, uint64_t uMax, uint64_t* pValue) {
    const auto [pEnd, error] = std::from_chars(text.data(), text.data() + text.size(), *pValue);
    return error == std::errc{} && pEnd == text.data() + text.size() && *pValue >= uMin &&
           *pValue <= uMax;
}

template <class T>
bool read_number(std::string_view text, uint64_t uMin, uint64_t uMax, T* pValue) {
    uint64_t uValue = 0;
    if (!read_number(text, uMin, uMax, &uValue))
        return false;
    *pValue = static_cast<T>(uValue);
    return true;
}

struct unit {
    std::string_view name;
    uint64_t uFactor;
};

/// A number with one of the units behind it; the first unit that fits counts,
/// an empty name fits always.
template <size_t N> bool read_with_unit(std::string_view text, const unit (&units)[N],
                                        uint64_t uMax, uint64_t* pValue) {
    for (const auto& [name, uFactor] : units) {
        if (!text.ends_with(name))
            continue;
        if (!read_number(text.substr(0, text.size() - name.size()), 0, uMax / uFactor, pValue))
            return false;
        *pValue *= uFactor;
        return true;
    }
    return false;
}

bool read_size(std::string_view text, uint64_t* pValue) {
    static constexpr unit UNITS[] = {{"k", 1 << 10}, {"M", 1 << 20}, {"G", 1 << 30}, {"", 1}};
    return read_with_unit(text, UNITS, UINT32_MAX, pValue);
}

bool read_duration(std::string_view text, uint64_t* pValue) {
    static constexpr unit UNITS[] = {{"ns", 1}, {"us", 1'000}, {"ms", 1'000'000}, {"s", SECOND_NS}};
    return read_with_unit(text, UNITS, 1'000'000 * SECOND_NS, pValue);
}

/// "YYYY-MM-DD HH:MM:SS" in a zone, or "@SECONDS".
bool read_start(std::string_view text, int iMinutesWest, uint64_t* pValue) {
    constexpr uint64_t LAST_SECOND = 16'000'000'000; // in the year 2477
    uint64_t uSeconds = 0;
    if (text.starts_with('@')) {
        if (!read_number(text.substr(1), 0, LAST_SECOND, &uSeconds))
            return false;
        *pValue = uSeconds * SECOND_NS;
        return true;
    }
    tm t{};
    const std::string sText(text);
    const char* const pEnd = strptime(sText.c_str(), "%Y-%m-%d %H:%M:%S", &t);
    if (pEnd == nullptr || *pEnd != '\0')
        return false;
    const std::chrono::year_month_day date(std::chrono::year(t.tm_year + 1900),
                                           std::chrono::month(static_cast<unsigned>(t.tm_mon + 1)),
                                           std::chrono::day(static_cast<unsigned>(t.tm_mday)));
    if (!date.ok())
        return false;
    const int64_t iDays = std::chrono::sys_days(date).time_since_epoch().count();
    const int64_t iSeconds =
        iDays * 86400 + t.tm_hour * 3600 + t.tm_min * 60 + t.tm_sec + int64_t{iMinutesWest} * 60;
    if (iSeconds < 0 || iSeconds > static_cast<int64_t>(LAST_SECOND))
        return false;
    *pValue = static_cast<uint64_t>(iSeconds) * SECOND_NS;
    return true;
}

bool read_zone(std::string_view text, int32_t* pMinutesWest) {
    if (text == "none") {
        *pMinutesWest = TRC_TZ_NOT_RECORDED;
        return true;
    }
    const auto [pEnd, error] =
        std::from_chars(text.data(), text.data() + text.size(), *pMinutesWest);
    return error == std::errc{} && pEnd == text.data() + text.size() &&
           *pMinutesWest >= -MAX_MINUTES_WEST && *pMinutesWest <= MAX_MINUTES_WEST &&
           *pMinutesWest != TRC_TZ_NOT_RECORDED;
}

bool read_profile(const option_input& in) {
    static constexpr struct {
        std::string_view name;
        sample_profile profile;
    } PROFILES[] = {
        {"story", sample_profile::STORY},     {"plain", sample_profile::PLAIN},
        {"numbers", sample_profile::NUMBERS}, {"strings", sample_profile::STRINGS},
        {"data", sample_profile::DATA},       {"mixed", sample_profile::MIXED},
    };
    for (const auto& [name, profile] : PROFILES)
        if (in.value == name) {
            in.pOptions->profile = profile;
            *in.pProfileGiven = true;
            return true;
        }
    return false;
}

struct option_row {
    const char* pName;
    char letter;           ///< 0: no short form
    const char* pExpected; ///< what the value must be; null: takes none
    bool (*read)(const option_input& in);
};

constexpr option_row OPTIONS[] = {
    {"directory", 'd', "the name of a directory",
     [](const option_input& in) {
         in.pOptions->directory = in.value;
         return !in.value.empty();
     }},
    {"profile", 'p', "story, plain, numbers, strings, data or mixed", read_profile},
    {"files", 'n', "a number from 1 to 10000",
     [](const option_input& in) { return read_number(in.value, 1, 10'000, &in.pOptions->uFiles); }},
    {"records", 'r', "a number from 1 on",
     [](const option_input& in) {
         return read_number(in.value, 1, UINT64_MAX, &in.pOptions->uRecords);
     }},
    {"count", 0, "a number from 1 on",
     [](const option_input& in) {
         return read_number(in.value, 1, UINT64_MAX, &in.pOptions->uRecords);
     }},
    {"file-size", 's', "a size from 512 to 4 GiB, a multiple of 4",
     [](const option_input& in) {
         return read_size(in.value, &in.pOptions->uFileSize) && in.pOptions->uFileSize >= 512 &&
                in.pOptions->uFileSize % 4 == 0;
     }},
    {"record-size", 0, "a size from 80 to 1M",
     [](const option_input& in) {
         uint64_t uSize = 0;
         const bool bGood = read_size(in.value, &uSize) && uSize >= 80 && uSize <= 1 << 20;
         in.pOptions->uRecordSize = static_cast<uint32_t>(uSize);
         return bGood;
     }},
    {"threads", 0, "a number from 1 to 100000",
     [](const option_input& in) {
         return read_number(in.value, 1, 100'000, &in.pOptions->uThreads);
     }},
    {"addr", 0, "32 or 64",
     [](const option_input& in) {
         return read_number(in.value, 32, 64, &in.pOptions->uAddrBits) &&
                in.pOptions->uAddrBits % 32 == 0;
     }},
    {"seed", 0, "a number",
     [](const option_input& in) {
         return read_number(in.value, 0, UINT64_MAX, &in.pOptions->uSeed);
     }},
    {"start", 0, "\"YYYY-MM-DD HH:MM:SS\" or @SECONDS",
     [](const option_input& in) {
         *in.pStart = in.value;
         return true;
     }},
    {"step", 0, "a time such as 10us, 1ms or 2s",
     [](const option_input& in) { return read_duration(in.value, &in.pOptions->uStep); }},
    {"times", 0, "interleave or sequential",
     [](const option_input& in) {
         in.pOptions->bSequential = in.value == "sequential";
         return in.pOptions->bSequential || in.value == "interleave";
     }},
    {"distinct-bases", 0, nullptr,
     [](const option_input& in) { return in.pOptions->bDistinctBases = true; }},
    {"zone", 0, "minutes west of UTC, -1440 to 1440 and not -1, or none",
     [](const option_input& in) { return read_zone(in.value, &in.pOptions->iMinutesWest); }},
    {"numbered", 0, nullptr, [](const option_input& in) { return in.pOptions->bNumbered = true; }},
    {"live", 0, nullptr, [](const option_input& in) { return in.pOptions->bLive = true; }},
    {"rate", 0, "a number up to 1000000000",
     [](const option_input& in) {
         return read_number(in.value, 0, 1'000'000'000, &in.pOptions->uRate);
     }},
    {"seconds", 0, "a number from 1 to 1000000000",
     [](const option_input& in) {
         return read_number(in.value, 1, 1'000'000'000, &in.pOptions->uSeconds);
     }},
    {"help", 'h', nullptr, nullptr},
};
constexpr size_t OPTION_COUNT = std::size(OPTIONS);
/// getopt_long returns the row of an option and this; short forms return their
/// letter.
constexpr int LONG_OPTION = 256;

const option_row* row_of(int code) {
    if (code >= LONG_OPTION)
        return &OPTIONS[code - LONG_OPTION];
    for (const option_row& row : OPTIONS)
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

/// Reads all options. `*pStart` is the text of --start.
options_result read_all(int argc, char** argv, sample_options* pOptions, std::string* pStart,
                        bool* pProfileGiven) {
    option longOptions[OPTION_COUNT + 1] = {};
    std::string sLetters;
    for (size_t i = 0; i < OPTION_COUNT; ++i) {
        const option_row& row = OPTIONS[i];
        const bool bHasValue = row.pExpected != nullptr;
        longOptions[i] = {row.pName, bHasValue ? required_argument : no_argument, nullptr,
                          LONG_OPTION + static_cast<int>(i)};
        if (row.letter != 0)
            sLetters.append(1, row.letter).append(bHasValue ? ":" : "");
    }
    for (int code;
         (code = getopt_long(argc, argv, sLetters.c_str(), longOptions, nullptr)) != -1;) {
        const option_row* const pRow = row_of(code);
        if (pRow == nullptr) { // getopt_long has said why
            fputs("Try \"kelvo_sample --help\".\n", stderr);
            return options_result::INVALID;
        }
        if (pRow->read == nullptr) {
            fputs(HELP_TEXT, stdout);
            return options_result::DONE;
        }
        const char* const pValue = optarg != nullptr ? optarg : "";
        if (!pRow->read({pValue, pOptions, pStart, pProfileGiven})) {
            const std::string sExpected = std::string(pRow->pExpected) + ", not \"" + pValue + "\"";
            return invalid("--%s takes %s", pRow->pName, sExpected.c_str());
        }
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
    return result;
}
