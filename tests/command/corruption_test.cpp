// Damaged files through the real command: each kind of damage is named with its
// file and offset, what stands before it is printed, and a healthy file in the
// same run is printed whole.
#include "raw_trace.h"
#include "run_command.h"
#include "sample_trace.h"
#include "temp_dir.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <fcntl.h>
#include <unistd.h>

namespace {

using testing::EndsWith;
using testing::StartsWith;

class Corruption : public testing::Test {
protected:
    /// Five records of 36 bytes from offset 200 on, and another file.
    Corruption() {
        std::vector<sample_record> records;
        for (uint32_t i = 0; i < 5; ++i)
            records.push_back(sample_uint32(1000 * i, 1, i));
        EXPECT_EQ(write_sample_trace(m_damaged, records, {.uFileSize = 4096}), TRACE_WRITER_OK);
        records = {sample_uint32(10'000, 1, 0xA1), sample_uint32(20'000, 1, 0xA2)};
        EXPECT_EQ(write_sample_trace(m_healthy, records), TRACE_WRITER_OK);
    }

    void damage(size_t uAt, trace_bytes bytes) const {
        const int fd = open(m_damaged.c_str(), O_RDWR);
        EXPECT_EQ(pwrite(fd, bytes.data(), bytes.size(), static_cast<off_t>(uAt)),
                  std::ssize(bytes));
        close(fd);
    }

    temp_dir m_dir;
    const std::string m_damaged = m_dir.file("damaged.trc");
    const std::string m_healthy = m_dir.file("healthy.trc");
};

TEST_F(Corruption, IsNamedAndEndsItsFileOnly) {
    constexpr size_t THIRD = 272, LAST = 344;
    const std::string sCorrupt = "WARNING: Irrecoverable corruption detected (giving up on the "
                                 "rest of this file): ";
    const std::string sFile = "file(" + m_damaged + ") ";
    const std::string sOutside = sCorrupt + "pCurRec out of bounds: " + sFile + "pHeader(0x";
    const struct {
        size_t uAt;
        std::vector<std::byte> bytes;
        std::string sMessage;
        uint32_t uPrinted;
    } cases[] = {
        {THIRD + 4, raw_bytes(uint16_t{18}),
         sCorrupt + "invalid record function type: " + sFile +
             "record_offset(0x00000110) function(18)",
         2},
        {THIRD, raw_bytes(0xFFFFFFE4U), sOutside, 3},
        {offsetof(trace_file_header, uOldestRecordOffset), raw_bytes(4096U - 27), sOutside, 0},
        {LAST, raw_bytes(36U + 8),
         "Bad trace file, last record length is not correct. offset=344 (0x158), length=44, "
         "function=6, seqNumber=10 (0xa)\n",
         4},
    };
    const std::vector<std::byte> sound = read_file(m_damaged);
    for (const auto& [uAt, bytes, sMessage, uPrinted] : cases) {
        ASSERT_TRUE(write_file(m_damaged, sound));
        damage(uAt, bytes);
        const command_result result = run_command({"-r", "-o", "", m_damaged, m_healthy});
        EXPECT_EQ(result.status, 0);
        EXPECT_THAT(result.sErr, StartsWith(sMessage));
        EXPECT_EQ(std::count(result.sErr.begin(), result.sErr.end(), '\n'), 1) << result.sErr;
        std::string sExpected = " Level: kelvo\n";
        for (uint32_t i = 0; i < uPrinted; ++i)
            sExpected += "[00] id=0x00000001 val=0x0000000" + std::to_string(i) + '\n';
        sExpected += "[01] id=0x00000001 val=0x000000a1\n[01] id=0x00000001 val=0x000000a2\n";
        EXPECT_THAT(result.sOut, EndsWith(sExpected)) << sMessage;
    }
}

/// Only a file that changes while it is followed can get there: its size was
/// tested when it was opened.
TEST_F(Corruption, AFollowedFileThatShrinksInItsOwnHeaderIsNamedAgainAndAgain) {
    constexpr size_t SIZE = offsetof(trace_file_header, uActualFileSize);
    live_command kelvo({"-f", "-r", "-o", "", "-s", "+0r", m_damaged, m_healthy});
    kelvo.read_line_with("val=0x00000004");
    damage(SIZE, raw_bytes(100U));
    const std::string sMessage =
        "Bad trace file, last record extends beyond end of file, offset = 380 (0x17c).\n";
    kelvo.wait_for_error(sMessage + sMessage);
    damage(SIZE, raw_bytes(4096U));
    kelvo.send_signal(SIGINT);
    EXPECT_EQ(kelvo.wait().status, 0);
}

} // namespace
