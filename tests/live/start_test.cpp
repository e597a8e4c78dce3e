// The -s option through the command: what is printed first, in which locale and
// time zone its times are read, and what is refused. Also the progress line.
#include "run_command.h"
#include "sample_trace.h"
#include "temp_dir.h"

#include <fstream>
#include <numeric>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using testing::EndsWith;
using testing::HasSubstr;

constexpr uint64_t SECOND = 1'000'000'000;
constexpr uint64_t NOON = 1'614'859'200 * SECOND; // 4 March 2021 12:00:00 UTC

using numbers = std::vector<uint32_t>;

/// Values of the raw records in an output.
numbers printed(const std::string& sOut) {
    numbers values;
    for (size_t uAt = 0; (uAt = sOut.find("val=0x", uAt)) != sOut.npos; uAt += 6)
        values.push_back(static_cast<uint32_t>(std::stoul(sOut.substr(uAt + 6, 8), nullptr, 16)));
    return values;
}

/// uFirst to uLast; nothing when uFirst is 0.
numbers from_to(uint32_t uFirst, uint32_t uLast) {
    numbers values(uFirst == 0 ? 0 : uLast - uFirst + 1);
    std::iota(values.begin(), values.end(), uFirst);
    return values;
}

struct start_case {
    std::string sStart;
    uint32_t uFirst; ///< number of the first printed record; 0: none is printed
};

class Start : public testing::Test {
protected:
    /// Record i of the file has the value i, from 1, and the i-th of these times.
    std::string make(const std::string& sName, const std::vector<uint64_t>& times,
                     const trace_writer_options& options = {}) {
        std::vector<sample_record> records;
        for (const uint64_t uTime : times)
            records.push_back(sample_uint32(uTime, 1, static_cast<uint32_t>(records.size()) + 1));
        EXPECT_EQ(write_sample_trace(m_dir.file(sName), records, options), TRACE_WRITER_OK);
        return m_dir.file(sName);
    }

    /// `uCount` records, the first one second after `uBegin`, a second apart.
    static std::vector<uint64_t> seconds(uint64_t uBegin, uint64_t uCount) {
        std::vector<uint64_t> times;
        for (uint64_t i = 1; i <= uCount; ++i)
            times.push_back(uBegin + i * SECOND);
        return times;
    }

    static command_result run(const std::string& sStart, const std::string& sPath,
                              const command_setup& setup = {}) {
        return run_command({"-r", "-s", sStart, sPath}, setup);
    }

    static void expect_starts(const std::string& sPath, uint32_t uLast,
                              const std::vector<start_case>& cases,
                              const command_setup& setup = {}) {
        for (const auto& [sStart, uFirst] : cases) {
            const command_result result = run(sStart, sPath, setup);
            EXPECT_EQ(result.status, 0) << '"' << sStart << '"';
            EXPECT_EQ(result.sErr, "") << '"' << sStart << '"';
            EXPECT_EQ(printed(result.sOut), from_to(uFirst, uLast)) << '"' << sStart << '"';
        }
    }

    static void expect_refused(const std::string& sPath, const std::vector<std::string>& starts,
                               const std::string& sMessage, const command_setup& setup = {}) {
        for (const std::string& sStart : starts) {
            const command_result result = run(sStart, sPath, setup);
            EXPECT_EQ(result.status, 1) << '"' << sStart << '"';
            EXPECT_EQ(result.sErr, KELVO_PROGRAM + sMessage + "\n\n") << '"' << sStart << '"';
            EXPECT_THAT(result.sOut, HasSubstr("\nkelvo [-fhbrl]")) << '"' << sStart << '"';
            EXPECT_THAT(result.sOut,
                        EndsWith("records from the beginning (+) or end (-) of the file.\n"));
        }
    }

    temp_dir m_dir;
};

constexpr char BAD_DELTA[] = ": 2625-153 Delta start time or record number is invalid.";
constexpr char BAD_TIME[] = ": 2625-154 Start time is invalid.";

TEST_F(Start, ByRecordOrByTime) {
    const std::string sTwenty = make("twenty", seconds(NOON, 20));
    expect_starts(sTwenty, 20,
                  {{" \t+3r", 3},
                   {"+21r", 0},
                   {"-5r", 15},
                   {"+4s", 6},
                   {"-4s", 17},
                   {"03/04/21 12:00:07", 8},
                   {"03/04/21 12:00:06.999999999", 7}});
    expect_starts(make("ages", {951'782'400 * SECOND, 2'119'000'000 * SECOND}), 2, {{"", 2}});
    expect_refused(sTwenty, {"+5"}, BAD_DELTA);
    expect_refused(sTwenty, {"03/04/21"}, BAD_TIME);
}

TEST_F(Start, ReadsTimesInTheZoneOfTheFirstFile) {
    trace_writer_options west, east;
    west.tz_offset = 300;
    east.tz_offset = -330;
    const std::string sWest = make("west", seconds(NOON, 20), west);
    const std::string sEast = make("east", seconds(NOON, 20), east);
    const std::string sLocal = make("local", seconds(NOON, 20));
    const struct {
        std::vector<std::string> options;
        std::vector<std::string> files;
        const char* pStart;
    } cases[] = {
        {{}, {sWest}, "03/04/21 07:00:18"},        {{}, {sEast}, "03/04/21 17:30:18"},
        {{}, {sLocal}, "03/04/21 14:00:18"},       {{"-k"}, {sWest}, "03/04/21 14:00:18"},
        {{}, {sWest, sEast}, "03/04/21 07:00:18"}, {{}, {sLocal, sEast}, "03/04/21 14:00:18"},
    };
    command_setup setup;
    setup.environment = {"TZ=XXX-2"};
    for (const auto& [options, files, pStart] : cases) {
        std::vector<std::string> arguments{"-r", "-s", pStart};
        arguments.insert(arguments.end(), options.begin(), options.end());
        arguments.insert(arguments.end(), files.begin(), files.end());
        const command_result result = run_command(arguments, setup);
        EXPECT_EQ(result.sErr, "");
        EXPECT_EQ(printed(result.sOut),
                  files.size() == 1 ? numbers({19, 20}) : numbers({19, 19, 20, 20}))
            << testing::PrintToString(arguments);
    }
}

/// Makes a locale that has the times of `sSource`, one of the system's sources,
/// in the directory; false where that cannot be done.
bool make_locale(const std::string& sSource, const std::string& sPath) {
    {
        std::ofstream source(sPath + ".source");
        for (const char* pCategory : {"CTYPE", "COLLATE", "MONETARY", "NUMERIC", "MESSAGES"})
            source << "LC_" << pCategory << "\ncopy \"POSIX\"\nEND LC_" << pCategory << '\n';
        source << "LC_TIME\ncopy \"" << sSource << "\"\nEND LC_TIME\n";
    }
    command_setup setup;
    setup.sProgram = "/bin/sh";
    const char* const pCommand =
        "localedef --no-archive -c -i \"$0\" -f UTF-8 \"$1\"; test -e \"$1/LC_TIME\"";
    return run_command({"-c", pCommand, sPath + ".source", sPath}, setup).status == 0;
}

TEST_F(Start, ReadsAndWritesTimesInTheUsersLocale) {
    const struct {
        const char* pSource;
        const char* pStart;
        const char* pFraction; ///< a start between records 7 and 8
        const char* pRefused;
        const char* pPrinted; ///< date and time of record 8
    } cases[] = {
        {"de_DE", "04.03.2021 14:00:07", "04.03.2021 14:00:07.25", "2021-03-04 14:00:07",
         "04.03.2021 14:00:08.000000000"},
        {"en_US", "03/04/2021 02:00:07 PM", "03/04/2021 02:00:07 PM.25", "04.03.2021 14:00:07",
         "03/04/2021 02:00:08 PM.000000000"},
    };
    const std::string sTwenty = make("twenty", seconds(NOON, 20));
    for (const auto& [pSource, pStart, pFraction, pRefused, pPrinted] : cases) {
        SCOPED_TRACE(pSource);
        const std::string sName = std::string(pSource) + ".UTF-8";
        if (!make_locale(pSource, m_dir.file(sName)))
            GTEST_SKIP() << "no localedef or no source of " << pSource;
        command_setup setup;
        setup.environment = {"TZ=XXX-2", "LOCPATH=" + m_dir.path(), "LC_ALL=" + sName};
        expect_starts(sTwenty, 20, {{pStart, 8}, {pFraction, 8}}, setup);
        expect_refused(sTwenty, {pRefused}, BAD_TIME, setup);
        EXPECT_THAT(run_command({"-r", "-odt", sTwenty}, setup).sOut, HasSubstr(pPrinted));
    }
}

TEST_F(Start, ProgressGoesFromNoneToAllFiles) {
    std::vector<std::string> arguments{"-i"};
    for (const char* pName : {"a", "b", "c"})
        arguments.push_back(make(pName, seconds(NOON, 20)));
    arguments.push_back(m_dir.file("no trace file"));
    ASSERT_TRUE(write_file(arguments.back(), raw_bytes(uint32_t{0})));
    const command_result result = run_command(arguments);
    EXPECT_EQ(result.status, 1);
    std::string sExpected = "\r  0%|" + std::string(50, ' ') + "|       0/4 files processed... ";
    sExpected += KELVO_PROGRAM + std::string(": 2625-105 File \"") + arguments.back() +
                 "\" is too small to be a trace file.\n\n";
    const int marks[] = {12, 25, 37, 50};
    for (int i = 1; i <= 4; ++i) {
        const size_t uMarks = static_cast<size_t>(marks[i - 1]);
        char line[128];
        snprintf(line, sizeof line, "\r%3d%%|%s%s|%8d/4 files processed... ", 25 * i,
                 std::string(uMarks, '#').c_str(), std::string(50 - uMarks, ' ').c_str(), i);
        sExpected += line;
    }
    EXPECT_EQ(result.sErr, sExpected + "\n");
}

} // namespace
