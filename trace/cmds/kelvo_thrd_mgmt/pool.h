// The worker pool: a growing set of threads that runs one kind of task. It
// knows nothing of files but the task pointer that it is handed. Once closed it
// never opens again.
#pragma once

#include <atomic>
#include <cstdint>
#include <pthread.h>

/// What every task runs; set once before startNewThreadPool. Its result is not
/// used.
extern void* (*pool_task_main)(void* pTask);

/// Pool threads alive, and those of them that run no task. Written under the
/// pool's mutex; read without it for a first look and for the diagnostic lines.
extern std::atomic<uint32_t> totalThrdsInPool;
extern std::atomic<uint32_t> totalFreeThrdsInPool;

/// Starts the pool with 16 threads. Returns 0, or -1 when none could be started
/// (reported). Main thread, once.
int startNewThreadPool();

/// Queues a task. `pServiceThrdId` receives the id of the thread that runs it
/// for as long as it runs, then 0; it and `pTask` must stay valid until then.
/// Returns 0, or -1 when it was not queued (a failed thread or allocation is
/// reported, a closed pool is not). Any thread.
int poolAddNewTask(std::atomic<pthread_t>* pServiceThrdId, void* pTask);

/// Closes the pool: frees the tasks not yet begun and waits, about 100
/// milliseconds at most, for its threads to end. Harmless when the pool was
/// never started. Returns whether all threads have ended: only then may what
/// tasks use be released.
bool endThrdPool();
