// Every allocation of a run fails once, and every thread creation, alone or
// with all that follow: the run says so, counts it, goes on with the rest, and
// leaves the trace files alone. Sanitized builds see leaks on these ways too.
#include "faults_support.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using testing::HasSubstr;
using testing::Not;

struct failing_mode {
    const char* pName;
    const char* pVariable;
    bool bFromThenOn;
    std::vector<std::string> options;
};

void PrintTo(const failing_mode& mode, std::ostream* pOut) {
    *pOut << mode.pName;
}

class EveryCall : public testing::TestWithParam<failing_mode> {};

/// Runs with call 1, 2, 3 and so on failing, up to a run that has no such call.
/// The slow runs of a sanitized build leave some numbers out.
TEST_P(EveryCall, MayFail) {
    constexpr size_t MORE_THAN_A_RUN_HAS = 2000;
    constexpr size_t RUNS = 24; // between two looks at the end
    const failing_mode& mode = GetParam();
    const size_t uStep = !SANITIZED ? 1 : mode.bFromThenOn ? 5 : 2;
    size_t uStruck = 0;
    bool bAtEnd = false;
    for (size_t uFirst = 1; !bAtEnd && uFirst < MORE_THAN_A_RUN_HAS && !HasFailure();
         uFirst += RUNS * uStep) {
        const auto request = [&](size_t uRun) {
            return std::string(mode.pVariable) + "=" + std::to_string(uFirst + uRun * uStep);
        };
        fault_sweep{}.sweep(
            RUNS,
            [&](size_t uRun, const fault_sample& sample) {
                std::vector<std::string> variables{request(uRun)};
                if (mode.bFromThenOn)
                    variables.push_back("KELVO_FAIL_FROM_THEN_ON=1");
                return fault_sweep::run{sample.arguments(mode.options), failing_setup(variables)};
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
            });
    }
    EXPECT_TRUE(bAtEnd) << "no end of the failing calls";
    EXPECT_GE(uStruck * uStep, 16U); // threads at start: the failures do strike
    RecordProperty("calls", static_cast<int>(uStruck));
}

INSTANTIATE_TEST_SUITE_P(
    Of, EveryCall,
    testing::Values(failing_mode{"OneAllocation", "KELVO_FAIL_ALLOCATION", false, {}},
                    failing_mode{"AllocationsFrom", "KELVO_FAIL_ALLOCATION", true, {}},
                    failing_mode{"OneAllocationPreloading", "KELVO_FAIL_ALLOCATION", false, {"-l"}},
                    failing_mode{
                        "AllocationsFromPreloading", "KELVO_FAIL_ALLOCATION", true, {"-l"}},
                    failing_mode{"OneThread", "KELVO_FAIL_THREAD", false, {}},
                    failing_mode{"ThreadsFrom", "KELVO_FAIL_THREAD", true, {}}),
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

TEST(FailingThread, AllOfThemEndTheRun) {
    const fault_sample sample;
    command_result result = run_command(
        sample.arguments(), failing_setup({"KELVO_FAIL_THREAD=1", "KELVO_FAIL_FROM_THEN_ON=1"}));
    EXPECT_TRUE(take_failure_note(&result));
    EXPECT_EQ(count_of("to process: pthread_create\n", result.sErr), 16U);
    EXPECT_EQ(count_of("\t[INSUFFICIENT MEMORY TO PROCESS]\n", result.sOut), 16U);
    EXPECT_THAT(result.sOut, Not(HasSubstr("Filename")));
    EXPECT_EQ(result.status, 1);
}

} // namespace
