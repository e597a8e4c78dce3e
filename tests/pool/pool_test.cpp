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
#define IN_OWN_PROCESS(body)                                                                       \
    do {                                                                                           \
        GTEST_FLAG_SET(death_test_style, "threadsafe");                                            \
        EXPECT_EXIT(                                                                               \
            {                                                                                      \
                body();                                                                            \
                exit(testing::Test::HasFailure() ? 1 : 0);                                         \
            },                                                                                     \
            testing::ExitedWithCode(0), "");                                                       \
    } while (0)

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

void* pass_gate(void* pTask) {
    gate.pass(pTask);
    return nullptr;
}

std::array<std::atomic<pthread_t>, 64> ids;
std::array<int, 64> tasks;

int add_task(size_t uTask) {
    return poolAddNewTask(&ids[uTask], &tasks[uTask]);
}

void start_pool() {
    pool_task_main = pass_gate;
    anchor.pProgName = "kelvo";
    ASSERT_EQ(startNewThreadPool(), 0);
}

void grows_when_fewer_than_three_are_free() {
    CaptureStderr();
    memory_is_restricted = 1;
    start_pool();
    for (size_t uTask = 0; uTask < 14; ++uTask) {
        ASSERT_EQ(add_task(uTask), 0);
        gate.wait_for_entered(uTask + 1);
    }
    EXPECT_EQ(GetCapturedStderr(),
              "[POOL]Total: 000000    Free: 000000 |  Adding Threads\n"
              "[POOL] Total: 000016    Free: 000016 |  Aifter adding Threads\n");
    CaptureStderr();
    ASSERT_EQ(add_task(14), 0);
    gate.wait_for_entered(15);
    EXPECT_THAT(
        GetCapturedStderr(),
        testing::EndsWith("[POOL]Total: 000016    Free: 000002 |  Adding Threads\n"
                          "[POOL] Total: 000020    Free: 000006 |  Aifter adding Threads\n"));
    EXPECT_TRUE(gate.bAsynchronousBlocked);
    EXPECT_NE(ids[14].load(), 0U);

    sigset_t mask;
    pthread_sigmask(SIG_BLOCK, nullptr, &mask);
    EXPECT_EQ(sigismember(&mask, SIGINT), 0) << "the creator's own mask is open again";

    gate.open();
    EXPECT_TRUE(endThrdPool());
    EXPECT_EQ(ids[14].load(), 0U);
    EXPECT_EQ(totalFreeThrdsInPool.load(), 0U);
}

TEST(Pool, GrowsWhenFewerThanThreeAreFree) {
    IN_OWN_PROCESS(grows_when_fewer_than_three_are_free);
}

/// With one thread in all, tasks cannot overtake one another.
void runs_tasks_in_order() {
    CaptureStderr();
    iThreadsAllowed = 1;
    start_pool();
    EXPECT_EQ(totalThrdsInPool.load(), 1U);
    iThreadsAllowed = 0;
    EXPECT_EQ(add_task(0), -1) << "refused although a thread is free";
    EXPECT_THAT(GetCapturedStderr(),
                HasSubstr("WARNING: Insufficient memory (size=0) to process: pthread_create\n"));

    totalFreeThrdsInPool += 1000; // so that nothing is added from here on
    gate.open();
    std::vector<void*> expected;
    for (size_t uTask = 0; uTask < tasks.size(); ++uTask) {
        ASSERT_EQ(add_task(uTask), 0);
        expected.push_back(&tasks[uTask]);
    }
    gate.wait_for_entered(tasks.size());
    EXPECT_EQ(gate.entered, expected);
    EXPECT_TRUE(endThrdPool());
}

TEST(Pool, RunsTasksInOrder) {
    IN_OWN_PROCESS(runs_tasks_in_order);
}

void closing_drops_what_has_not_begun() {
    iThreadsAllowed = 3;
    start_pool();
    totalFreeThrdsInPool += 1000; // nothing is added: three tasks run, the others wait
    for (size_t uTask = 0; uTask < 10; ++uTask)
        ASSERT_EQ(add_task(uTask), 0);
    gate.wait_for_entered(3);

    EXPECT_FALSE(endThrdPool()) << "three tasks still run";
    EXPECT_EQ(add_task(10), -1);
    totalFreeThrdsInPool = 0;
    iThreadsAllowed = 100;
    EXPECT_EQ(add_task(10), -1);
    EXPECT_EQ(totalThrdsInPool.load(), 3U) << "a closed pool does not grow";

    gate.open();
    while (!endThrdPool()) {
    }
    EXPECT_EQ(gate.entered.size(), 3U);
}

TEST(Pool, ClosingDropsWhatHasNotBegun) {
    IN_OWN_PROCESS(closing_drops_what_has_not_begun);
}

/// None of the tasks ends before all have begun: each needs a thread of its own,
/// however few threads have woken up when the next one comes.
void every_task_gets_a_thread() {
    iThreadsAllowed = 1000;
    start_pool();
    for (size_t uTask = 0; uTask < tasks.size(); ++uTask)
        ASSERT_EQ(add_task(uTask), 0);
    gate.wait_for_entered(tasks.size());
    gate.open();
    while (!endThrdPool()) {
    }
}

TEST(Pool, EveryTaskGetsAThreadOfItsOwn) {
    IN_OWN_PROCESS(every_task_gets_a_thread);
}

} // namespace
