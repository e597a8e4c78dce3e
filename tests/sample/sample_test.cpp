// The traces of kelvo_sample, as the reference reader and the command see them.
#include "raw_trace.h"
#include "reference_reader.h"
#include "run_command.h"
#include "temp_dir.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <filesystem>
#include <set>
#include <sstream>
#include <unistd.h>

namespace {

using testing::HasSubstr;
using testing::Not;

using arguments = std::vector<std::string>;

const command_setup SAMPLE{.sProgram = KELVO_SAMPLE_PROGRAM};

class Sample : public testing::Test {
protected:
    /// Makes samples in a directory of the test; returns that directory.
    std::string make(const std::string& sName, arguments options) {
        const std::string sDirectory = m_dir.file(sName);
        options.insert(options.end(), {"-d", sDirectory});
        const command_result result = run_command(options, SAMPLE);
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.sErr, "");
        EXPECT_THAT(result.sOut, HasSubstr("kelvo -t " + sDirectory));
        return sDirectory;
    }

    static arguments files_of(const std::string& sDirectory) {
        arguments files;
        for (const auto& entry : std::filesystem::directory_iterator(sDirectory))
            if (entry.path().extension() == ".trc")
                files.push_back(entry.path());
        std::sort(files.begin(), files.end());
        return files;
    }

    static std::vector<ring_element> records_of(const std::string& sFile) {
        const ring_listing ring = list_ring(read_file(sFile));
        EXPECT_EQ(ring.problem, "") << sFile;
        return ring.records();
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

    /// Expects a line with a file's index for each record that is printed at all.
    static void expect_all_printed(const std::string& sDirectory, const std::string& sText) {
        long iPrinted = 0;
        for (const std::string& sFile : files_of(sDirectory))
            iPrinted += std::ranges::count_if(records_of(sFile), [](const ring_element& record) {
                return trc_kind_is_output(record.header.function) &&
                       record.header.function != TRC_FUNC_TIME_CALIBRATION;
            });
        std::istringstream lines(sText);
        for (std::string sLine; std::getline(lines, sLine);)
            iPrinted -= sLine.starts_with("[0");
        EXPECT_EQ(iPrinted, 0) << "records are missing";
    }

    temp_dir m_dir;
};

TEST_F(Sample, StoryHoldsEveryKindAndReadsWell) {
    for (const char* const pAddr : {"64", "32"}) {
        const std::string sDirectory = make(pAddr, {"--addr", pAddr});
        std::set<unsigned> kinds;
        for (const std::string& sFile : files_of(sDirectory)) {
            const std::vector<ring_element> records = records_of(sFile);
            for (const ring_element& record : records)
                kinds.insert(record.header.function);
            const bool bWrapped = records.front().header.seqNumber != 2;
            EXPECT_EQ(bWrapped, sFile.ends_with("/storage.trc")) << sFile;
        }
        for (const trc_kind& kind : TRC_KINDS)
            EXPECT_EQ(kinds.contains(kind.function),
                      kind.function != TRC_FUNC_FILLER && trc_kind_is_valid(kind.function))
                << kind.pName;
        const std::string sText = print(sDirectory);
        expect_all_printed(sDirectory, sText);
        EXPECT_THAT(sText, HasSubstr("error 28 in grow_volume"));
        EXPECT_THAT(sText, HasSubstr("volume data1 is full, "));
        EXPECT_THAT(sText, HasSubstr("status 201, created"));
        for (const char* const pUnformatted : {"id=0x", "%d", "%s", "%ld", "Data Block 1"})
            EXPECT_THAT(sText, Not(HasSubstr(pUnformatted)));
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
            EXPECT_EQ(files_of(sDirectory).size(), 3U);
            for (const std::string& sFile : files_of(sDirectory)) {
                const std::vector<ring_element> records = records_of(sFile);
                ASSERT_FALSE(records.empty());
                EXPECT_EQ(records.back().header.seqNumber, 2 * RECORDS);
                EXPECT_EQ(records.size() == RECORDS, !sName.ends_with("-s"));
            }
            // Brief, so that no dump can look like a record.
            expect_all_printed(sDirectory, print(sDirectory, {"-b", "-o", ""}));
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
    const std::string sSame = make("same", {"-p", "numbers", "-r", "20"});
    const std::string sDistinct =
        make("distinct", {"-p", "numbers", "-r", "20", "--distinct-bases"});
    EXPECT_EQ(print(sSame), print(sDistinct)) << "the bases must not move the times";
    EXPECT_NE(read_file(files_of(sSame)[0]), read_file(files_of(sDistinct)[0]));
}

TEST_F(Sample, DamageIsToTheFirstFileOnly) {
    const struct {
        const char* pKind;
        const char* pProblem; // of the ring
        size_t uPrinted;
        const char* pSays;
    } cases[] = {
        {"gap", "number 20 at 344 follows 8", 9, ""},
        {"torn", "number 4095 at 488 follows 16", 9, ""},
        {"function", "function 18 at ", 4, "invalid record function"},
        {"fillers", "", 0, ""},
        {"header", "uActualFileSize ", 0, "2625-107"},
    };
    for (const auto& [pKind, pProblem, uPrinted, pSays] : cases) {
        SCOPED_TRACE(pKind);
        const std::string sDirectory =
            make(pKind, {"-p", "plain", "-n", "2", "-r", "9", "--damage", pKind});
        const arguments files = files_of(sDirectory);
        EXPECT_THAT(list_ring(read_file(files[0])).problem, testing::StartsWith(pProblem));
        EXPECT_EQ(records_of(files[1]).size(), 9U);
        const command_result result = run_command({"-o", "s", files[0], files[1]});
        size_t uLines = 0;
        for (size_t u = 0; (u = result.sOut.find(" val=", u)) != std::string::npos; ++u)
            ++uLines;
        EXPECT_EQ(uLines, 9 + uPrinted);
        EXPECT_THAT(result.sErr, HasSubstr(pSays));
    }
}

TEST_F(Sample, LiveRunsEndByCountOrSignal) {
    const std::string sDirectory = m_dir.file("live");
    const command_result counted =
        run_command({"--live", "--numbered", "--rate", "0", "--count", "700", "-n", "2", "-p",
                     "strings", "-d", sDirectory},
                    SAMPLE);
    EXPECT_EQ(counted.status, 0);
    EXPECT_THAT(counted.sOut, HasSubstr("strings-1.trc: 700 records written, 0 dropped\n"));
    for (const std::string& sFile : files_of(sDirectory))
        EXPECT_EQ(records_of(sFile).size(), 700U);

    for (const int signo : {SIGINT, SIGTERM}) {
        live_command live({"--live", "--rate", "1000", "-d", m_dir.file("story")}, SAMPLE);
        EXPECT_THAT(live.read_line(), HasSubstr("kelvo -f -t "));
        // By then it has slept at least once; the thread sanitizer's runtime loses a
        // signal that comes while it prepares a thread's first sleep.
        const std::string sLive = m_dir.file("story/gateway.trc");
        for (uint32_t uAt = 0, iTries = 0; uAt < 2048 && iTries < 60'000; ++iTries, usleep(1000))
            uAt =
                load<uint32_t>(read_file(sLive), offsetof(trace_file_header, uOldestRecordOffset));
        live.send_signal(signo);
        const command_result result = live.wait();
        EXPECT_EQ(result.status, 0);
        EXPECT_THAT(result.sOut, HasSubstr("gateway.trc: "));
        for (const std::string& sFile : files_of(m_dir.file("story")))
            records_of(sFile);
    }
}

TEST_F(Sample, HelpAndWrongOptions) {
    const command_result help = run_command({"--help"}, SAMPLE);
    EXPECT_EQ(help.status, 0);
    EXPECT_THAT(help.sOut, HasSubstr("--distinct-bases"));

    const struct {
        arguments options;
        const char* pSays;
    } cases[] = {
        {{"--bogus"}, "bogus"},
        {{"-d", "/dev/null/x"}, "/dev/null/x"},
        {{"stray"}, "stray"},
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
        {{"--live", "--damage", "gap"}, "--live"},
        {{"--damage", "much"}, "gap, torn, function, fillers or header"},
        {{"-p", "plain", "-r", "4000000000"}, "--file-size"},
        {{"-p", "strings", "-s", "512", "--record-size", "1k"}, "--file-size"},
        {{"-p", "plain", "-s", "4k", "-r", "99999999999", "--step", "1s"}, "--step"},
    };
    for (const auto& [options, pSays] : cases) {
        SCOPED_TRACE(testing::PrintToString(options));
        arguments all{"-d", m_dir.file("wrong")};
        all.insert(all.end(), options.begin(), options.end());
        const command_result result = run_command(all, SAMPLE);
        EXPECT_EQ(result.status, 1);
        EXPECT_EQ(result.sOut, "");
        EXPECT_THAT(result.sErr, HasSubstr(pSays));
    }
}

} // namespace
