// The worker pool: a growing set of threads that runs one kind of task. A task
// works in steps: it occupies a thread only while it has something to do, and
// says at the end of each step when it wants the next one. The pool knows nothing
// of files but the task pointer that it is handed. Once closed it never opens
// again.
#pragma once

#include <atomic>
#include <cstdint>
#include <pthread.h>

/// What a task wants when it leaves its thread.
struct task_wish {
    enum kind_t : uint8_t {
        ENDED,     ///< nothing any more: it is forgotten
        SUSPENDED, ///< the next step when poolResumeTask is called for it
        LATER,     ///< the next step at iMoment, or soon after
    };
    kind_t kind;
    int64_t iMoment = 0; ///< of pool_now(); 0: as soon as the others had their turn
};

/// What every task runs, step by step; set once before startNewThreadPool.
extern task_wish (*pool_task_main)(void* pTask);

/// Nanoseconds of the monotonic clock that moments are told by.
int64_t pool_now();

/// Pool threads alive, and those of them that run no task. Written under the
/// pool's mutex; read without it for a first look and for the diagnostic lines.
extern std::atomic<uint32_t> totalThrdsInPool;
extern std::atomic<uint32_t> totalFreeThrdsInPool;

/// A task in the pool's care, from poolAddNewTask until it says ENDED.
struct thrd_task;

/// Starts the pool with 16 threads. Returns 0, or -1 when none could be started
/// (reported). Main thread, once.
int startNewThreadPool();

/// Queues a task for its first step. `pServiceThrdId` receives the id of the
/// thread that runs a step for as long as it runs, then 0; it and `pTask` must
/// stay valid until the task has ended. `ppTask`, unless null, receives the
/// pool's record of it. Returns 0, or -1 when it was not queued (a failed thread
/// or allocation is reported, a closed pool is not). Any thread.
int poolAddNewTask(std::atomic<pthread_t>* pServiceThrdId, void* pTask,
                   thrd_task** ppTask = nullptr);

/// Queues a suspended task for its next step; also one that is only just about
/// to leave its thread with that wish. Once for each time that a task is
/// suspended; poolWakeThread must follow. Any thread.
void poolResumeTask(thrd_task* pTask);

/// Has a thread begin with the tasks that wait, when there are `uLeast` of them or
/// more; fewer are begun within some 1.5 milliseconds. Any thread.
void poolWakeThread(uint32_t uLeast);

/// Closes the pool: frees the tasks that wait for a step and waits, about 100
/// milliseconds at most, for its threads to end. Harmless when the pool was
/// never started. Returns whether all threads have ended: only then may what
/// tasks use be released.
bool endThrdPool();
