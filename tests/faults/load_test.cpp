// Runs at the limits: many files, files as large as they can be, and the memory
// that a full output queue takes.
#include "faults_support.h"
#include "sample_trace.h"

#include <algorithm>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <iostream>
#include <sys/resource.h>
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

/// All at the same time, merged and followed, where few descriptors are allowed at
/// first.
TEST(Load, ManyFilesAtOnceNeedFewThreads) {
    constexpr uint64_t RECORDS = 40;
    const uint64_t uFiles = SANITIZED ? 200 : 1024;
    rlimit descriptors{};
    getrlimit(RLIMIT_NOFILE, &descriptors);
    if (descriptors.rlim_max < uFiles + 100)
        GTEST_SKIP() << "no " << uFiles << " files may be open here";
    const temp_dir dir;
    const std::vector<sample_record> records(RECORDS, sample_uint32(1, 1, 0));
    std::vector<std::string> files{dir.file("0")};
    ASSERT_EQ(write_sample_trace(files[0], records, {.uFileSize = 4096}), TRACE_WRITER_OK);
    while (files.size() < uFiles) {
        files.push_back(dir.file(std::to_string(files.size())));
        std::filesystem::copy_file(files[0], files.back());
    }
    command_setup setup;
    setup.sProgram = "/bin/sh";
    for (const bool bFollow : {false, true}) {
        std::vector<std::string> arguments{
            "-c", "ulimit -Sn 100 && exec \"$0\" \"$@\"", KELVO_PROGRAM, "-r", "-o", "", "-s",
            "+0r"};
        if (bFollow)
            arguments.push_back("-f");
        arguments.insert(arguments.end(), files.begin(), files.end());
        live_command kelvo(arguments, setup);
        uint64_t uValues = 0; // two in each record
        long iThreads = 0, iKiB = 0;
        for (std::string sText; uValues < 2 * uFiles * RECORDS;) {
            sText = kelvo.read_text();
            if (sText.empty())
                break;
            uValues += static_cast<uint64_t>(std::ranges::count(sText, '='));
            iThreads = std::max(iThreads, atol(status_of(kelvo.pid(), "Threads").c_str()));
            iKiB = std::max(iKiB, atol(status_of(kelvo.pid(), "RssAnon").c_str()));
        }
        if (bFollow)
            kelvo.send_signal(SIGINT);
        const command_result result = kelvo.wait();
        expect_sound_end(result);
        ASSERT_EQ(result.sErr.substr(0, 1000), "");
        EXPECT_EQ(uValues, 2 * uFiles * RECORDS);
        EXPECT_LE(iThreads, 64);
        EXPECT_TRUE(SANITIZED || iKiB < 100 * 1024) << iKiB;
    }
}

/// A reader gets through its file though nothing of it is printed, since the output
/// is not read: what a live writer needs of it must not depend on other files.
TEST(Load, NoFileHoldsUpTheReaderOfAnother) {
    constexpr uint32_t RECORDS = 30'000;
    const temp_dir dir;
    const std::string sLong = dir.file("long");
    for (const bool bNewBases : {false, true}) {
        trace_writer writer;
        ASSERT_EQ(writer.create(sLong.c_str(), {.uFileSize = 64 * RECORDS}), TRACE_WRITER_OK);
        for (uint64_t i = 0; i < RECORDS; ++i) {
            const trace_origin origin{"_TST", 1, i};
            if (bNewBases && i % 100 == 30)
                writer.append_start(origin, 1, 2, {0, 0});
            else if (bNewBases && i % 100 == 60)
                writer.append_time_calibration(origin, {0, 0});
            else
                writer.append_uint32(origin, 1, 0);
        }
        const uint32_t uEnd = writer.next_seq_number();
        writer.close();
        ASSERT_EQ(uEnd, 2 * RECORDS + 2);
        for (const uint32_t uFiles : {8U, 64U})
            for (const char* const pMode : {"-r", "-rf"}) {
                std::vector<std::string> arguments{pMode, "-s", "+0r", sLong};
                while (arguments.size() < 3 + uFiles) {
                    const uint64_t uTime = arguments.size() * RECORDS / (3 + uFiles);
                    arguments.push_back(dir.file(std::to_string(arguments.size())));
                    ASSERT_EQ(write_sample_trace(arguments.back(), {sample_uint32(uTime, 1, 0)},
                                                 {.uFileSize = 4096}),
                              TRACE_WRITER_OK);
                }
                const live_command kelvo(arguments);
                uint32_t uSeqLock = 0;
                const int fd = open(sLong.c_str(), O_RDONLY | O_CLOEXEC);
                for (int i = 0; i < 20'000 && uSeqLock != uEnd; ++i) {
                    usleep(1000);
                    pread(fd, &uSeqLock, sizeof uSeqLock, offsetof(trace_file_header, uSeqLock));
                }
                close(fd);
                ASSERT_EQ(uSeqLock, uEnd) << uFiles << " files, " << pMode << ", " << bNewBases;
            }
    }
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
    std::string sLast;
    for (int iSame = 0; iSame < 5; usleep(50'000)) {
        const std::string sResident = status_of(pid, "VmRSS");
        iSame = sResident == sLast ? iSame + 1 : 0;
        sLast = sResident;
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
