// One queue of tasks, a heap of those that wait for a moment, one mutex over both
// and over both counters, and threads that take tasks from the head of the queue
// until the pool is closed.
//
// Steps are short, and to wake a thread costs more than most of them. So a task that
// comes while as many threads are at work as the machine has processors is left to
// those, and one that is not urgent may wait for company (which halves the time of a
// merge of 1,024 files). Lest it waits behind steps that do not move (a page that
// has to be read, a standard error that nobody reads), one idle thread, the lookout,
// looks at the queue again after an interval. The lookout also waits for the
// earliest moment. Nobody looks while nothing waits: an idle pool costs nothing.
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
#include <cstdlib>
#include <ctime>
#include <memory>
#include <new>
#include <sched.h>

task_wish (*pool_task_main)(void* pTask) = nullptr;

std::atomic<uint32_t> totalThrdsInPool{0};
std::atomic<uint32_t> totalFreeThrdsInPool{0};

struct thrd_task {
    thrd_task* pNextTask;                   ///< null at the tail
    void* pTask;                            ///< argument of pool_task_main
    std::atomic<pthread_t>* pServiceThrdId; ///< holds the running thread's id, then 0
    bool bOnThread;                         ///< a step runs
    bool bResumed;                          ///< the step that runs is followed by another one
};

namespace {

constexpr int THREADS_AT_START = 16;
constexpr int THREADS_PER_GROWTH = 4;
constexpr uint32_t FEWEST_FREE_THREADS = 3;

constexpr int64_t LOOKOUT_INTERVAL_NS = 1'500'000;
constexpr int64_t CLOSE_WAIT_NS = 100'000'000;

/// The signals that pool threads leave to the main thread.
constexpr int ASYNCHRONOUS_SIGNALS[] = {
    SIGHUP,  SIGINT,  SIGQUIT, SIGUSR1, SIGUSR2, SIGALRM,   SIGTERM, SIGCHLD,  SIGCONT, SIGTSTP,
    SIGTTIN, SIGTTOU, SIGURG,  SIGXCPU, SIGXFSZ, SIGVTALRM, SIGPROF, SIGWINCH, SIGIO,   SIGPWR,
};

/// First in, first out; both null when empty.
struct thrd_task_list {
    thrd_task* pFirstTask;
    thrd_task* pLastTask;
};

/// A task that waits for its moment.
struct timed_task {
    int64_t iMoment;
    thrd_task* pTask;
};

pthread_mutex_t thrd_pool_mutex = PTHREAD_MUTEX_INITIALIZER;

// Under thrd_pool_mutex:
thrd_task_list list_head{};
thrd_task_list* task_queue = &list_head; ///< CLOSED_POOL once the pool is closed
std::atomic<uint32_t> uWaitingTasks{0};  ///< in the queue; read without it for a first look
timed_task* pTimedTasks = nullptr;       ///< heap, the earliest moment on top
uint32_t uTimedTasks = 0;
uint32_t uTimedRoom = 0; ///< entries allocated; as many as there are tasks, at least
uint32_t uTasks = 0;     ///< tasks in the pool's care
uint32_t uProcessors = 1;
int64_t iLookoutUntil = 0; ///< what the lookout waits for; 0: there is none
pthread_cond_t newsCond = PTHREAD_COND_INITIALIZER;  ///< a task came, or the pool was closed
pthread_cond_t emptyCond = PTHREAD_COND_INITIALIZER; ///< the last thread has left

thrd_task_list* const CLOSED_POOL = reinterpret_cast<thrd_task_list*>(~uintptr_t{0});

// ------------------------------------------------- with thrd_pool_mutex held

bool enough_threads_are_free() {
    return totalFreeThrdsInPool >= FEWEST_FREE_THREADS;
}

bool is_closed() {
    return task_queue == CLOSED_POOL;
}

bool a_task_waits() {
    return task_queue->pFirstTask != nullptr;
}

void append_task(thrd_task* pTask) {
    pTask->pNextTask = nullptr;
    if (a_task_waits())
        task_queue->pLastTask->pNextTask = pTask;
    else
        task_queue->pFirstTask = pTask;
    task_queue->pLastTask = pTask;
    ++uWaitingTasks;
}

/// The task at the head, now the caller's; the queue is not empty.
thrd_task* take_first_task() {
    thrd_task* const pTask = task_queue->pFirstTask;
    task_queue->pFirstTask = pTask->pNextTask;
    if (task_queue->pFirstTask == nullptr)
        task_queue->pLastTask = nullptr;
    --uWaitingTasks;
    return pTask;
}

bool is_later(const timed_task& first, const timed_task& second) {
    return first.iMoment > second.iMoment;
}

/// There is room: poolAddNewTask has seen to it.
void add_timed_task(const timed_task& added) {
    pTimedTasks[uTimedTasks++] = added;
    std::push_heap(pTimedTasks, pTimedTasks + uTimedTasks, is_later);
}

thrd_task* take_earliest_task() {
    std::pop_heap(pTimedTasks, pTimedTasks + uTimedTasks, is_later);
    return pTimedTasks[--uTimedTasks].pTask;
}

/// Queues the tasks whose moment has come.
void queue_due_tasks() {
    if (uTimedTasks == 0)
        return;
    const int64_t iNow = pool_now();
    while (uTimedTasks != 0 && pTimedTasks[0].iMoment <= iNow)
        append_task(take_earliest_task());
}

/// Makes room for the moment of one more task.
bool reserve_timed_task() {
    if (uTasks < uTimedRoom)
        return true;
    const uint32_t uRoom = uTimedRoom == 0 ? 64 : 2 * uTimedRoom;
    void* const pGrown = realloc(pTimedTasks, uRoom * sizeof(timed_task));
    if (pGrown == nullptr)
        return false;
    pTimedTasks = static_cast<timed_task*>(pGrown);
    uTimedRoom = uRoom;
    return true;
}

/// Whether the lookout looks at `iMoment` at the latest.
bool somebody_looks_by(int64_t iMoment) {
    return iLookoutUntil != 0 && iLookoutUntil <= iMoment;
}

/// Sees to it that somebody takes the tasks that wait, soon, or looks out for the
/// moments.
void wake_thread_for_task() {
    const uint32_t uFree = totalFreeThrdsInPool;
    bool bNeeded = uTimedTasks != 0 && !somebody_looks_by(pTimedTasks[0].iMoment);
    if (a_task_waits())
        bNeeded = totalThrdsInPool - uFree < uProcessors ||
                  !somebody_looks_by(pool_now() + LOOKOUT_INTERVAL_NS);
    if (bNeeded && uFree != 0)
        pthread_cond_signal(&newsCond);
}

void forget_task(thrd_task* pTask) {
    delete pTask;
    --uTasks;
}

void close_pool() {
    while (a_task_waits())
        forget_task(take_first_task());
    while (uTimedTasks != 0)
        forget_task(take_earliest_task());
    free(pTimedTasks);
    pTimedTasks = nullptr;
    task_queue = CLOSED_POOL;
    pthread_cond_broadcast(&newsCond);
}

/// Waits until `cond` is signalled. Returns false when the moment came first.
bool wait_until(pthread_cond_t& cond, int64_t iMoment) {
    const timespec moment{static_cast<time_t>(iMoment / 1'000'000'000),
                          static_cast<long>(iMoment % 1'000'000'000)};
    return pthread_cond_clockwait(&cond, &thrd_pool_mutex, CLOCK_MONOTONIC, &moment) == 0;
}

/// Sleeps until there may be something to take. A thread that has just worked looks
/// once more after the lookout's interval: more is likely to come.
void wait_for_news(bool bHasWorked) {
    int64_t iUntil = INT64_MAX;
    if (uTimedTasks != 0)
        iUntil = pTimedTasks[0].iMoment;
    if (a_task_waits() || bHasWorked)
        iUntil = std::min(iUntil, pool_now() + LOOKOUT_INTERVAL_NS);
    if (iUntil == INT64_MAX || (iLookoutUntil != 0 && iLookoutUntil <= iUntil)) {
        pthread_cond_wait(&newsCond, &thrd_pool_mutex);
        return;
    }
    iLookoutUntil = iUntil;
    wait_until(newsCond, iUntil);
    if (iLookoutUntil == iUntil) // else somebody looks out for an earlier moment
        iLookoutUntil = 0;
}

// --------------------------------------------------------------- the threads

/// Takes the next task into *ppTask, when one has come. Returns 1, or -1 when the
/// pool is closed.
int threadWaitForNextTask(thrd_task** ppTask) {
    const mutex_guard lock(thrd_pool_mutex);
    *ppTask = nullptr;
    for (bool bWaited = false; !is_closed(); bWaited = true) {
        queue_due_tasks();
        const bool bEnoughAtWork = totalThrdsInPool - totalFreeThrdsInPool >= uProcessors;
        if (a_task_waits() && (bWaited || !bEnoughAtWork)) {
            *ppTask = take_first_task();
            (*ppTask)->bOnThread = true;
            --totalFreeThrdsInPool;
            wake_thread_for_task();
            return 1;
        }
        wait_for_news(!bWaited);
    }
    return -1;
}

/// Does as the task wishes. Mutex held.
void leave_thread(thrd_task* pTask, const task_wish& wish) {
    pTask->bOnThread = false;
    ++totalFreeThrdsInPool;
    if (wish.kind == task_wish::ENDED || is_closed()) {
        forget_task(pTask);
    } else if (wish.kind == task_wish::LATER && wish.iMoment != 0) {
        add_timed_task({wish.iMoment, pTask});
    } else if (wish.kind == task_wish::LATER || pTask->bResumed) {
        pTask->bResumed = false;
        append_task(pTask);
    }
}

void run_step(thrd_task* pTask, pthread_t self) {
    pTask->pServiceThrdId->store(self);
    const task_wish wish = pool_task_main(pTask->pTask);
    pTask->pServiceThrdId->store(0);
    const mutex_guard lock(thrd_pool_mutex);
    leave_thread(pTask, wish);
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
    for (thrd_task* pTask; threadWaitForNextTask(&pTask) != -1;)
        run_step(pTask, self);
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

int64_t pool_now() {
    timespec now;
    clock_gettime(CLOCK_MONOTONIC, &now);
    return int64_t{now.tv_sec} * 1'000'000'000 + now.tv_nsec;
}

int startNewThreadPool() {
    cpu_set_t processors;
    if (sched_getaffinity(0, sizeof processors, &processors) == 0)
        uProcessors = static_cast<uint32_t>(CPU_COUNT(&processors));
    return addThreadsToPool(THREADS_AT_START);
}

int poolAddNewTask(std::atomic<pthread_t>* pServiceThrdId, void* pTask, thrd_task** ppTask) {
    if (!enough_threads_are_free() && addThreadsToPool(THREADS_PER_GROWTH) == -1)
        return -1;
    std::unique_ptr<thrd_task> task(new (std::nothrow)
                                        thrd_task{nullptr, pTask, pServiceThrdId, false, false});
    const mutex_guard lock(thrd_pool_mutex);
    if (task == nullptr || !reserve_timed_task()) {
        warn_insufficient_resources_during_open("malloc()", sizeof(thrd_task));
        return -1;
    }
    if (is_closed())
        return -1;
    ++uTasks;
    if (ppTask != nullptr)
        *ppTask = task.get();
    append_task(task.release());
    wake_thread_for_task();
    return 0;
}

void poolResumeTask(thrd_task* pTask) {
    const mutex_guard lock(thrd_pool_mutex);
    if (is_closed())
        return;
    if (pTask->bOnThread)
        pTask->bResumed = true;
    else
        append_task(pTask);
}

void poolWakeThread(uint32_t uLeast) {
    if (uWaitingTasks == 0)
        return;
    const mutex_guard lock(thrd_pool_mutex);
    if (!is_closed() &&
        (uWaitingTasks >= uLeast || !somebody_looks_by(pool_now() + LOOKOUT_INTERVAL_NS)))
        wake_thread_for_task();
}

bool endThrdPool() {
    const mutex_guard lock(thrd_pool_mutex);
    if (!is_closed())
        close_pool();
    const int64_t iMoment = pool_now() + CLOSE_WAIT_NS;
    while (totalThrdsInPool != 0 && wait_until(emptyCond, iMoment)) {
    }
    return totalThrdsInPool == 0;
}
