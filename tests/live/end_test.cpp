// How runs end: by the signals of a terminal and of a pipe, by others, by
// faults, and what a killed reader or writer leaves behind.
#include "live_support.h"
#include "sample_trace.h"
#include "temp_dir.h"

#include <csignal>
#include <cstring>
#include <random>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using testing::IsEmpty;

class End : public testing::Test {
protected:
    End() {
        m_setup.sDirectory = m_dir.path(); // a core file goes with the directory
        // A sanitizer would report these signals and end the process its own way.
        for (const char* pName : {"ASAN_OPTIONS", "TSAN_OPTIONS"})
            m_setup.environment.push_back(sanitizer_option(
                pName, "handle_segv=0:handle_sigbus=0:handle_sigfpe=0:handle_sigill=0"));
    }

    /// A run that follows both files from their first record on.
    live_command start_following() {
        return live_command({"-f", "-s", "+0r", "-o", "s", m_sFirst, m_sSecond}, m_setup);
    }

    useconds_t up_to(unsigned int uMicroseconds) {
        return static_cast<useconds_t>(m_random() % uMicroseconds);
    }

    temp_dir m_dir;
    const std::string m_sFirst = m_dir.file("first.trc");
    const std::string m_sSecond = m_dir.file("second.trc");
    command_setup m_setup;
    std::mt19937 m_random{static_cast<unsigned int>(getpid())};
};

// ------------------------------------------------------- terminating signals

/// Waits until the process has handlers of its own.
void wait_until_armed(pid_t pid) {
    const uint64_t uWanted = uint64_t{1} << (SIGPIPE - 1) | uint64_t{1} << (SIGTTOU - 1);
    for (int i = 0; i < 60'000; ++i) {
        if ((strtoull(status_of(pid, "SigCgt").c_str(), nullptr, 16) & uWanted) == uWanted)
            return;
        usleep(1000);
    }
    ADD_FAILURE() << "no handlers";
}

TEST_F(End, TerminatingSignalsEndAFollowingRunAtAnyMoment) {
    const uint64_t uTimes = setting("KELVO_TEST_LIVE_SIGNALS", 9);
    const live_writer writer(m_sFirst, m_sSecond);
    for (uint64_t i = 0; i < uTimes; ++i)
        for (const int signo : {SIGINT, SIGQUIT, SIGTSTP, SIGTTIN, SIGTTOU, SIGPIPE}) {
            SCOPED_TRACE(strsignal(signo));
            live_command kelvo = start_following();
            record_stream stream(kelvo);
            switch (i % 3) {
            case 0: // from the moment on at which it can take signals
                wait_until_armed(kelvo.pid());
                // Unlike the others it may reach a thread that is just being made,
                // before the thread sanitizer knows the thread.
                if (signo == SIGPIPE)
                    stream.next();
                usleep(up_to(60'000));
                break;
            case 1: // while its reader keeps up
                stream.read(1 + up_to(10'000));
                break;
            case 2: // while nobody reads
                stream.next();
                usleep(up_to(40'000));
                break;
            }
            kelvo.send_signal(signo);
            usleep(up_to(5000));
            stream.finish();
            ASSERT_FALSE(HasFailure());
        }
}

/// Also while a run that is short of memory shows its files and waits.
TEST_F(End, ATerminatingSignalEndsThePauseOfARunShortOfMemory) {
    ASSERT_EQ(write_sample_trace(m_sFirst, {sample_string(8, "later")}), TRACE_WRITER_OK);
    ASSERT_EQ(
        write_sample_trace(m_sSecond, {sample_string(1007, "earlier")}, {.timeInfo = {0, 1000}}),
        TRACE_WRITER_OK);
    m_setup.environment.push_back("KELVO_USE_LOWMEM=1");
    live_command kelvo({m_sFirst, m_sSecond}, m_setup);
    kelvo.wait_for_error(
        std::string(32, '=') + "SORTED TRACE FILE LIST" + std::string(35, '=') +
        "\nFileIndex: 001\tTimeStamp: 00000000000000001007\tFileName: " + m_sSecond +
        "\nFileIndex: 000\tTimeStamp: 00000000000000000008\tFileName: " + m_sFirst + "\n");
    kelvo.send_signal(SIGINT);
    EXPECT_EQ(kelvo.wait().status, 0);
}

TEST_F(End, OtherSignalsKeepTheirEffect) {
    trace_writer writer;
    ASSERT_EQ(writer.create(m_sFirst.c_str()), TRACE_WRITER_OK);
    for (const int signo : {SIGTERM, SIGHUP, SIGSEGV, SIGBUS}) {
        live_command kelvo({"-f", m_sFirst}, m_setup);
        kelvo.read_line_with("Build Level");
        kelvo.send_signal(signo);
        EXPECT_EQ(kelvo.wait().signo, signo);
    }
}

// -------------------------------------------------------------------- faults

TEST_F(End, AFileTruncatedWhileItIsFollowedEndsTheRun) {
    for (const std::string& sTruncated : {m_sFirst, m_sSecond}) {
        for (const std::string& sPath : {m_sFirst, m_sSecond})
            ASSERT_EQ(write_sample_trace(sPath, {sample_string(1, "only")}), TRACE_WRITER_OK);
        live_command kelvo({"-f", m_sFirst, m_sSecond}, m_setup);
        kelvo.read_line_with("only");
        kelvo.read_line_with("only");
        ASSERT_EQ(truncate(sTruncated.c_str(), 0), 0);
        EXPECT_EQ(kelvo.wait().signo, SIGBUS);
    }
}

/// Outside follow mode the reader meets it while the main thread writes.
TEST_F(End, AFileTruncatedWhileItIsReadEndsTheRun) {
    const std::vector<sample_record> records(200'000, sample_uint32(1, 1, 0)); // much text
    ASSERT_EQ(write_sample_trace(m_sFirst, records, {.uFileSize = 8'000'000}), TRACE_WRITER_OK);
    live_command kelvo({"-r", m_sFirst}, m_setup);
    kelvo.read_line_with("val=0x00000000");
    usleep(up_to(100'000));
    ASSERT_EQ(truncate(m_sFirst.c_str(), 0), 0);
    const command_result result = kelvo.wait();
    EXPECT_EQ(result.signo, SIGBUS) << result.sErr;
}

// ------------------------------------------------------------ killed processes

TEST_F(End, AKilledWriterLeavesAFileThatCanBeRead) {
    const uint64_t uTimes = setting("KELVO_TEST_LIVE_KILLS", 8);
    for (uint64_t i = 0; i < uTimes && !HasFailure(); ++i) {
        live_writer writer(m_sFirst, m_sSecond);
        uint64_t uLast = 0;
        if (i % 2 == 0) {
            usleep(up_to(30'000));
            writer.kill();
        } else {
            live_command follower = start_following();
            record_stream stream(follower);
            stream.read(1 + up_to(5000));
            usleep(up_to(2000));
            writer.kill();
            usleep(150'000); // what is there is taken
            follower.send_signal(SIGINT);
            stream.finish();
            EXPECT_THAT(stream.missing, IsEmpty());
            uLast = stream.last[0];
        }
        EXPECT_FALSE(is_locked(m_sFirst));
        live_command kelvo({"-o", "s", m_sFirst, m_sSecond}, m_setup);
        record_stream stream(kelvo);
        stream.finish();
        EXPECT_THAT(stream.missing, IsEmpty());
        EXPECT_GE(stream.last[0], uLast);
    }
}

TEST_F(End, AKilledReaderIsForgotten) {
    const uint64_t uTimes = setting("KELVO_TEST_LIVE_KILLS", 8);
    const live_writer writer(m_sFirst, m_sSecond);
    uint64_t uLast = 0;
    for (uint64_t i = 0; i < uTimes && !HasFailure(); ++i) {
        live_command killed = start_following();
        usleep(up_to(120'000)); // also while it looks for its first record
        killed.send_signal(SIGKILL);
        killed.wait();
        EXPECT_FALSE(is_locked(m_sFirst) || is_locked(m_sSecond));
        // Only a writer that goes on brings numbers beyond those that were there.
        live_command kelvo = start_following();
        record_stream stream(kelvo);
        while (stream.last[0] <= uLast + 20'000 && stream.next()) {
        }
        uLast = stream.last[0];
        kelvo.send_signal(SIGINT);
        stream.finish();
        EXPECT_THAT(stream.missing, IsEmpty());
    }
}

} // namespace
