#include "merge.h"

#include "exchange.h"
#include "mutex.h"
#include "output_queue.h"
#include "pool.h"

#include <algorithm>
#include <sched.h>

namespace {

TrcFmtngProcCtrl& ctrl = Glbl_TrcFmtngProcCtrl;

constexpr int64_t MERGE_WAIT_US = 50;        // a running file has nothing queued
constexpr int64_t EMPTY_QUEUE_WAIT_US = 100; // nothing is queued at all
constexpr int64_t FOLLOW_WAIT_US = 100'000;  // follow mode, no file is running
constexpr int64_t IDLE_WAIT_US = 10'000;     // longest stretch of the first two
constexpr int LOOKS_BEFORE_SLEEPING = 20;    // a reader often needs no more than a moment
constexpr int64_t LOOK_INTERVAL_NS = 5'000;  // between those
constexpr int LOOKS_BEFORE_STRETCHING = 200; // waits of the named length, after those

/// Records taken before the readers are heard again. Long enough to make that cheap,
/// short enough for readers that wait for room.
constexpr uint32_t MAX_TAKEN = 256;

bool a_record_may_be_taken() {
    return !TrcOutput_Q.empty() && (!queue_limit_enabled || TrcOutput_Q.is_complete());
}

/// Hands on as many records in a row as the rule allows. Returns how many.
uint32_t hand_on_records(merge_listener& listener) {
    uint32_t uTaken = 0;
    for (; uTaken < MAX_TAKEN && a_record_may_be_taken(); ++uTaken) {
        const output_queue::taken taken = TrcOutput_Q.pop();
        listener.take_record(taken.pElement);
        if (taken.pBaseOf != nullptr) [[unlikely]]
            TrcOutput_Q.base_was_replaced(*taken.pBaseOf);
        listener.between_records();
    }
    return uTaken;
}

/// How long the main thread waits when it finds nothing to take: moments at
/// first, the named interval then, and longer when nothing has come for a while.
class idle_wait {
public:
    void wait(merge_listener& listener) {
        if (m_iLooks <= LOOKS_BEFORE_STRETCHING)
            ++m_iLooks;
        if (m_iLooks <= LOOKS_BEFORE_SLEEPING) {
            look_out();
            return;
        }
        const int64_t iNamed = ctrl.queueDepth == 0 ? EMPTY_QUEUE_WAIT_US : MERGE_WAIT_US;
        if (m_iLooks > LOOKS_BEFORE_STRETCHING)
            m_iStretched = std::min(m_iStretched * 2, IDLE_WAIT_US);
        listener.wait(std::max(iNamed, m_iStretched));
    }
    void records_flow() {
        *this = idle_wait{};
    }

private:
    /// A moment in which the readers work undisturbed: who looks all the time takes
    /// a few records at once from where they are just being written, at half the
    /// speed.
    static void look_out() {
        sched_yield();
        const int64_t iUntil = pool_now() + LOOK_INTERVAL_NS;
        while (pool_now() < iUntil)
            pause_processor();
    }

    int m_iLooks = 0;
    int64_t m_iStretched = MERGE_WAIT_US;
};

idle_wait idle;

bool any_file_is_running() {
    const mutex_guard guard(ctrl.priorityQmutex);
    return running_files() != 0;
}

} // namespace

bool find_and_format_next_record(merge_listener& listener) {
    static uint32_t uTaken = 0; // not yet settled for
    exchange_with_readers(uTaken);
    uTaken = hand_on_records(listener);
    if (uTaken != 0) {
        idle.records_flow();
        return true;
    }
    if (!any_file_is_running())
        return false;
    listener.between_records();
    idle.wait(listener);
    return true;
}

void merge_records(merge_listener& listener) {
    for (;;) {
        if (find_and_format_next_record(listener))
            continue;
        listener.between_records();
        if (!anchor.bFollow)
            return;
        listener.wait(FOLLOW_WAIT_US);
    }
}
