// Every allocation of a run fails once, and every thread creation, alone or
// with all that follow: the run says so, counts it, goes on with the rest, and
// leaves the trace files alone. Sanitized builds see leaks on these ways too.
#include "faults_support.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

struct failing_mode {
    const char* pName;
    const char* pVariable;
    bool bFromThenOn = false;
    std::vector<std::string> options{};
};

void PrintTo(const failing_mode& mode, std::ostream* pOut) {
    *pOut << mode.pName;
}

class EveryCall : public testing::TestWithParam<failing_mode> {};

/// Runs with call 1, 2, 3 and so on failing, up to a run that has no such call.
/// The slow runs of a sanitized build leave some numbers out.
TEST_P(EveryCall, MayFail) {
    constexpr size_t MORE_THAN_A_RUN_HAS = 2000;
    const failing_mode& mode = GetParam();
    const size_t uStep = !SANITIZED ? 1 : mode.bFromThenOn ? 5 : 2;
    const auto request = [&](size_t uRun) {
        return std::string(mode.pVariable) + "=" + std::to_string(1 + uRun * uStep);
    };
    size_t uStruck = 0;
    bool bAtEnd = false;
    sweep_faults(
        MORE_THAN_A_RUN_HAS / uStep,
        [&](size_t uRun, const fault_sample& sample) {
            std::vector<std::string> variables{request(uRun)};
            if (mode.bFromThenOn)
                variables.push_back("KELVO_FAIL_FROM_THEN_ON=1");
            return fault_run{sample.arguments(mode.options), failing_setup(variables)};
        },
        [&](size_t uRun, const fault_sample& sample, command_result& result) {
            SCOPED_TRACE(request(uRun));
            bAtEnd = !take_failure_note(&result);
            uStruck += !bAtEnd;
            sample.expect_honest(result);
            if (bAtEnd) {
                EXPECT_EQ(result.sErr, "");
                EXPECT_TRUE(sample.is_whole(0, result.sOut) && sample.is_whole(1, result.sOut));
            }
            return !bAtEnd;
        });
    EXPECT_TRUE(bAtEnd) << "no end of the failing calls";
    EXPECT_GE(uStruck * uStep, 16U); // threads at start: the failures do strike
}

constexpr char ALLOCATION[] = "KELVO_FAIL_ALLOCATION", THREAD[] = "KELVO_FAIL_THREAD";

INSTANTIATE_TEST_SUITE_P(
    Of, EveryCall,
    testing::Values(failing_mode{"OneAllocation", ALLOCATION},
                    failing_mode{"AllocationsFrom", ALLOCATION, true},
                    failing_mode{"OneAllocationPreloading", ALLOCATION, false, {"-l"}},
                    failing_mode{"AllocationsFromPreloading", ALLOCATION, true, {"-l"}},
                    failing_mode{"OneThread", THREAD}, failing_mode{"ThreadsFrom", THREAD, true}),
    [](const auto& test) { return std::string(test.param.pName); });

TEST(FailingThread, IsReportedAndMissedByNobody) {
    const fault_sample sample;
    command_result result = run_command(sample.arguments(), failing_setup({"KELVO_FAIL_THREAD=3"}));
    EXPECT_TRUE(take_failure_note(&result));
    EXPECT_EQ(result.sErr, "WARNING: Insufficient memory (size=0) to process: pthread_create\n"
                           "Total insufficient memory warning messages: 1\n"
                           "Total insufficient memory warning messages during file open: 1\n");
    EXPECT_THAT(result.sOut, testing::StartsWith("\t[INSUFFICIENT MEMORY TO PROCESS]\n[00]"));
    EXPECT_TRUE(sample.is_whole(0, result.sOut) && sample.is_whole(1, result.sOut));
    EXPECT_EQ(result.status, 0);
}

} // namespace
