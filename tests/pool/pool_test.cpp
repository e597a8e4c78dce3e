// The pool never opens again once it is closed, so each case runs in a process
// of its own.
#include "pool.h"

#include "kelvo.h"

#include <array>
#include <cerrno>
#include <condition_variable>
#include <cstdlib>
#include <mutex>
#include <vector>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

using testing::HasSubstr;
using testing::internal::CaptureStderr;
using testing::internal::GetCapturedStderr;

namespace {

std::atomic<int> iThreadsAllowed{1000000};

} // namespace

extern "C" {
int __real_pthread_create(pthread_t*, const pthread_attr_t*, void* (*)(void*), void*);

int __wrap_pthread_create(pthread_t* pId, const pthread_attr_t* pAttributes, void* (*pBody)(void*),
                          void* pArgument) {
    if (iThreadsAllowed.fetch_sub(1) <= 0)
        return EAGAIN;
    return __real_pthread_create(pId, pAttributes, pBody, pArgument);
}
}

namespace {

/// Runs `body` in a fresh process and fails with it.
void in_own_process(void (*body)()) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto run = [body] {
        body();
        exit(testing::Test::HasFailure() ? 1 : 0);
    };
    EXPECT_EXIT(run(), testing::ExitedWithCode(0), "");
}

/// A task that notes its arrival and then stays until the gate is opened.
struct gate_t {
    std::mutex mutex;
    std::condition_variable changed;
    std::vector<void*> entered;
    bool bOpen = false;
    bool bAsynchronousBlocked = true;

    void pass(void* pTask) {
        sigset_t mask;
        pthread_sigmask(SIG_BLOCK, nullptr, &mask);
        std::unique_lock lock(mutex);
        bAsynchronousBlocked &= sigismember(&mask, SIGINT) == 1 && sigismember(&mask, SIGPIPE) == 0;
        entered.push_back(pTask);
        changed.notify_all();
        changed.wait(lock, [this] { return bOpen; });
    }
    void wait_for_entered(size_t uCount) {
        std::unique_lock lock(mutex);
        changed.wait(lock, [&] { return entered.size() >= uCount; });
    }
    void open() {
        const std::lock_guard lock(mutex);
        bOpen = true;
        changed.notify_all();
    }
};

gate_t gate;

task_wish pass_gate(void* pTask) {
    gate.pass(pTask);
    return {task_wish::ENDED};
}

std::array<std::atomic<pthread_t>, 64> ids;
std::array<int, 64> tasks;

/// Adds the tasks from number `uBegin` on, up to but not including `uEnd`.
void add_tasks(size_t uBegin, size_t uEnd) {
    for (size_t uTask = uBegin; uTask < uEnd; ++uTask)
        ASSERT_EQ(poolAddNewTask(&ids[uTask], &tasks[uTask]), 0);
}

void start_pool() {
    pool_task_main = pass_gate;
    anchor.pProgName = "kelvo";
    ASSERT_EQ(startNewThreadPool(), 0);
}

void open_gate_and_close_pool() {
    gate.open();
    while (!endThrdPool()) {
    }
}

TEST(Pool, GrowsWhenFewerThanThreeAreFree) {
    in_own_process([] {
        CaptureStderr();
        memory_is_restricted = 1;
        start_pool();
        add_tasks(0, 14);
        EXPECT_EQ(GetCapturedStderr(),
                  "[POOL]Total: 000000    Free: 000000 |  Adding Threads\n"
                  "[POOL] Total: 000016    Free: 000016 |  Aifter adding Threads\n");
        gate.wait_for_entered(14);
        CaptureStderr();
        add_tasks(14, 15);
        EXPECT_EQ(GetCapturedStderr(),
                  "[POOL]Total: 000016    Free: 000002 |  Adding Threads\n"
                  "[POOL] Total: 000020    Free: 000006 |  Aifter adding Threads\n");
        gate.wait_for_entered(15);
        EXPECT_TRUE(gate.bAsynchronousBlocked);
        EXPECT_NE(ids[14].load(), 0U);

        sigset_t mask;
        pthread_sigmask(SIG_BLOCK, nullptr, &mask);
        EXPECT_EQ(sigismember(&mask, SIGINT), 0) << "the creator's own mask is open again";

        open_gate_and_close_pool();
        EXPECT_EQ(ids[14].load(), 0U);
        EXPECT_EQ(totalFreeThrdsInPool.load(), 0U);
    });
}

/// With one thread in all, tasks cannot overtake one another.
TEST(Pool, RunsTasksInOrder) {
    in_own_process([] {
        CaptureStderr();
        iThreadsAllowed = 1;
        start_pool();
        EXPECT_EQ(totalThrdsInPool.load(), 1U);
        EXPECT_EQ(poolAddNewTask(&ids[0], &tasks[0]), -1) << "refused although a thread is free";
        EXPECT_THAT(
            GetCapturedStderr(),
            HasSubstr("WARNING: Insufficient memory (size=0) to process: pthread_create\n"));

        totalFreeThrdsInPool += 1000; // so that nothing is added from here on
        gate.open();
        add_tasks(0, tasks.size());
        gate.wait_for_entered(tasks.size());
        std::vector<void*> expected;
        for (int& task : tasks)
            expected.push_back(&task);
        EXPECT_EQ(gate.entered, expected);
        EXPECT_TRUE(endThrdPool());
    });
}

TEST(Pool, ClosingDropsWhatHasNotBegun) {
    in_own_process([] {
        iThreadsAllowed = 3;
        start_pool();
        totalFreeThrdsInPool += 1000; // nothing is added: three tasks run, the others wait
        add_tasks(0, 10);
        gate.wait_for_entered(3);

        EXPECT_FALSE(endThrdPool()) << "three tasks still run";
        EXPECT_EQ(poolAddNewTask(&ids[10], &tasks[10]), -1);
        totalFreeThrdsInPool = 0;
        iThreadsAllowed = 100;
        EXPECT_EQ(poolAddNewTask(&ids[10], &tasks[10]), -1);
        EXPECT_EQ(totalThrdsInPool.load(), 3U) << "a closed pool does not grow";
        open_gate_and_close_pool();
        EXPECT_EQ(gate.entered.size(), 3U);
    });
}

// ------------------------------------------------------------------- steps

struct stepping {
    std::atomic<int> iSteps;
    std::atomic<bool> bOnThread; ///< two steps of a task at a time would be a fault
    thrd_task* pPoolTask;
};
constexpr int STEPS = 2000;
std::array<stepping, 8> steppings;
std::atomic<int> iEnded;

/// Every second step is wished for soon, the others must be asked for.
task_wish step(void* pTask) {
    auto& self = *static_cast<stepping*>(pTask);
    EXPECT_FALSE(self.bOnThread.exchange(true));
    const int iStep = ++self.iSteps;
    task_wish wish{task_wish::SUSPENDED};
    if (iStep == STEPS)
        wish = {task_wish::ENDED};
    else if (iStep % 2 == 0)
        wish = {task_wish::LATER, iStep % 4 == 0 ? pool_now() + 1000 * (iStep % 50) : 0};
    self.bOnThread = false;
    if (wish.kind == task_wish::ENDED)
        ++iEnded;
    else if (wish.kind == task_wish::SUSPENDED)
        poolResumeTask(self.pPoolTask); // sooner than it can have left the thread
    poolWakeThread(1);
    return wish;
}

TEST(Pool, GivesATaskItsStepsOneByOneAsItWishes) {
    in_own_process([] {
        pool_task_main = step;
        anchor.pProgName = "kelvo";
        ASSERT_EQ(startNewThreadPool(), 0);
        for (size_t i = 0; i < steppings.size(); ++i)
            ASSERT_EQ(poolAddNewTask(&ids[i], &steppings[i], &steppings[i].pPoolTask), 0);
        while (iEnded != static_cast<int>(steppings.size()))
            sched_yield();
        EXPECT_EQ(totalThrdsInPool.load(), 16U) << "steps need no threads of their own";
        while (!endThrdPool()) {
        }
        for (const stepping& each : steppings)
            EXPECT_EQ(each.iSteps, STEPS);
    });
}

} // namespace
