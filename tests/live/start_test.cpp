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
constexpr uint32_t RECORDS = 20;

class Start : public testing::Test {
protected:
    /// Record i has the value i, from 1, and was written i seconds after noon.
    std::string make(const std::string& sName, const trace_writer_options& options = {}) {
        std::vector<sample_record> records;
        for (uint32_t i = 1; i <= RECORDS; ++i)
            records.push_back(sample_uint32(NOON + i * SECOND, 1, i));
        EXPECT_EQ(write_sample_trace(m_dir.file(sName), records, options), TRACE_WRITER_OK);
        return m_dir.file(sName);
    }

    /// Expects that records `uFirst` to the last are printed; none when it is 0.
    void expect_start(const std::vector<std::string>& arguments, uint32_t uFirst) {
        SCOPED_TRACE(testing::PrintToString(arguments));
        const command_result result = run_command(arguments, m_setup);
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.sErr, "");
        std::vector<uint32_t> values;
        for (size_t uAt = 0; (uAt = result.sOut.find("val=0x", uAt)) != std::string::npos; ++uAt)
            values.push_back(static_cast<uint32_t>(strtoul(&result.sOut[uAt + 6], nullptr, 16)));
        std::vector<uint32_t> expected(uFirst == 0 ? 0 : RECORDS + 1 - uFirst);
        std::iota(expected.begin(), expected.end(), uFirst);
        EXPECT_EQ(values, expected);
    }

    void expect_refused(const std::string& sStart, const std::string& sPath,
                        const std::string& sMessage) {
        const command_result result = run_command({"-s", sStart, sPath}, m_setup);
        EXPECT_EQ(result.status, 1);
        EXPECT_EQ(result.sErr, KELVO_PROGRAM + sMessage + "\n\n");
        EXPECT_THAT(result.sOut, HasSubstr("\nkelvo [-fhbrl]"));
        EXPECT_THAT(result.sOut, EndsWith("from the beginning (+) or end (-) of the file.\n"));
    }

    temp_dir m_dir;
    command_setup m_setup;
};

constexpr char BAD_DELTA[] = ": 2625-153 Delta start time or record number is invalid.";
constexpr char BAD_TIME[] = ": 2625-154 Start time is invalid.";

TEST_F(Start, ByRecordOrByTimeInTheZoneOfTheFile) {
    m_setup.environment = {"TZ=XXX-2"};
    trace_writer_options west;
    west.tz_offset = 300;
    const std::string sLocal = make("local"), sWest = make("west", west);
    const struct {
        std::string sStart;
        uint32_t uFirst;
    } cases[] = {
        {" \t+3r", 3},
        {"+21r", 0},
        {"-5r", 15},
        {"+4s", 6},
        {"-4s", 17},
        {"03/04/21 14:00:07", 8},
        {"03/04/21 14:00:06.999999999", 7},
    };
    for (const auto& [sStart, uFirst] : cases)
        expect_start({"-r", "-s", sStart, sLocal}, uFirst);
    expect_start({"-r", "-s", "03/04/21 07:00:18", sWest}, 19);
    expect_start({"-r", "-k", "-s", "03/04/21 14:00:18", sWest}, 19);
    expect_refused("+5", sLocal, BAD_DELTA);
    expect_refused("03/04/21", sLocal, BAD_TIME);
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
        const char* pStart; ///< between records 7 and 8
        const char* pRefused;
        const char* pPrinted; ///< date and time of record 8
    } cases[] = {
        {"de_DE", "04.03.2021 14:00:07.25", "2021-03-04 14:00:07", "04.03.2021 14:00:08.000000000"},
        {"en_US", "03/04/2021 02:00:07 PM.25", "04.03.2021 14:00:07",
         "03/04/2021 02:00:08 PM.000000000"},
    };
    const std::string sPath = make("a.trc");
    for (const auto& [pSource, pStart, pRefused, pPrinted] : cases) {
        SCOPED_TRACE(pSource);
        const std::string sName = std::string(pSource) + ".UTF-8";
        if (!make_locale(pSource, m_dir.file(sName)))
            GTEST_SKIP() << "no localedef or no source of " << pSource;
        m_setup.environment = {"TZ=XXX-2", "LOCPATH=" + m_dir.path(), "LC_ALL=" + sName};
        expect_start({"-r", "-s", pStart, sPath}, 8);
        expect_refused(pRefused, sPath, BAD_TIME);
        EXPECT_THAT(run_command({"-r", "-odt", sPath}, m_setup).sOut, HasSubstr(pPrinted));
    }
}

TEST_F(Start, ProgressGoesFromNoneToAllFiles) {
    const std::string sBad = m_dir.file("no trace file");
    ASSERT_TRUE(write_file(sBad, raw_bytes(uint32_t{0})));
    const command_result result = run_command({"-i", make("a"), make("b"), make("c"), sBad});
    EXPECT_EQ(result.status, 1);
    std::string sExpected;
    for (int i = 0; i <= 4; ++i) {
        const std::string sMarks(static_cast<size_t>(i * 50 / 4), '#');
        char line[128];
        snprintf(line, sizeof line, "\r%3d%%|%-50s|%8d/4 files processed... ", 25 * i,
                 sMarks.c_str(), i);
        sExpected += line;
        if (i == 0)
            sExpected += KELVO_PROGRAM ": 2625-105 File \"" + sBad +
                         "\" is too small to be a trace file.\n\n";
    }
    EXPECT_EQ(result.sErr, sExpected + "\n");
}

} // namespace
