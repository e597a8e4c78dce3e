// Following files while another process writes them: every record once and in
// order, at once, from the right one on, and what damage in one file means for
// the others.
#include "live_support.h"
#include "reader_place.h"
#include "temp_dir.h"

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstring>
#include <random>
#include <sstream>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using testing::ElementsAre;
using testing::HasSubstr;
using testing::Not;

using steady = std::chrono::steady_clock;

class Follow : public testing::Test {
protected:
    /// Ends a following run the way a user does, and expects it to end well.
    static command_result interrupt(live_command& kelvo) {
        kelvo.send_signal(SIGINT);
        const command_result result = kelvo.wait();
        EXPECT_EQ(result.status, 0);
        return result;
    }

    static void append(trace_writer& writer, const std::string& sText) {
        const uint64_t uNow = static_cast<uint64_t>(
            std::chrono::nanoseconds(std::chrono::system_clock::now().time_since_epoch()).count());
        ASSERT_EQ(writer.append_string({"_TST", 1, uNow}, sText), TRACE_WRITER_OK);
    }

    temp_dir m_dir;
    const std::string m_sFirst = m_dir.file("first.trc");
    const std::string m_sSecond = m_dir.file("second.trc");
};

// ------------------------------------------------------------ at full speed

uint64_t numbers_in(const missing_numbers& missing) {
    uint64_t uNumbers = 0;
    for (const auto& [uFile, ranges] : missing)
        for (const number_range& range : ranges)
            uNumbers += range.uLast - range.uFirst + 1;
    return uNumbers;
}

/// Reads until both files have brought their last record.
void read_all(record_stream& stream, uint64_t uRecords) {
    while (stream.last(0) < uRecords || stream.last(1) < uRecords)
        if (!stream.next())
            return;
}

TEST_F(Follow, EveryRecordThatWasNotDroppedComesOutOnceAndInOrder) {
    const uint64_t uRecords = setting("KELVO_TEST_LIVE_RECORDS", 40'000);
    const uint64_t uRounds = setting("KELVO_TEST_LIVE_ROUNDS", 2);
    for (uint64_t uRound = 0; uRound < uRounds; ++uRound) {
        const bool bRetry = uRound % 2 != 0;
        SCOPED_TRACE("round " + std::to_string(uRound));
        const std::string sSize = std::to_string(65536U << (uRound % 3 * 2));
        std::vector<std::string> arguments{"-w", "-s", sSize, "-n", std::to_string(uRecords)};
        if (bRetry)
            arguments.push_back("-r");
        arguments.insert(arguments.end(), {m_sFirst, m_sSecond});
        live_command writer(arguments, live_writer_setup());
        writer.read_line_with("ready");
        const auto begin = steady::now();
        live_command kelvo({"-f", "-s", "+0r", "-o", "s", m_sFirst, m_sSecond});
        record_stream stream(kelvo);
        read_all(stream, uRecords);
        const std::chrono::duration<double> seconds = steady::now() - begin;
        const missing_numbers dropped = dropped_by(writer.wait());
        kelvo.send_signal(SIGINT);
        stream.drain();
        const command_result result = kelvo.wait();
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.sErr, "");
        EXPECT_EQ(stream.last(0), uRecords);
        EXPECT_EQ(stream.last(1), uRecords);
        EXPECT_EQ(stream.missing(), dropped);
        EXPECT_EQ(stream.count() + numbers_in(dropped), 2 * uRecords);
        EXPECT_TRUE(!bRetry || dropped.empty());
        printf("round %llu: 2 x %llu records, %llu printed, %.2f s\n",
               static_cast<unsigned long long>(uRound), static_cast<unsigned long long>(uRecords),
               static_cast<unsigned long long>(stream.count()), seconds.count());
        if (HasFailure())
            return;
    }
}

// ------------------------------------------------------------------- at once

TEST_F(Follow, ARecordInAnIdleFileReachesThePipe) {
    const uint64_t uRecords = setting("KELVO_TEST_LIVE_SAMPLES", 12);
    trace_writer writer;
    ASSERT_EQ(writer.create(m_sFirst.c_str()), TRACE_WRITER_OK);
    append(writer, "n0");
    live_command kelvo({"-f", "-o", "", m_sFirst});
    kelvo.read_line_with("n0");
    std::mt19937 random(1);
    for (uint64_t i = 1; i <= uRecords; ++i) {
        usleep(static_cast<useconds_t>(20'000 + random() % 250'000));
        append(writer, "n" + std::to_string(i));
        ASSERT_THAT(kelvo.read_line(), HasSubstr("n" + std::to_string(i)));
    }
    interrupt(kelvo);
}

TEST_F(Follow, ClosingTheReadingEndOfAnIdleRunEndsIt) {
    trace_writer writer;
    ASSERT_EQ(writer.create(m_sFirst.c_str()), TRACE_WRITER_OK);
    append(writer, "n0");
    live_command kelvo({"-f", m_sFirst});
    kelvo.read_line_with("n0");
    kelvo.close_output();
    const command_result result = kelvo.wait();
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.sErr, "");
}

// ------------------------------------------------------- where a run begins

/// Waits until the run's reader has found its first record in the file.
void wait_for_reader(trace_writer& writer) {
    for (int i = 0; i < 60'000 && !reader_has_its_place(writer); ++i)
        usleep(1000);
}

/// The texts of the records in an output that was made with -o "".
std::vector<std::string> texts(const std::string& sOut) {
    std::vector<std::string> result;
    std::istringstream lines(sOut);
    for (std::string sLine; std::getline(lines, sLine);)
        if (sLine.find(':') == sLine.npos)
            result.push_back(sLine.substr(sLine.find_first_not_of(' ')));
    return result;
}

TEST_F(Follow, BeginsWithTheLastRecordUnlessAStartIsGiven) {
    const struct {
        std::vector<std::string> options;
        std::vector<std::string> expected;
    } cases[] = {
        {{}, {"n5", "n6"}},
        {{"-i"}, {"n5", "n6"}},
        {{"-s", "+0r"}, {"n1", "n2", "n3", "n4", "n5", "n6"}},
        {{"-s", "-2r"}, {"n3", "n4", "n5", "n6"}},
        {{"-s", "+6r"}, {"n6"}},
        {{"-s", ""}, {"n6"}},
        {{"-s", "-0s"}, {"n6"}},
    };
    for (const auto& [options, expected] : cases) {
        SCOPED_TRACE(testing::PrintToString(options));
        trace_writer writer;
        ASSERT_EQ(writer.create(m_sFirst.c_str()), TRACE_WRITER_OK);
        for (int i = 1; i <= 5; ++i)
            append(writer, "n" + std::to_string(i));
        std::vector<std::string> arguments{"-f", "-o", ""};
        arguments.insert(arguments.end(), options.begin(), options.end());
        arguments.push_back(m_sFirst);
        live_command kelvo(arguments);
        wait_for_reader(writer);
        append(writer, "n6");
        std::string sOut;
        while (sOut.find("n6\n") == sOut.npos && !HasFailure())
            sOut += kelvo.read_text();
        EXPECT_EQ(texts(sOut), expected);
        EXPECT_EQ(interrupt(kelvo).sErr, ""); // no progress line either
    }
}

TEST_F(Follow, WithoutLocksTheRunDoesNotFollow) {
    trace_writer writer;
    ASSERT_EQ(writer.create(m_sFirst.c_str()), TRACE_WRITER_OK);
    for (int i = 1; i <= 5; ++i)
        append(writer, "n" + std::to_string(i));
    const command_result result = run_command({"-f", "-z", "-o", "", m_sFirst});
    EXPECT_EQ(result.status, 0);
    EXPECT_THAT(texts(result.sOut), ElementsAre("n1", "n2", "n3", "n4", "n5"));
}

// -------------------------------------------------------------------- damage

/// Makes what stands behind the newest record unreadable.
void damage(trace_writer& writer) {
    std::byte* const pFile = writer.mapping().data();
    uint32_t uOldest;
    memcpy(&uOldest, pFile + offsetof(trace_file_header, uOldestRecordOffset), sizeof(uOldest));
    auto* const pFunction =
        reinterpret_cast<uint16_t*>(pFile + uOldest + offsetof(trace_record_header, function));
    __atomic_store_n(pFunction, uint16_t{18}, __ATOMIC_RELEASE);
}

TEST_F(Follow, DamageEndsItsFileOnly) {
    trace_writer first;
    trace_writer second;
    ASSERT_EQ(first.create(m_sFirst.c_str()), TRACE_WRITER_OK);
    ASSERT_EQ(second.create(m_sSecond.c_str()), TRACE_WRITER_OK);
    live_command kelvo({"-f", "-s", "+0r", m_sFirst, m_sSecond});
    wait_for_reader(first);
    wait_for_reader(second);
    append(first, "before");
    kelvo.read_line_with("before");
    append(second, "other");
    for (int i = 0; i < 1000; ++i)
        append(first, "queued" + std::to_string(i));
    damage(first);
    for (int i = 0; i < 1000; ++i)
        kelvo.read_line_with("queued" + std::to_string(i));
    kelvo.wait_for_error("invalid record function type: file(" + m_sFirst + ")");
    for (int i = 0; i < 1000 && is_locked(m_sFirst); ++i)
        usleep(10'000);
    EXPECT_FALSE(is_locked(m_sFirst));
    EXPECT_TRUE(is_locked(m_sSecond));
    append(second, "more of the other");
    kelvo.read_line_with("more of the other");

    damage(second);
    kelvo.wait_for_error(m_sSecond);
    append(second, "unread");
    usleep(150'000);
    const command_result result = interrupt(kelvo);
    EXPECT_EQ(std::count(result.sErr.begin(), result.sErr.end(), '\n'), 2) << result.sErr;
    EXPECT_THAT(result.sOut, Not(HasSubstr("unread")));
}

} // namespace
