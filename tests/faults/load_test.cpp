// Runs at the limits: many files, files as large as they can be, deep nesting,
// and the memory that a full output queue takes.
#include "faults_support.h"

#include "sample_trace.h"

#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <sstream>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using testing::HasSubstr;

// ----------------------------------------------------------------- many files

/// One after the other in time, every tenth no trace file, with few descriptors:
/// what a file leaves open would soon be missing.
TEST(Load, ManyFilesNeedFewDescriptors) {
    constexpr size_t RECORDS = 5;
    const uint64_t uFiles = setting("KELVO_TEST_LOAD_FILES", SANITIZED ? 200 : 1000);
    const temp_dir dir;
    const auto files =
        make_samples(dir.path(), {"-n", std::to_string(uFiles), "-r", std::to_string(RECORDS), "-p",
                                  "plain", "--times=sequential"});
    ASSERT_EQ(files.size(), uFiles);
    uint64_t uBroken = 0;
    for (size_t i = 5; i < files.size(); i += 10, ++uBroken)
        std::filesystem::resize_file(files[i], i % 20 == 5 ? 100 : 1000);

    command_setup setup;
    setup.sProgram = "/bin/sh";
    std::vector<std::string> arguments{"-c", "ulimit -n 40 && exec \"$0\" \"$@\"", KELVO_PROGRAM};
    arguments.insert(arguments.end(), files.begin(), files.end());
    const command_result result = run_command(arguments, setup);
    expect_sound_end(result);
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(count_of("] Filename: ", result.sOut), uFiles);
    EXPECT_EQ(count_of("\n[", result.sOut) + 1, uFiles + (uFiles - uBroken) * RECORDS);
    EXPECT_EQ(count_of("2625-105", result.sErr) + count_of("2625-107", result.sErr), uBroken);
    EXPECT_EQ(count_of("2625-102", result.sErr), 0U) << result.sErr.substr(0, 1000);
}

// ---------------------------------------------------------------- large files

class LargeFile : public testing::TestWithParam<uint32_t> {};

/// A ring that has wrapped: its gap is nearly all of the file and never stored.
TEST_P(LargeFile, IsReadToItsEnd) {
    const uint32_t uSize = GetParam();
    const temp_dir dir;
    const std::string sPath = dir.file("large.trc");
    const int fd = open(sPath.c_str(), O_RDWR | O_CREAT | O_CLOEXEC, 0600);
    ASSERT_GE(fd, 0);
    if (ftruncate(fd, uSize) != 0) {
        close(fd);
        GTEST_SKIP() << "no file of " << uSize << " bytes here";
    }
    trace_file_header header = raw_trace(4096).header;
    const auto put = [fd](uint64_t uAt, const std::vector<std::byte>& bytes) {
        EXPECT_EQ(pwrite(fd, bytes.data(), bytes.size(), static_cast<off_t>(uAt)),
                  static_cast<ssize_t>(bytes.size()));
    };
    const auto record = [](uint32_t uNumber) {
        return raw_record_bytes({.function = TRC_FUNC_UINT32,
                                 .seqNumber = 2 * uNumber,
                                 .timeStamp = uNumber,
                                 .body = raw_bytes(uint32_t{1}, uNumber)});
    };
    const auto uRecord = static_cast<uint32_t>(record(1).size());
    const uint32_t uGap = header.uOffset + uRecord;
    header.uActualFileSize = uSize;
    header.uOldestRecordOffset = uGap;
    put(0, raw_bytes(header));
    put(header.uOffset, record(3));
    put(uGap, raw_record_bytes({.function = TRC_FUNC_FILLER,
                                .seqNumber = TRC_SEQ_FILLER,
                                .length = int64_t{uSize} - 2 * uRecord - uGap}));
    put(uSize - 2 * uRecord, record(1));
    put(uSize - uRecord, record(2));
    close(fd);

    const command_result result = run_command({"-r", "-o", "so", sPath});
    expect_sound_end(result);
    EXPECT_EQ(result.sErr, "");
    std::string sExpected;
    for (const auto& [uNumber, uAt] :
         {std::pair{1U, uSize - 2 * uRecord}, {2U, uSize - uRecord}, {3U, header.uOffset}}) {
        char line[100];
        snprintf(line, sizeof line, " 0x%08x 0x%08x id=0x00000001 val=0x%08x\n", 2 * uNumber, uAt,
                 uNumber);
        sExpected += line;
    }
    EXPECT_THAT(result.sOut, testing::EndsWith(sExpected));
}

INSTANTIATE_TEST_SUITE_P(Of, LargeFile, testing::Values(0x80000000U, 0xFFFFFFFCU),
                         [](const auto& test) {
                             return test.param == 0x80000000U ? "2GiB" : "Nearly4GiB";
                         });

// --------------------------------------------------------------- deep nesting

constexpr uint32_t DEPTH = 1000;

/// Every thread of the file goes down to the last level and up again.
void write_nesting(const std::string& path, uint32_t uThreads) {
    trace_writer writer;
    ASSERT_EQ(writer.create(path.c_str(), {.uFileSize = 16 * 1024 * 1024}), TRACE_WRITER_OK);
    uint64_t uTime = 0;
    const auto all_threads = [&](uint32_t uTraceId, uint32_t uLevel) {
        for (uint32_t uThread = 0; uThread < uThreads; ++uThread)
            ASSERT_EQ(writer.append_uint32({"_NST", uThread, ++uTime}, uTraceId, uLevel),
                      TRACE_WRITER_OK);
    };
    for (uint32_t uLevel = 0; uLevel < DEPTH; ++uLevel)
        all_threads(1, uLevel);
    for (uint32_t uLevel = DEPTH; uLevel-- > 0;)
        all_threads(2, uLevel);
}

/// Counts the lines that stand at their level's column; others fail the test.
uint64_t count_indented(live_command& kelvo) {
    uint64_t uLines = 0;
    for (std::string sText, sMore; !(sMore = kelvo.read_text()).empty();) {
        sText += sMore;
        size_t uAt = 0;
        for (size_t uEnd; (uEnd = sText.find('\n', uAt)) != sText.npos; uAt = uEnd + 1) {
            const std::string_view sLine(sText.data() + uAt, uEnd - uAt);
            if (!sLine.starts_with(" _NST "))
                continue;
            const size_t uText = sLine.find_first_not_of(' ', 6);
            const size_t uLevel = strtoul(sText.c_str() + uAt + sLine.rfind(' '), nullptr, 10);
            if (uText == 6 + 2 * uLevel)
                ++uLines;
            else
                ADD_FAILURE() << sLine;
        }
        sText.erase(0, uAt);
    }
    return uLines;
}

TEST(Load, ThreadsNestDeeply) {
    const uint32_t uThreads = SANITIZED ? 20 : 100;
    const temp_dir dir;
    write_nesting(dir.file("nest.trc"), uThreads);
    const std::string sTemplate = "1 \">>enter %u\"\n2 \"<<leave %u\"\n";
    ASSERT_TRUE(write_file(dir.file("_NST.tpl"), std::as_bytes(std::span(sTemplate))));
    live_command kelvo({"-o", "c", "-t", dir.path(), dir.file("nest.trc")});
    EXPECT_EQ(count_indented(kelvo), uint64_t{2} * uThreads * DEPTH);
    const command_result result = kelvo.wait();
    expect_sound_end(result);
    EXPECT_EQ(result.sErr, "");
}

// --------------------------------------------------------------------- memory

/// Waits until the process takes no more memory.
void wait_until_full(pid_t pid) {
    const std::string sPath = "/proc/" + std::to_string(pid) + "/statm";
    uint64_t uLast = 0;
    for (int iSame = 0; iSame < 5; usleep(50'000)) {
        uint64_t uTotal = 0;
        uint64_t uResident = 0;
        std::ifstream(sPath) >> uTotal >> uResident;
        iSame = uResident == uLast ? iSame + 1 : 0;
        uLast = uResident;
    }
}

/// Whoever reads the output is slow: the queue fills up to its cap, and no more.
TEST(Load, QueueStaysWithinItsCap) {
    if (SANITIZED)
        GTEST_SKIP() << "a sanitizer's allocator takes memory of its own";
    constexpr uint64_t FILES = 4;
    constexpr uint64_t RECORDS = 75'000; // per file
    constexpr uint64_t LENGTH = 256;
    constexpr uint64_t KIB = 1024;
    const temp_dir dir;
    std::vector<std::string> arguments =
        make_samples(dir.path(), {"-n", std::to_string(FILES), "-r", std::to_string(RECORDS), "-p",
                                  "strings", "--record-size=" + std::to_string(LENGTH)});
    uint64_t uFileBytes = 0;
    for (const std::string& sFile : arguments)
        uFileBytes += std::filesystem::file_size(sFile);
    arguments.insert(arguments.begin(), {"-t", dir.path()});
    live_command kelvo(arguments);
    wait_until_full(kelvo.pid());
    uint64_t uRecords = 0;
    for (std::string sText; !(sText = kelvo.read_text()).empty();)
        uRecords += count_of("\n[", sText);
    const command_result result = kelvo.wait();
    expect_sound_end(result);
    EXPECT_GT(uRecords, FILES * RECORDS * 9 / 10);

    // The copies of the records with their heads, what the allocator and the
    // queue add to each, a reader's batch and the main thread's; the mapped
    // files; the program itself with its threads.
    constexpr uint64_t PER_RECORD = LENGTH + 44 + 20 + 4 * 32;
    constexpr uint64_t QUEUED = 40'000 + FILES * (5 + 256) + 256;
    const uint64_t uBoundKiB = (QUEUED * PER_RECORD + uFileBytes) / KIB + 32 * KIB;
    std::cout << "peak memory " << result.peakKiB << " KiB, bound " << uBoundKiB << " KiB, files "
              << uFileBytes / KIB << " KiB\n";
    RecordProperty("peak_KiB", static_cast<int>(result.peakKiB));
    EXPECT_LE(static_cast<uint64_t>(result.peakKiB), uBoundKiB);
}

} // namespace
