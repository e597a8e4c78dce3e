// Damaged files through the real command: each kind of damage is named with its
// file and offset, what stands before it is printed, and a healthy file in the
// same run is printed whole.
#include "raw_trace.h"
#include "run_command.h"
#include "sample_trace.h"
#include "temp_dir.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <functional>
#include <unistd.h>

namespace {

using testing::HasSubstr;
using testing::MatchesRegex;

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
    raw_trace sound_file() {
        raw_trace file(4096);
        for (uint32_t i = 0; i < RECORDS; ++i)
            file.add({.function = TRC_FUNC_UINT32,
                      .seqNumber = 2 * i + 2,
                      .timeStamp = 1000 * i,
                      .body = raw_bytes(uint32_t{1}, i)});
        file.header.uOldestRecordOffset = file.add_rest();
        return file;
    }

    command_result run(const raw_trace& damaged) {
        EXPECT_TRUE(damaged.write(m_damaged));
        return run_command({"-r", "-o", "", m_damaged, m_healthy});
    }

    /// How many of the damaged file's records were printed, in order.
    static uint32_t printed_of_damaged(const std::string& sOut) {
        uint32_t i = 0;
        for (char text[64]; i < RECORDS; ++i) {
            snprintf(text, sizeof text, "[00] id=0x00000001 val=0x%08x\n", i);
            if (sOut.find(text) == std::string::npos)
                break;
        }
        return i;
    }

    void expect_damage(const raw_trace& damaged, const std::string& sMessage, uint32_t uPrinted) {
        const command_result result = run(damaged);
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.signo, 0);
        EXPECT_THAT(result.sErr, MatchesRegex(sMessage));
        EXPECT_EQ(printed_of_damaged(result.sOut), uPrinted);
        EXPECT_THAT(result.sOut, HasSubstr("[01] id=0x00000001 val=0x000000a1\n"
                                           "[01] id=0x00000001 val=0x000000a2\n"));
    }

    /// A message as a pattern: brackets and the like are literal.
    static std::string literally(const std::string& sText) {
        std::string pattern;
        for (char c : sText) {
            if (strchr("()[].*+?", c) != nullptr)
                pattern += '\\';
            pattern += c;
        }
        return pattern;
    }

    temp_dir m_dir;
    std::string m_damaged = m_dir.file("damaged.trc");
    std::string m_healthy = m_dir.file("healthy.trc");
};

std::vector<std::byte> word(uint32_t uValue) {
    return raw_bytes(uValue);
}

TEST_F(Corruption, OfARecordHeaderIsNamedAndEndsItsFile) {
    const uint32_t uThird = AREA + 2 * RECORD;
    const struct {
        uint32_t uField; ///< in the third record's header
        std::vector<std::byte> bytes;
        std::string sMessage;
    } cases[] = {
        {4, raw_bytes(uint16_t{18}),
         "invalid record function type: file(@) record_offset(0x00000110) function(18).\n"},
        {4, raw_bytes(uint16_t{0xFFFF}),
         "invalid record function type: file(@) record_offset(0x00000110) function(65535).\n"},
        {12, raw_bytes(std::string_view("A\tB\x7f")),
         "invalid record compId: file(@) record_offset(0x00000110) compId[0-3][0x419427f])\n"},
        {0, word(0), "invalid record length: file(@) record_offset(0x00000110) length(0).\n"},
        {0, word(27), "invalid record length: file(@) record_offset(0x00000110) length(27).\n"},
    };
    for (const auto& damage : cases) {
        raw_trace file = sound_file();
        file.put(uThird + damage.uField, damage.bytes);
        std::string sMessage = CORRUPT + damage.sMessage;
        sMessage.replace(sMessage.find('@'), 1, m_damaged);
        expect_damage(file, literally(sMessage), 2);
    }
}

TEST_F(Corruption, OfPositionsIsNamedAndEndsItsFile) {
    const std::string sBounds = literally(CORRUPT + "pCurRec out of bounds: file(" + m_damaged) +
                                "\\) pHeader\\(0x[0-9a-f]+\\) pCurRec\\(0x[0-9a-f]+\\) "
                                "pMapEnd\\(0x[0-9a-f]+\\)\\.\n";
    for (uint32_t uLength : {4096U - AREA - 2 * RECORD + 1, 4096U - AREA - 2 * RECORD - 27,
                             0x7FFFFFFFU, 0xFFFFFFE4U, 0xFFFFFFFFU}) {
        raw_trace file = sound_file();
        // The damaged record itself is printed; it only leads nowhere.
        file.put(AREA + 2 * RECORD, word(uLength));
        if (uLength >= 4096U - AREA - 2 * RECORD)
            file.header.uOldestRecordOffset = AREA;
        const command_result result = run(file);
        EXPECT_THAT(result.sErr, testing::AnyOf(MatchesRegex(sBounds), HasSubstr("Bad trace file")))
            << uLength;
        EXPECT_THAT(result.sOut, HasSubstr("val=0x000000a2\n")) << uLength;
    }
    for (uint32_t uOldest : {0U, 199U, 4096U - 27, 4096U, 0xFFFFFFFFU}) {
        raw_trace file = sound_file();
        file.header.uOldestRecordOffset = uOldest;
        expect_damage(file, sBounds, 0);
    }
}

TEST_F(Corruption, ARecordAcrossTheOldestPositionEndsTheReadingOfItsFile) {
    raw_trace file = sound_file();
    file.header.uOldestRecordOffset += 4; // the filler's bytes there read as a short record
    file.put(file.header.uOldestRecordOffset,
             raw_record{.function = TRC_FUNC_FILLER,
                        .seqNumber = TRC_SEQ_FILLER,
                        .length = 4096 - file.header.uOldestRecordOffset});
    // The last record now runs over the oldest position by four bytes less
    // than nothing: make it do so.
    file.put(AREA + 4 * RECORD, word(RECORD + 8));
    expect_damage(file,
                  literally("Bad trace file, last record length is not correct. offset=344 "
                            "(0x158), length=44, function=6, seqNumber=10 (0xa)\n"),
                  4);
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
