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

constexpr uint32_t AREA = 200;
constexpr uint32_t RECORD = 36;
constexpr uint32_t RECORDS = 5;

const std::string CORRUPT = "WARNING: Irrecoverable corruption detected (giving up on the rest of "
                            "this file): ";

class Corruption : public testing::Test {
protected:
    Corruption() {
        EXPECT_EQ(write_sample_trace(
                      m_healthy, {sample_uint32(10'000, 1, 0xA1), sample_uint32(20'000, 1, 0xA2)}),
                  TRACE_WRITER_OK);
    }

    /// Five records of 36 bytes from offset 200 on, then a filler to the end.
    static raw_trace sound_file() {
        raw_trace file(4096);
        for (uint32_t i = 0; i < RECORDS; ++i)
            file.add({.function = TRC_FUNC_UINT32,
                      .seqNumber = 2 * i + 2,
                      .timeStamp = 1000 * i,
                      .body = raw_bytes(uint32_t{1}, i)});
        file.header.uOldestRecordOffset = file.add_rest();
        return file;
    }

    temp_dir m_dir;
    std::string m_damaged = m_dir.file("damaged.trc");
    std::string m_healthy = m_dir.file("healthy.trc");
};

TEST_F(Corruption, IsNamedAndEndsItsFileOnly) {
    constexpr uint32_t THIRD = AREA + 2 * RECORD, LAST = AREA + 4 * RECORD;
    constexpr uint32_t OLDEST = offsetof(trace_file_header, uOldestRecordOffset);
    const struct {
        uint32_t uAt;
        std::vector<std::byte> bytes;
        std::string sMessage; ///< "@" for the file
        size_t uPrinted;
    } cases[] = {
        {THIRD + 4, raw_bytes(uint16_t{18}),
         CORRUPT + "invalid record function type: file(@) record_offset(0x00000110) function(18)",
         2},
        {THIRD + 12, raw_bytes("A\tB\x7f"), CORRUPT + "invalid record compId: file(@) ", 2},
        {THIRD, raw_bytes(27U), CORRUPT + "invalid record length: file(@) ", 2},
        {THIRD, raw_bytes(0xFFFFFFE4U), CORRUPT + "pCurRec out of bounds: file(@) pHeader(0x", 3},
        {OLDEST, raw_bytes(4096U - 27), CORRUPT + "pCurRec out of bounds: file(@) pHeader(0x", 0},
        {LAST, raw_bytes(RECORD + 8),
         "Bad trace file, last record length is not correct. offset=344 (0x158), length=44, "
         "function=6, seqNumber=10 (0xa)\n",
         4},
    };
    for (const auto& damage : cases) {
        raw_trace file = sound_file();
        std::vector<std::byte> bytes = file.bytes();
        std::copy(damage.bytes.begin(), damage.bytes.end(), bytes.begin() + damage.uAt);
        ASSERT_TRUE(write_file(m_damaged, bytes));
        const command_result result = run_command({"-r", "-o", "", m_damaged, m_healthy});
        EXPECT_EQ(result.status, 0);
        std::string sMessage = damage.sMessage;
        if (const size_t uName = sMessage.find('@'); uName != sMessage.npos)
            sMessage.replace(uName, 1, m_damaged);
        EXPECT_THAT(result.sErr, StartsWith(sMessage));
        EXPECT_EQ(std::count(result.sErr.begin(), result.sErr.end(), '\n'), 1) << result.sErr;
        std::string sExpected;
        for (uint32_t i = 0; i < damage.uPrinted; ++i)
            sExpected += "[00] id=0x00000001 val=0x0000000" + std::to_string(i) + '\n';
        sExpected += "[01] id=0x00000001 val=0x000000a1\n[01] id=0x00000001 val=0x000000a2\n";
        EXPECT_THAT(result.sOut, EndsWith(" Level: kelvo\n" + sExpected)) << sMessage;
    }
}

/// Only a file that changes while it is followed can get there: its size was
/// tested when it was opened.
TEST_F(Corruption, AFollowedFileThatShrinksInItsOwnHeaderIsNamedAgainAndAgain) {
    const raw_trace file = sound_file();
    ASSERT_TRUE(file.write(m_damaged));
    live_command kelvo({"-f", "-r", "-o", "", "-s", "+0r", m_damaged, m_healthy});
    kelvo.read_line_with("val=0x00000004");
    const int fd = open(m_damaged.c_str(), O_RDWR);
    const uint32_t uSmall = 100;
    ASSERT_EQ(pwrite(fd, &uSmall, sizeof uSmall, offsetof(trace_file_header, uActualFileSize)), 4);
    const std::string sMessage =
        "Bad trace file, last record extends beyond end of file, offset = 380 (0x17c).\n";
    kelvo.wait_for_error(sMessage + sMessage);
    const uint32_t uSize = 4096;
    ASSERT_EQ(pwrite(fd, &uSize, sizeof uSize, offsetof(trace_file_header, uActualFileSize)), 4);
    close(fd);
    kelvo.send_signal(SIGINT);
    EXPECT_EQ(kelvo.wait().status, 0);
}

} // namespace
