// The traces of kelvo_sample, as the reference reader and the command see them.
#include "raw_trace.h"
#include "reference_reader.h"
#include "run_command.h"
#include "temp_dir.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstring>
#include <filesystem>
#include <set>
#include <sstream>
#include <thread>

namespace {

using testing::HasSubstr;
using testing::Not;

using arguments = std::vector<std::string>;

command_setup sample_setup() {
    command_setup setup;
    setup.sProgram = KELVO_SAMPLE_PROGRAM;
    return setup;
}

bool is_printed(const ring_element& record) {
    return record.header.function < TRC_FUNC_TIME_CALIBRATION;
}

class Sample : public testing::Test {
protected:
    /// Makes samples in a directory of the test; returns that directory.
    std::string make(const std::string& sName, arguments options) {
        const std::string sDirectory = m_dir.file(sName);
        options.insert(options.end(), {"-d", sDirectory});
        const command_result result = run_command(options, sample_setup());
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.sErr, "");
        EXPECT_THAT(result.sOut, HasSubstr("kelvo -t " + sDirectory));
        return sDirectory;
    }

    static arguments files_of(const std::string& sDirectory, const char* pExtension = ".trc") {
        arguments files;
        for (const auto& entry : std::filesystem::directory_iterator(sDirectory))
            if (entry.path().extension() == pExtension)
                files.push_back(entry.path());
        std::sort(files.begin(), files.end());
        return files;
    }

    static std::vector<ring_element> records_of(const std::string& sFile) {
        const ring_listing ring = list_ring(read_file(sFile));
        EXPECT_EQ(ring.problem, "") << sFile;
        return ring.records();
    }

    /// Returns when the records of a live file fill so many bytes. By then the
    /// program has slept at least once; the thread sanitizer's runtime loses a
    /// signal that comes while it prepares a thread's first sleep.
    static void wait_until_written(const std::string& sFile, uint32_t uBytes) {
        for (int i = 0; i < 60'000; ++i) {
            trace_file_header header{};
            const std::vector<std::byte> bytes = read_file(sFile);
            ASSERT_GE(bytes.size(), sizeof header);
            memcpy(&header, bytes.data(), sizeof header);
            if (header.uOldestRecordOffset >= header.uOffset + uBytes)
                return;
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        ADD_FAILURE() << "nothing is written into " << sFile;
    }

    /// Everything that kelvo prints behind the file headers.
    static std::string print(const std::string& sDirectory, arguments options = {}) {
        options.insert(options.end(), {"-t", sDirectory});
        const arguments files = files_of(sDirectory);
        options.insert(options.end(), files.begin(), files.end());
        const command_result result = run_command(options);
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.sErr, "");
        const size_t uAt = result.sOut.find("*** Formatting traces");
        EXPECT_NE(uAt, std::string::npos);
        return result.sOut.substr(result.sOut.find('\n', uAt) + 1);
    }

    temp_dir m_dir;
};

TEST_F(Sample, StoryHoldsEveryKindAndReadsWell) {
    for (const char* const pAddr : {"64", "32"}) {
        const std::string sDirectory = make(pAddr, {"--addr", pAddr});
        std::set<unsigned> kinds;
        long iPrinted = 0;
        for (const std::string& sFile : files_of(sDirectory)) {
            const std::vector<ring_element> records = records_of(sFile);
            for (const ring_element& record : records)
                kinds.insert(record.header.function);
            iPrinted += std::count_if(records.begin(), records.end(), is_printed);
            const bool bWrapped = records.front().header.seqNumber != 2;
            EXPECT_EQ(bWrapped, sFile.ends_with("/storage.trc")) << sFile;
        }
        EXPECT_THAT(kinds, testing::ElementsAre(1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15,
                                                16, 17, 19, 0xFFFE));

        const std::string sText = print(sDirectory);
        EXPECT_THAT(sText, HasSubstr("error 28 in grow_volume"));
        EXPECT_THAT(sText, HasSubstr("volume data1 is full, "));
        EXPECT_THAT(sText, HasSubstr("status 201, created"));
        for (const char* const pUnformatted : {"id=0x", "%d", "%s", "%ld", "Data Block 1"})
            EXPECT_THAT(sText, Not(HasSubstr(pUnformatted)));
        std::istringstream lines(sText);
        std::string sTime;
        int iWide = 0;
        long iRecords = 0;
        for (std::string sLine; std::getline(lines, sLine);) {
            EXPECT_LE(sLine.size(), 120U);
            iWide += sLine.size() > 80 ? 1 : 0;
            if (!sLine.starts_with('['))
                continue;
            ++iRecords;
            EXPECT_LT(sTime, sLine.substr(5, 18));
            sTime = sLine.substr(5, 18);
        }
        EXPECT_LE(iWide, 3) << "a hex dump and a resource handle do not fit 80 columns";
        EXPECT_EQ(iRecords, iPrinted);
        EXPECT_TRUE(iRecords >= 60 && iRecords <= 100) << iRecords;
    }
}

TEST_F(Sample, SameOptionsMakeTheSameBytes) {
    const auto bytes_of = [this](const std::string& sName, const char* pProfile,
                                 const char* pSeed) {
        std::vector<std::vector<std::byte>> bytes;
        for (const std::string& sFile : files_of(
                 make(sName + pProfile, {"-p", pProfile, "-n", "4", "-r", "200", "--seed", pSeed})))
            bytes.push_back(read_file(sFile));
        EXPECT_EQ(bytes.size(), 4U);
        return bytes;
    };
    for (const char* const pProfile : {"story", "mixed", "data"}) {
        const auto first = bytes_of("first", pProfile, "7");
        EXPECT_EQ(bytes_of("second", pProfile, "7"), first) << pProfile;
        EXPECT_NE(bytes_of("third", pProfile, "8"), first) << pProfile;
    }
}

TEST_F(Sample, AllRecordsFitUnlessTheFileIsMadeSmaller) {
    constexpr size_t RECORDS = 3000;
    for (const char* const pProfile : {"story", "plain", "numbers", "strings", "data", "mixed"})
        for (const arguments& more :
             {arguments{}, {"--record-size", "300", "--addr", "32"}, {"-s", "16k"}}) {
            const std::string sName = std::string(pProfile) + (more.empty() ? "" : more[0]);
            SCOPED_TRACE(sName);
            arguments options{"-p", pProfile, "-r", std::to_string(RECORDS)};
            options.insert(options.end(), more.begin(), more.end());
            const std::string sDirectory = make(sName, options);
            const arguments files = files_of(sDirectory);
            EXPECT_EQ(files.size(), 3U);
            long iPrinted = 0;
            for (const std::string& sFile : files) {
                const std::vector<ring_element> records = records_of(sFile);
                ASSERT_FALSE(records.empty());
                EXPECT_EQ(records.back().header.seqNumber, 2 * RECORDS);
                if (more.empty() || more[0] != "-s")
                    EXPECT_EQ(records.size(), RECORDS);
                else
                    EXPECT_LT(records.size(), RECORDS);
                iPrinted += std::count_if(records.begin(), records.end(), is_printed);
            }
            // Brief, so that no dump can look like a record.
            const std::string sText = "\n" + print(sDirectory, {"-b", "-o", ""});
            long iRecords = 0;
            for (size_t uAt = 0; (uAt = sText.find("\n[0", uAt)) != std::string::npos; ++uAt)
                ++iRecords;
            EXPECT_EQ(iRecords, iPrinted);
        }
}

TEST_F(Sample, NumbersAndTimesAreAsAsked) {
    for (const char* const pTimes : {"interleave", "sequential"}) {
        const std::string sDirectory =
            make(pTimes, {"--numbered", "-n", "2", "-r", "50", "--start", "@1000", "--step", "3us",
                          "--threads", "2", "--times", pTimes});
        const arguments files = files_of(sDirectory);
        for (uint64_t uFile = 0; uFile < 2; ++uFile) {
            const std::vector<ring_element> records = records_of(files.at(uFile));
            std::set<uint32_t> threads;
            for (uint64_t u = 0; u < records.size(); ++u) {
                EXPECT_EQ(load<uint32_t>(records[u].body, 4), u);
                const uint64_t uPlace = *pTimes == 'i' ? 2 * u + uFile : 50 * uFile + u;
                EXPECT_EQ(uint64_t{records[u].header.timeStamp}, 1'000'000'000'000 + 3000 * uPlace);
                threads.insert(records[u].header.threadId);
            }
            EXPECT_EQ(threads.size(), 2U);
        }
    }
    const arguments options{"-p", "numbers", "-r", "20"};
    arguments distinct = options;
    distinct.emplace_back("--distinct-bases");
    const std::string sSame = make("same", options);
    const std::string sDistinct = make("distinct", distinct);
    EXPECT_EQ(print(sSame), print(sDistinct)) << "the bases must not move the times";
    EXPECT_NE(read_file(files_of(sSame)[0]), read_file(files_of(sDistinct)[0]));
}

TEST_F(Sample, LiveRunsEndByCountOrSignal) {
    const std::string sDirectory = m_dir.file("live");
    const command_result counted =
        run_command({"--live", "--numbered", "--rate", "0", "--count", "700", "-n", "2", "-p",
                     "strings", "-d", sDirectory},
                    sample_setup());
    EXPECT_EQ(counted.status, 0);
    EXPECT_THAT(counted.sOut, HasSubstr("strings-1.trc: 700 records written, 0 dropped\n"));
    for (const std::string& sFile : files_of(sDirectory))
        EXPECT_EQ(records_of(sFile).size(), 700U);

    for (const int signo : {SIGINT, SIGTERM}) {
        live_command live({"--live", "--rate", "1000", "-d", m_dir.file("story")}, sample_setup());
        EXPECT_THAT(live.read_line(), HasSubstr("kelvo -f -t "));
        wait_until_written(m_dir.file("story/gateway.trc"), 2048);
        live.send_signal(signo);
        const command_result result = live.wait();
        EXPECT_EQ(result.status, 0);
        EXPECT_THAT(result.sOut, HasSubstr("gateway.trc: "));
        for (const std::string& sFile : files_of(m_dir.file("story")))
            records_of(sFile);
    }
}

TEST_F(Sample, HelpAndWrongOptions) {
    const command_result help = run_command({"--help"}, sample_setup());
    EXPECT_EQ(help.status, 0);
    EXPECT_THAT(help.sOut, HasSubstr("--distinct-bases"));

    const struct {
        arguments options;
        const char* pSays;
    } cases[] = {
        {{"--bogus"}, "bogus"},
        {{"stray"}, "stray"},
        {{"-n", "0"}, "--files"},
        {{"-n", "3x"}, "3x"},
        {{"-r", "-1"}, "--records"},
        {{"-r", "99999999999999999999"}, "--records"},
        {{"-s", "5G"}, "--file-size"},
        {{"-s", "1022"}, "--file-size"},
        {{"--addr", "48"}, "--addr"},
        {{"-p", "novel"}, "novel"},
        {{"--start", "2026-02-30 00:00:00"}, "--start"},
        {{"--step", "10"}, "--step"},
        {{"--zone", "-1"}, "--zone"},
        {{"--numbered", "-p", "mixed"}, "--numbered"},
        {{"--seconds", "3"}, "--live"},
        {{"-p", "plain", "-r", "4000000000"}, "--file-size"},
        {{"-p", "strings", "-s", "512", "--record-size", "1k"}, "--file-size"},
        {{"-p", "plain", "-s", "4k", "-r", "99999999999", "--step", "1s"}, "--step"},
    };
    for (const auto& [options, pSays] : cases) {
        SCOPED_TRACE(testing::PrintToString(options));
        arguments all = options;
        all.insert(all.end(), {"-d", m_dir.file("wrong")});
        const command_result result = run_command(all, sample_setup());
        EXPECT_EQ(result.status, 1);
        EXPECT_EQ(result.sOut, "");
        EXPECT_THAT(result.sErr, HasSubstr(pSays));
    }
    const command_result noDirectory = run_command({"-d", "/dev/null/x"}, sample_setup());
    EXPECT_EQ(noDirectory.status, 1);
    EXPECT_THAT(noDirectory.sErr, HasSubstr("/dev/null/x"));
}

} // namespace
