// A standard output that goes away or takes nothing, at every stage of a run.
#include "faults_support.h"

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

} // namespace
