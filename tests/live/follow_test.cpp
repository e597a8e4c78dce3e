// Following files while another process writes them: every record once and in
// order, at once, from the right one on, and what damage in one file means for
// the others.
#include "live_support.h"
#include "temp_dir.h"

#include <algorithm>
#include <chrono>
#include <csignal>
#include <random>
#include <thread>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using testing::HasSubstr;
using testing::Not;

class Follow : public testing::Test {
protected:
    /// Ends a following run the way a user does, and expects it to end well.
    static command_result interrupt(live_command& kelvo) {
        kelvo.send_signal(SIGINT);
        const command_result result = kelvo.wait();
        EXPECT_EQ(result.status, 0);
        return result;
    }

    /// Waits for room where a reader has left none.
    static void append(trace_writer& writer, const std::string& sText) {
        const uint64_t uNow = static_cast<uint64_t>(
            std::chrono::nanoseconds(std::chrono::system_clock::now().time_since_epoch()).count());
        trace_writer_status status = TRACE_WRITER_DROPPED;
        for (int i = 0; i < 100'000 && status == TRACE_WRITER_DROPPED; ++i) {
            status = writer.append_string({"_TST", 1, uNow}, sText);
            if (status == TRACE_WRITER_DROPPED)
                usleep(100);
        }
        ASSERT_EQ(status, TRACE_WRITER_OK);
    }

    /// Makes the first file with records n1, n2 and so on.
    void make(int iRecords) {
        ASSERT_EQ(m_first.create(m_sFirst.c_str()), TRACE_WRITER_OK);
        for (int i = 1; i <= iRecords; ++i)
            append(m_first, "n" + std::to_string(i));
    }

    temp_dir m_dir;
    const std::string m_sFirst = m_dir.file("first.trc");
    const std::string m_sSecond = m_dir.file("second.trc");
    trace_writer m_first;
};

// ------------------------------------------------------------ at full speed

TEST_F(Follow, EveryRecordThatWasNotDroppedComesOutOnceAndInOrder) {
    const uint64_t uRecords = setting("KELVO_TEST_LIVE_RECORDS", 40'000);
    const uint64_t uRounds = setting("KELVO_TEST_LIVE_ROUNDS", 2);
    for (uint64_t uRound = 0; uRound < uRounds && !HasFailure(); ++uRound) {
        SCOPED_TRACE("round " + std::to_string(uRound));
        live_files files(m_sFirst, m_sSecond, 65536U << (uRound % 3 * 2));
        live_command kelvo({"-f", "-s", "+0r", "-o", "s", m_sFirst, m_sSecond});
        std::jthread writing([&] {
            for (trace_writer& writer : files.writers)
                wait_for_reader(writer);
            files.write(uRecords, uRound % 2 != 0);
        });
        record_stream stream(kelvo);
        while ((stream.last[0] < uRecords || stream.last[1] < uRecords) && stream.next()) {
        }
        writing.join();
        kelvo.send_signal(SIGINT);
        stream.finish();
        EXPECT_EQ(stream.last[0], uRecords);
        EXPECT_EQ(stream.last[1], uRecords);
        EXPECT_EQ(stream.uCount, files.uWritten);
        EXPECT_EQ(stream.missing, files.dropped);
    }
}

// ------------------------------------------------------------------- at once

TEST_F(Follow, AnIdleRunPrintsWhatComesAtOnceAndEndsWithItsReader) {
    const uint64_t uRecords = setting("KELVO_TEST_LIVE_SAMPLES", 12);
    make(1);
    live_command kelvo({"-f", "-o", "", m_sFirst});
    kelvo.read_line_with("n1");
    std::mt19937 random(1);
    for (uint64_t i = 2; i <= uRecords; ++i) {
        usleep(static_cast<useconds_t>(20'000 + random() % 250'000));
        append(m_first, "n" + std::to_string(i));
        ASSERT_THAT(kelvo.read_line(), HasSubstr("n" + std::to_string(i)));
    }
    kelvo.close_output();
    const command_result result = kelvo.wait();
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.sErr, "");
}

// ------------------------------------------------------- where a run begins

TEST_F(Follow, BeginsWithTheLastRecordUnlessAStartIsGiven) {
    const struct {
        std::vector<std::string> options;
        std::string sExpected;
    } cases[] = {
        {{}, "  n5  n6"},
        {{"-i"}, "  n5  n6"},
        {{"-s", "+0r"}, "  n1  n2  n3  n4  n5  n6"},
        {{"-s", "-2r"}, "  n3  n4  n5  n6"},
        {{"-s", "+6r"}, "  n6"},
        {{"-s", ""}, "  n6"},
        {{"-s", "-0s"}, "  n6"},
    };
    for (const auto& [options, sExpected] : cases) {
        SCOPED_TRACE(testing::PrintToString(options));
        make(5);
        std::vector<std::string> arguments{m_sFirst, "-f", "-o", ""};
        arguments.insert(arguments.end(), options.begin(), options.end());
        live_command kelvo(arguments);
        wait_for_reader(m_first);
        append(m_first, "n6");
        std::string sLine, sRecords;
        do {
            sLine = kelvo.read_line();
            if (sLine.find(':') == sLine.npos)
                sRecords += sLine;
        } while (!sLine.empty() && !sLine.ends_with("n6"));
        EXPECT_EQ(sRecords, sExpected);
        EXPECT_EQ(interrupt(kelvo).sErr, ""); // no progress line either
    }
}

// ------------------------------------------------------- others at the file

TEST_F(Follow, AFileNamedAgainHasOneReader) {
    constexpr int RECORDS = 3000;
    make(2);
    const std::string sLink = m_dir.file("link"), sOther = m_dir.file("other"),
                      sSpelling = m_dir.path() + "/./first.trc";
    ASSERT_EQ(link(m_sFirst.c_str(), sOther.c_str()), 0);
    ASSERT_EQ(symlink(m_sFirst.c_str(), sLink.c_str()), 0);
    live_command kelvo({"-f", "-s", "+0r", "-o", "", m_sFirst, m_sFirst, sSpelling, sLink, sOther});
    for (const std::string& sName : {m_sFirst, sSpelling, sLink, sOther})
        EXPECT_EQ(kelvo.read_line_with("2625-"),
                  KELVO_PROGRAM ": 2625-161 Trace file \"" + sName + "\" is already in use.");
    wait_for_reader(m_first);
    for (int i = 3; i <= RECORDS; ++i)
        append(m_first, "n" + std::to_string(i));
    for (int i = 1; i <= RECORDS; ++i)
        ASSERT_TRUE(kelvo.read_line_with("  n").ends_with("  n" + std::to_string(i))) << i;
    EXPECT_EQ(interrupt(kelvo).sOut, "");
}

/// While it lasts, another run without a lock takes the reader's words for its own.
/// The file is written round and round only when it is over.
TEST_F(Follow, ARunWithoutALockBesideItDoesNoHarm) {
    constexpr int RECORDS = 30'000, ROOM = 4000;
    ASSERT_EQ(m_first.create(m_sFirst.c_str(), {.uFileSize = 40 * ROOM}), TRACE_WRITER_OK);
    append(m_first, "n1");
    live_command kelvo({"-f", "-s", "+0r", "-o", "", m_sFirst});
    wait_for_reader(m_first);
    int iLast = 1;
    std::jthread writing([&](const std::stop_token& ends) {
        while (!ends.stop_requested()) {
            usleep(200);
            if (iLast < ROOM / 2)
                append(m_first, "n" + std::to_string(++iLast));
            m_first.poll();
        }
    });
    for (int i = 0; i < 3; ++i) {
        const command_result other = run_command({"-z", "-o", "", m_sFirst});
        EXPECT_EQ(other.status, 0);
        EXPECT_THAT(other.sOut, HasSubstr("\n  n1\n"));
    }
    writing.request_stop();
    writing.join();
    const auto& header = *reinterpret_cast<const trace_file_header*>(m_first.mapping().data());
    const auto seq_lock = [&] { return __atomic_load_n(&header.uSeqLock, __ATOMIC_ACQUIRE); };
    for (int i = 0; i < 10'000 && seq_lock() != m_first.next_seq_number(); ++i)
        usleep(1000);
    ASSERT_EQ(seq_lock(), m_first.next_seq_number()) << "the reader's word was not put right";
    writing = std::jthread([&] {
        while (iLast < RECORDS && !HasFailure())
            append(m_first, "n" + std::to_string(++iLast));
    });
    for (int i = 1; i <= RECORDS; ++i)
        ASSERT_TRUE(kelvo.read_line_with("  n").ends_with("  n" + std::to_string(i))) << i;
    EXPECT_EQ(interrupt(kelvo).sErr, "");
}

// -------------------------------------------------------------------- damage

/// Makes what stands behind the newest record unreadable.
void damage(trace_writer& writer) {
    const auto file = writer.mapping();
    const size_t uGap = load<uint32_t>(file, offsetof(trace_file_header, uOldestRecordOffset));
    std::byte* const pFunction = &file[uGap + offsetof(trace_record_header, function)];
    __atomic_store_n(reinterpret_cast<uint16_t*>(pFunction), uint16_t{18}, __ATOMIC_RELEASE);
}

TEST_F(Follow, DamageEndsItsFileOnly) {
    make(0);
    trace_writer second;
    ASSERT_EQ(second.create(m_sSecond.c_str()), TRACE_WRITER_OK);
    live_command kelvo({"-f", "-s", "+0r", m_sFirst, m_sSecond});
    wait_for_reader(m_first);
    wait_for_reader(second);
    append(second, "other");
    for (int i = 0; i < 1000; ++i)
        append(m_first, "queued" + std::to_string(i));
    damage(m_first);
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
