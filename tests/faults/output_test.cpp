// A standard output that goes away or takes nothing, at every stage of a run.
#include "faults_support.h"
#include "trace_file_fmt.h"

#include <csignal>
#include <fcntl.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace {

TEST(Output, MayTakeNothing) {
    const fault_sample sample;
    command_setup full, closed;
    full.sStdout = "/dev/full";
    closed.bStdoutClosed = true;
    for (const auto& [setup, sError] :
         {std::pair{full, "No space left on device"}, {closed, "Bad file descriptor"}})
        for (const auto& arguments : {sample.arguments({"-i"}), {"-h"}}) {
            const command_result result = run_command(arguments, setup);
            if (arguments.size() > 1)
                sample.expect_honest(result);
            EXPECT_EQ(result.status, 1);
            const std::string sMessage = ": 2625-163 Error writing standard output,  ";
            EXPECT_EQ(count_of(sMessage + sError + "\n", result.sErr), 1U) << result.sErr;
        }
}

/// The text of this run is some 700 KB, more than a pipe and the stream hold.
TEST(Output, ReaderMayGoAfterAnyAmount) {
    const temp_dir dir;
    const auto files = make_samples(dir.path(), {"-n", "2", "-r", "3000", "-p", "strings"});
    constexpr size_t AMOUNTS[] = {0, 1, 100, 4096, 65'535, 65'536, 150'000, 300'000};
    for (const size_t uTaken : AMOUNTS) {
        SCOPED_TRACE(uTaken);
        live_command kelvo({"-t", dir.path(), files[0], files[1]});
        for (size_t uRead = 0; uRead < uTaken;)
            uRead += kelvo.read_text().size();
        kelvo.close_output();
        const command_result result = kelvo.wait();
        expect_sound_end(result);
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.sErr, "");
    }
}

/// The end of such a run may be far away.
TEST(Output, ThatIsLostIsReportedAtOnceInFollowMode) {
    const fault_sample sample;
    command_setup full;
    full.sStdout = "/dev/full";
    live_command kelvo(sample.arguments({"-f"}), full);
    kelvo.wait_for_error("2625-163");
    kelvo.send_signal(SIGINT);
    const command_result result = kelvo.wait();
    EXPECT_EQ(result.status, 1);
    EXPECT_EQ(count_of("2625-163", result.sErr), 1U) << result.sErr;
}

TEST(Output, NobodyNeedReadTheMessages) {
    const fault_sample sample;
    command_setup gone;
    gone.bStderrGone = true;
    EXPECT_EQ(run_command({"-?"}, gone).status, 1);
    EXPECT_EQ(run_command({"missing.trc"}, gone).status, 1);

    // Both the main thread, with the bar, and a reader, about damage, have something to say.
    std::vector<std::byte> damaged = sample.before[0];
    damaged[sizeof(trace_file_header) + offsetof(trace_record_header, function)] = std::byte{77};
    write_file(sample.files[0], damaged);
    const command_result result = run_command(sample.arguments({"-i"}), gone);
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.signo, 0);
    EXPECT_TRUE(sample.is_whole(1, result.sOut)) << result.sOut;
}

/// Makes a pipe that takes no more and that nobody reads. Returns its descriptor.
int make_stuck_pipe(const std::string& sPath) {
    EXPECT_EQ(mkfifo(sPath.c_str(), 0600), 0);
    const int fd = open(sPath.c_str(), O_RDWR | O_NONBLOCK | O_CLOEXEC);
    while (write(fd, "full", 4) > 0) {
    }
    return fd;
}

/// Once in the middle of the run and once after its jump to the end.
TEST(Output, ThatStandsStillDoesNotHoldUpASecondSignal) {
    const temp_dir dir;
    const auto files = make_samples(dir.path(), {"-n", "2", "-r", "3000", "-p", "strings"});
    const int fd = make_stuck_pipe(dir.file("pipe"));
    command_setup running, pausing;
    running.sStdout = pausing.sStdout = dir.file("pipe");
    pausing.environment.push_back("KELVO_USE_LOWMEM=1");
    for (const command_setup& setup : {running, pausing}) {
        live_command kelvo({"-i", "-t", dir.path(), files[0], files[1]}, setup);
        kelvo.wait_for_error(setup.environment.empty() ? "0%" : "FileIndex: 001");
        kelvo.send_signal(SIGINT);
        usleep(200'000);
        siginfo_t ended{};
        waitid(P_PID, static_cast<id_t>(kelvo.pid()), &ended, WEXITED | WNOHANG | WNOWAIT);
        EXPECT_EQ(ended.si_pid, 0) << "lost text that could still be read";
        kelvo.send_signal(SIGQUIT);
        const command_result result = kelvo.wait();
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.signo, 0);
    }
    close(fd);
}

} // namespace
