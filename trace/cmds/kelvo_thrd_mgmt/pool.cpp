// One queue of tasks, one mutex over it and over both counters, and threads
// that take tasks from its head until the pool is closed.
//
// Idle threads post one lookout, which looks at the queue again after an
// interval on behalf of all of them; the others sleep until they are woken. A
// new task wakes one thread at once, whichever it is, and closing wakes all.
// So the interval bounds how long a thread can miss something, and an idle
// pool costs one short wake-up per interval whatever its size.
//
// Threads are detached. Everything that a leaving thread touches after it has
// counted itself out is static and trivially destructible, so that it may still
// be on its way out while the process ends.
#include "pool.h"

#include "insufficient.h"
#include "kelvo.h"
#include "messages.h"
#include "mutex.h"

#include <algorithm>
#include <csignal>
#include <ctime>
#include <memory>
#include <new>

void* (*pool_task_main)(void* pTask) = nullptr;

std::atomic<uint32_t> totalThrdsInPool{0};
std::atomic<uint32_t> totalFreeThrdsInPool{0};

namespace {

/// Tasks queued and not yet taken: each of them has a claim on a free thread.
std::atomic<uint32_t> totalWaitingTasks{0};

constexpr int THREADS_AT_START = 16;
constexpr int THREADS_PER_GROWTH = 4;
constexpr uint32_t FEWEST_FREE_THREADS = 3; // beyond those that waiting tasks will take

// Microseconds.
constexpr int64_t IDLE_INTERVAL = 1500;
constexpr int64_t LONGEST_IDLE_INTERVAL = 100000; // nothing depends on it: a task wakes at once
constexpr int64_t CLOSE_INTERVAL = 10000;
constexpr int CLOSE_ATTEMPTS = 10;

/// The signals that pool threads leave to the main thread.
constexpr int ASYNCHRONOUS_SIGNALS[] = {
    SIGHUP,  SIGINT,  SIGQUIT, SIGUSR1, SIGUSR2, SIGALRM,   SIGTERM, SIGCHLD,  SIGCONT, SIGTSTP,
    SIGTTIN, SIGTTOU, SIGURG,  SIGXCPU, SIGXFSZ, SIGVTALRM, SIGPROF, SIGWINCH, SIGIO,   SIGPWR,
};

struct thrd_task {
    thrd_task* pNextTask;                   ///< null at the tail
    void* pTask;                            ///< argument of pool_task_main
    std::atomic<pthread_t>* pServiceThrdId; ///< holds the running thread's id, then 0
};

/// First in, first out; both null when empty.
struct thrd_task_list {
    thrd_task* pFirstTask;
    thrd_task* pLastTask;
};

pthread_mutex_t thrd_pool_mutex = PTHREAD_MUTEX_INITIALIZER;

// Under thrd_pool_mutex:
thrd_task_list list_head{};
thrd_task_list* task_queue = &list_head; ///< CLOSED_POOL once the pool is closed
bool bLookoutPosted = false;
pthread_cond_t newsCond = PTHREAD_COND_INITIALIZER;  ///< a task came, or the pool was closed
pthread_cond_t emptyCond = PTHREAD_COND_INITIALIZER; ///< the last thread has left

thrd_task_list* const CLOSED_POOL = reinterpret_cast<thrd_task_list*>(~uintptr_t{0});

// ------------------------------------------------- with thrd_pool_mutex held

bool is_closed() {
    return task_queue == CLOSED_POOL;
}

void append_task(thrd_task* pTask) {
    if (task_queue->pLastTask != nullptr)
        task_queue->pLastTask->pNextTask = pTask;
    else
        task_queue->pFirstTask = pTask;
    task_queue->pLastTask = pTask;
    ++totalWaitingTasks;
}

bool enough_threads_are_free() {
    return totalFreeThrdsInPool >= FEWEST_FREE_THREADS + totalWaitingTasks;
}

/// The task at the head, now the caller's; the queue is not empty.
thrd_task* take_first_task() {
    thrd_task* const pTask = task_queue->pFirstTask;
    task_queue->pFirstTask = pTask->pNextTask;
    if (task_queue->pFirstTask == nullptr)
        task_queue->pLastTask = nullptr;
    --totalWaitingTasks;
    return pTask;
}

void close_pool() {
    while (task_queue->pFirstTask != nullptr)
        delete take_first_task();
    task_queue = CLOSED_POOL;
    pthread_cond_broadcast(&newsCond);
}

/// The moment `iMicroseconds` from now, on the clock that wait_until goes by.
timespec after(int64_t iMicroseconds) {
    timespec moment;
    clock_gettime(CLOCK_MONOTONIC, &moment);
    const int64_t iNanoseconds = moment.tv_nsec + iMicroseconds * 1000;
    moment.tv_sec += static_cast<time_t>(iNanoseconds / 1000000000);
    moment.tv_nsec = static_cast<long>(iNanoseconds % 1000000000);
    return moment;
}

/// Waits until `cond` is signalled. Returns false when `moment` came first.
bool wait_until(pthread_cond_t& cond, const timespec& moment) {
    return pthread_cond_clockwait(&cond, &thrd_pool_mutex, CLOCK_MONOTONIC, &moment) == 0;
}

// --------------------------------------------------------------- the threads

/// Takes the next task into *ppTask. Returns 1 when there was one, 0 when the
/// queue is empty, -1 when the pool is closed.
int threadWaitForNextTask(thrd_task** ppTask) {
    const mutex_guard lock(thrd_pool_mutex);
    *ppTask = nullptr;
    if (is_closed())
        return -1;
    if (task_queue->pFirstTask == nullptr)
        return 0;
    *ppTask = take_first_task();
    --totalFreeThrdsInPool;
    if (!bLookoutPosted)
        pthread_cond_signal(&newsCond);
    return 1;
}

/// Sleeps until there may be something to do: at most `iInterval` microseconds
/// for the thread that becomes the lookout.
void wait_for_news(int64_t iInterval) {
    const mutex_guard lock(thrd_pool_mutex);
    if (is_closed() || task_queue->pFirstTask != nullptr)
        return;
    if (bLookoutPosted) {
        pthread_cond_wait(&newsCond, &thrd_pool_mutex);
        return;
    }
    bLookoutPosted = true;
    wait_until(newsCond, after(iInterval));
    bLookoutPosted = false;
}

void run_task(thrd_task* pTask, pthread_t self) {
    {
        const std::unique_ptr<thrd_task> task(pTask);
        task->pServiceThrdId->store(self);
        pool_task_main(task->pTask);
        task->pServiceThrdId->store(0);
    }
    const mutex_guard lock(thrd_pool_mutex);
    ++totalFreeThrdsInPool;
}

void leave_pool() {
    const mutex_guard lock(thrd_pool_mutex);
    --totalFreeThrdsInPool;
    if (--totalThrdsInPool == 0)
        pthread_cond_signal(&emptyCond);
}

/// The body of every pool thread.
void* pool_thread(void*) {
    // A thread that is cancelled halfway would keep its counts, perhaps a mutex.
    pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, nullptr);
    const pthread_t self = pthread_self();
    int64_t iInterval = IDLE_INTERVAL;
    thrd_task* pTask;
    for (int iAnswer; (iAnswer = threadWaitForNextTask(&pTask)) != -1;) {
        if (iAnswer == 1) {
            run_task(pTask, self);
            iInterval = IDLE_INTERVAL;
        } else {
            wait_for_news(iInterval);
            iInterval = std::min(2 * iInterval, LONGEST_IDLE_INTERVAL);
        }
    }
    leave_pool();
    return nullptr;
}

// -------------------------------------------------------------------- growth

/// Blocks or unblocks the asynchronous signals in the calling thread. Returns 0,
/// or -1 after a message.
int change_asynchronous_signals(int how) {
    sigset_t set;
    sigemptyset(&set);
    for (const int signo : ASYNCHRONOUS_SIGNALS)
        sigaddset(&set, signo);
    const int error = pthread_sigmask(how, &set, nullptr);
    if (error == 0)
        return 0;
    output_sys_message("%s: 2625-150 Error from sigthreadmask(), ", error, anchor.pProgName);
    return -1;
}

bool create_thread() {
    pthread_t id;
    if (pthread_create(&id, nullptr, pool_thread, nullptr) != 0) {
        warn_insufficient_resources_during_open("pthread_create", 0);
        return false;
    }
    pthread_detach(id); // still there: it needs the mutex that its creator holds
    ++totalThrdsInPool;
    ++totalFreeThrdsInPool;
    return true;
}

/// Makes `iCount` threads, which inherit the blocked signals. Returns 0 when at
/// least one was made and the masks could be changed, else -1. Mutex held.
int create_threads(int iCount) {
    if (change_asynchronous_signals(SIG_BLOCK) != 0)
        return -1;
    int iResult = -1;
    for (int iThread = 0; iThread < iCount; ++iThread)
        if (create_thread())
            iResult = 0;
    if (change_asynchronous_signals(SIG_UNBLOCK) != 0)
        iResult = -1;
    return iResult;
}

/// Adds `iCount` threads unless enough are free. Returns 0, or -1 when none
/// could be added.
int addThreadsToPool(int iCount) {
    if (memory_is_restricted == 1)
        output_err_text("[POOL]Total: %06u    Free: %06u |  Adding Threads\n",
                        totalThrdsInPool.load(), totalFreeThrdsInPool.load());
    int iResult = -1;
    {
        const mutex_guard lock(thrd_pool_mutex);
        if (enough_threads_are_free())
            iResult = 0;
        else if (!is_closed())
            iResult = create_threads(iCount);
    }
    if (memory_is_restricted == 1)
        output_err_text("[POOL] Total: %06u    Free: %06u |  Aifter adding Threads\n",
                        totalThrdsInPool.load(), totalFreeThrdsInPool.load());
    return iResult;
}

} // namespace

int startNewThreadPool() {
    return addThreadsToPool(THREADS_AT_START);
}

int poolAddNewTask(std::atomic<pthread_t>* pServiceThrdId, void* pTask) {
    if (!enough_threads_are_free() && addThreadsToPool(THREADS_PER_GROWTH) == -1)
        return -1;
    std::unique_ptr<thrd_task> task(new (std::nothrow) thrd_task{nullptr, pTask, pServiceThrdId});
    if (task == nullptr) {
        warn_insufficient_resources_during_open("malloc()", sizeof(thrd_task));
        return -1;
    }
    const mutex_guard lock(thrd_pool_mutex);
    if (is_closed())
        return -1;
    append_task(task.release());
    pthread_cond_signal(&newsCond);
    return 0;
}

bool endThrdPool() {
    const mutex_guard lock(thrd_pool_mutex);
    if (!is_closed())
        close_pool();
    const timespec moment = after(CLOSE_ATTEMPTS * CLOSE_INTERVAL);
    while (totalThrdsInPool != 0 && wait_until(emptyCond, moment)) {
    }
    return totalThrdsInPool == 0;
}
