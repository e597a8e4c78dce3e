#include "option_table.h"

#include "trace_file_fmt.h"

#include <charconv>
#include <chrono>
#include <ctime>

namespace {

constexpr uint64_t SECOND_NS = 1'000'000'000;
constexpr int MAX_MINUTES_WEST = 24 * 60;

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

constexpr option_row OPTIONS[] = {
    {"directory", 'd', "DIR", nullptr, "the name of a directory",
     "directory for NAME.trc and COMP.tpl, made if it is not\n"
     "there (default kelvo-samples). Files of the same names\n"
     "are replaced, other files are left alone.",
     [](const option_input& in) {
         in.pOptions->directory = in.value;
         return !in.value.empty();
     },
     "Where and how much"},
    {"files", 'n', "N", nullptr, "a number from 1 to 10000",
     "number of trace files (default 3). The story takes\n"
     "three files for each run of its service.",
     [](const option_input& in) { return read_number(in.value, 1, 10'000, &in.pOptions->uFiles); }},
    {"records", 'r', "N", nullptr, "a number from 1 on",
     "records per file (default: the story as it is told,\n"
     "1000 for the other profiles, no end with --live)",
     [](const option_input& in) {
         return read_number(in.value, 1, UINT64_MAX, &in.pOptions->uRecords);
     }},
    {"count", 0, "N", nullptr, "a number from 1 on", "the same as --records",
     [](const option_input& in) {
         return read_number(in.value, 1, UINT64_MAX, &in.pOptions->uRecords);
     }},
    {"file-size", 's', "SIZE", nullptr, "a size from 512 to 4 GiB, a multiple of 4",
     "size of a file, with k, M or G for 1024, 1024^2 or\n"
     "1024^3 bytes. Smaller than the records need: the ring\n"
     "wraps and the oldest are lost. (Default: all records\n"
     "fit, 1M with --live. In the story as it is told the\n"
     "storage daemon's ring has wrapped.)",
     [](const option_input& in) {
         return read_size(in.value, &in.pOptions->uFileSize) && in.pOptions->uFileSize >= 512 &&
                in.pOptions->uFileSize % 4 == 0;
     }},
    {"profile", 'p', "PROFILE", "story plain numbers strings data mixed", nullptr,
     "what the records say:\n"
     "  story    a gateway, an order service and a storage\n"
     "           daemon at work (default)\n"
     "  plain    one number\n"
     "  numbers  three numbers and a string\n"
     "  strings  two strings\n"
     "  data     a number, a string, a formatted block and a\n"
     "           hex dump\n"
     "  mixed    every kind of record, nested calls\n"
     "Records of kinds 17, 19 and 0xFFFE (in story and\n"
     "mixed) stand in the files but are not printed.",
     [](const option_input& in) {
         in.pOptions->profile = static_cast<sample_profile>(in.uChoice);
         return *in.pProfileGiven = true;
     },
     "What"},
    {"numbered", 0, nullptr, nullptr, nullptr,
     "number the records of each file from 0 on, instead of\n"
     "random values, dropped records included: gaps show\n"
     "what is missing (not for story and mixed; without -p\n"
     "it means plain)",
     [](const option_input& in) { return in.pOptions->bNumbered = true; }},
    {"record-size", 0, "SIZE", nullptr, "a size from 80 to 1M",
     "length of records that can have any: strings, data,\n"
     "and those kinds in mixed (default 128)",
     [](const option_input& in) {
         uint64_t uSize = 0;
         const bool bGood = read_size(in.value, &uSize) && uSize >= 80 && uSize <= 1 << 20;
         in.pOptions->uRecordSize = static_cast<uint32_t>(uSize);
         return bGood;
     }},
    {"threads", 0, "N", nullptr, "a number from 1 to 100000",
     "threads that write to each file (default 4; the story\n"
     "has its own)",
     [](const option_input& in) {
         return read_number(in.value, 1, 100'000, &in.pOptions->uThreads);
     }},
    {"addr", 0, "32|64", "32 64", nullptr, "addressing mode of the traced programs (default 64)",
     [](const option_input& in) {
         in.pOptions->uAddrBits = in.uChoice == 0 ? 32 : 64;
         return true;
     }},
    {"seed", 0, "N", nullptr, "a number", "choose other contents (default 1)",
     [](const option_input& in) {
         return read_number(in.value, 0, UINT64_MAX, &in.pOptions->uSeed);
     }},
    {"damage", 0, "KIND", "gap torn function fillers header", nullptr,
     "damage the first file when it is complete:\n"
     "  gap       five numbers are missing in the middle\n"
     "  torn      the writer died with the newest record\n"
     "            half written\n"
     "  function  a record in the middle is of no kind\n"
     "            that exists\n"
     "  fillers   all records are made fillers\n"
     "  header    the header names another file size\n"
     "(not with --live)",
     [](const option_input& in) {
         in.pOptions->damage = static_cast<sample_damage>(in.uChoice + 1);
         return true;
     }},
    {"start", 0, "TIME", nullptr, "\"YYYY-MM-DD HH:MM:SS\" or @SECONDS",
     "time of the first record, \"YYYY-MM-DD HH:MM:SS\" in the\n"
     "traces' time zone, or @SECONDS since the epoch\n"
     "(default 2026-03-14 14:03:05)",
     [](const option_input& in) {
         *in.pStart = in.value;
         return true;
     },
     "When"},
    {"step", 0, "TIME", nullptr, "a time such as 10us, 1ms or 2s",
     "time from one record to the next, with ns, us, ms or s\n"
     "(default 10us; the story has its own)",
     [](const option_input& in) { return read_duration(in.value, &in.pOptions->uStep); }},
    {"times", 0, "ORDER", "interleave sequential", nullptr,
     "order of the files in time:\n"
     "  interleave  their records alternate (default)\n"
     "  sequential  each file begins when the one before it\n"
     "              has ended\n"
     "In the story each run of the service counts as one.",
     [](const option_input& in) {
         in.pOptions->bSequential = in.uChoice == 1;
         return true;
     }},
    {"distinct-bases", 0, nullptr, nullptr, nullptr,
     "every file counts time from a moment of its own (the\n"
     "story's files always do)",
     [](const option_input& in) { return in.pOptions->bDistinctBases = true; }},
    {"zone", 0, "MINUTES", nullptr, "minutes west of UTC, -1440 to 1440 and not -1, or none",
     "time zone in the files, minutes west of UTC, or \"none\"\n"
     "(default -60)",
     [](const option_input& in) { return read_zone(in.value, &in.pOptions->iMinutesWest); }},
    {"live", 0, nullptr, nullptr, nullptr,
     "append to the files, with the time of day, until\n"
     "SIGINT, SIGTERM, --records or --seconds; tell at the\n"
     "end what was written and what was dropped because a\n"
     "reader could not keep up. --start, --step and --times\n"
     "have no meaning then.",
     [](const option_input& in) { return in.pOptions->bLive = true; }, "Live"},
    {"rate", 0, "N", nullptr, "a number up to 1000000000",
     "records per second and file (default 5; 0: as many as\n"
     "can be written)",
     [](const option_input& in) {
         return read_number(in.value, 0, 1'000'000'000, &in.pOptions->uRate);
     }},
    {"seconds", 0, "N", nullptr, "a number from 1 to 1000000000", "stop after N seconds",
     [](const option_input& in) {
         return read_number(in.value, 1, 1'000'000'000, &in.pOptions->uSeconds);
     }},
    {"help", 'h', nullptr, nullptr, nullptr, "print this text", nullptr, "Help"},
};

} // namespace

std::span<const option_row> option_rows() {
    return OPTIONS;
}

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
