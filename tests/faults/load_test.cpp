// Runs at the limits: many files, files as large as they can be, and the memory
// that a full output queue takes.
#include "faults_support.h"

#include <filesystem>
#include <fstream>
#include <iostream>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

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
    const auto record = [](uint32_t uNumber) {
        return raw_record{.function = TRC_FUNC_UINT32,
                          .seqNumber = 2 * uNumber,
                          .timeStamp = uNumber,
                          .body = raw_bytes(1U, uNumber)};
    };
    std::vector<std::byte> last = raw_record_bytes(record(1));
    add_bytes(&last, raw_record_bytes(record(2)));
    const auto uLast = static_cast<uint32_t>(uSize - last.size());
    raw_trace raw(4096);
    const uint32_t uThird = raw.add(record(3));
    raw.header.uActualFileSize = uSize;
    raw.header.uOldestRecordOffset = raw.end();
    raw.add({.function = TRC_FUNC_FILLER,
             .seqNumber = TRC_SEQ_FILLER,
             .length = int64_t{uLast} - raw.end()});
    const temp_dir dir;
    const std::string sPath = dir.file("large.trc");
    ASSERT_TRUE(raw.write(sPath));
    if (truncate(sPath.c_str(), uSize) != 0)
        GTEST_SKIP() << "no file of " << uSize << " bytes here";
    std::fstream(sPath, std::ios::in | std::ios::out)
        .seekp(uLast)
        .write(reinterpret_cast<const char*>(last.data()), std::ssize(last));

    const command_result result = run_command({"-r", "-o", "so", sPath});
    expect_sound_end(result);
    EXPECT_EQ(result.sErr, "");
    char lines[200];
    snprintf(lines, sizeof lines,
             " 0x00000002 0x%08x id=0x00000001 val=0x00000001\n"
             " 0x00000004 0x%08x id=0x00000001 val=0x00000002\n"
             " 0x00000006 0x%08x id=0x00000001 val=0x00000003\n",
             uLast, uLast + 36, uThird);
    EXPECT_THAT(result.sOut, testing::EndsWith(lines));
}

INSTANTIATE_TEST_SUITE_P(Of, LargeFile, testing::Values(0x80000000U, 0xFFFFFFFCU));

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
    EXPECT_LE(static_cast<uint64_t>(result.peakKiB), uBoundKiB);
}

} // namespace
