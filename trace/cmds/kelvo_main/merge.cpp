#include "merge.h"

#include "element_memory.h"
#include "handover.h"
#include "insufficient.h"
#include "mutex.h"
#include "output_queue.h"
#include "record.h"
#include "signals.h"
#include "stdout_stream.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <sched.h>
#include <span>

namespace {

TrcFmtngProcCtrl& ctrl = Glbl_TrcFmtngProcCtrl;

constexpr int64_t MERGE_WAIT_US = 50;        // a running file has nothing queued
constexpr int64_t EMPTY_QUEUE_WAIT_US = 100; // nothing is queued at all
constexpr int64_t FOLLOW_WAIT_US = 100'000;  // follow mode, no file is running
constexpr int64_t IDLE_WAIT_US = 10'000;     // longest stretch of the first two
constexpr int LOOKS_BEFORE_SLEEPING = 20;    // a reader often needs no more than a moment
constexpr int64_t LOOK_INTERVAL_NS = 5'000;  // between those
constexpr int LOOKS_BEFORE_STRETCHING = 200; // waits of the named length, after those

/// Records taken in one go. Long enough to make the lock cheap, short enough
/// for readers that wait for room.
constexpr size_t MAX_TAKEN = 256;

/// Records taken out of the queue and not yet released.
struct taken_records {
    std::array<trace_queue_element*, MAX_TAKEN> pElements;
    size_t uCount = 0;
    uint32_t uDepthBehind = 0;                  ///< queue depth after the last one was taken
    std::array<trace_file*, MAX_TAKEN> pToWake; ///< files whose readers have room again
    size_t uToWake = 0;
    std::span<trace_queue_element*> all() {
        return {pElements.data(), uCount};
    }
};

/// The merge rule.
bool a_record_may_be_taken() {
    const bool bEveryRunningFileHasOne = ctrl.uFilesWithNothingQueued == 0;
    return !TrcOutput_Q.empty() && (bEveryRunningFileHasOne || !queue_limit_enabled);
}

/// A file that runs counts as one with nothing queued from its last queued
/// record on.
bool is_waited_for(const trace_file* pTraceFile) {
    return pTraceFile->bRunning != 0 && pTraceFile->numRecPushed == 0;
}

queue_entry take_record(taken_records& taken) {
    const queue_entry entry = TrcOutput_Q.pop();
    trace_file* const pFile = entry.pFile;
    --ctrl.queueDepth;
    pFile->bRecUnderProcess = 1;
    --pFile->numRecPushed;
    if (is_waited_for(pFile))
        ++ctrl.uFilesWithNothingQueued;
    if (pFile->bWaitsForRoom && pFile->numRecPushed <= pFile->uRoomAt) {
        pFile->bWaitsForRoom = 0;
        taken.pToWake[taken.uToWake++] = pFile;
    }
    return entry;
}

/// Takes as many records in a row as the rule allows. A run ends at a record
/// that changes a time base: it must be formatted before the next comparison.
void take_records(taken_records& taken) {
    const mutex_guard guard(ctrl.priorityQmutex);
    taken.uCount = 0;
    taken.uToWake = 0;
    while (taken.uCount < MAX_TAKEN && a_record_may_be_taken()) {
        const queue_entry entry = take_record(taken);
        taken.pElements[taken.uCount++] = entry.pElement;
        if (entry.bChangesBase)
            break;
    }
    taken.uDepthBehind = ctrl.queueDepth;
}

/// Wakes the readers that have room again; not under the lock, for which each of
/// them would have to wait at once.
void wake_readers(const taken_records& taken) {
    for (size_t uIndex = 0; uIndex < taken.uToWake; ++uIndex)
        pthread_cond_signal(&taken.pToWake[uIndex]->roomCond);
}

/// Has the processor fetch a record that will soon be formatted, or the better
/// part of a long one: it was written on another one, long ago.
void fetch(const taken_records& taken, size_t uIndex) {
    constexpr size_t LINE = 64;
    if (uIndex >= taken.uCount)
        return;
    const auto* const pBytes = reinterpret_cast<const char*>(taken.pElements[uIndex]);
    for (size_t uLine = 0; uLine < 3; ++uLine)
        __builtin_prefetch(pBytes + uLine * LINE); // a hint: nothing is read
}

void format_records(taken_records& taken) {
    constexpr size_t AHEAD = 4;
    for (size_t uIndex = 0; uIndex < taken.uCount; ++uIndex) {
        fetch(taken, uIndex + AHEAD);
        trace_queue_element* const pElement = taken.pElements[uIndex];
        if (format_record(pElement) != 0)
            warn_insufficient_resources(pElement->pFile->pName, taken.uDepthBehind);
        write_handed_over_output();
        take_pending_signal();
    }
}

/// Tells the readers that their records are formatted, and releases the records.
/// Each file has a condition of its own: with one for all, every reader that has
/// come to its end would wake up for nothing again and again.
void finish_records(taken_records& taken) {
    {
        const mutex_guard guard(ctrl.priorityQmutex);
        for (const trace_queue_element* pElement : taken.all()) {
            trace_file* const pFile = pElement->pFile;
            pFile->bRecUnderProcess = 0;
            const bool bBaseChanged = changes_time_base(pElement->header.function);
            if (bBaseChanged) {
                pFile->bTimeBaseInQueue = 0;
                TrcOutput_Q.time_base_changed();
            }
            if (bBaseChanged || pFile->numRecPushed == 0)
                pthread_cond_signal(&pFile->roomCond);
        }
    }
    release_elements(taken.all());
}

/// Lets a moment pass in which the readers work undisturbed: a look takes their
/// lock, and with looks all the time they and the main thread would hand every
/// few records over on the spot, at half the speed.
void let_readers_work() {
    sched_yield();
    timespec start;
    timespec now;
    clock_gettime(CLOCK_MONOTONIC, &start);
    do {
        pause_processor();
        clock_gettime(CLOCK_MONOTONIC, &now);
    } while ((now.tv_sec - start.tv_sec) * 1'000'000'000 + now.tv_nsec - start.tv_nsec <
             LOOK_INTERVAL_NS);
}

/// How long the main thread waits when it finds nothing to take: moments at
/// first, the named interval then, and longer when nothing has come for a while.
class idle_wait {
public:
    void wait() {
        if (anchor.bFollow && !stdout_is_empty())
            stdout_flush(); // whoever reads a pipe sees the records at once
        if (m_iLooks <= LOOKS_BEFORE_STRETCHING)
            ++m_iLooks;
        if (m_iLooks <= LOOKS_BEFORE_SLEEPING) {
            let_readers_work();
            take_pending_signal();
            return;
        }
        const int64_t iNamed = ctrl.queueDepth == 0 ? EMPTY_QUEUE_WAIT_US : MERGE_WAIT_US;
        if (m_iLooks > LOOKS_BEFORE_STRETCHING)
            m_iStretched = std::min(m_iStretched * 2, IDLE_WAIT_US);
        main_thread_sleep(std::max(iNamed, m_iStretched));
    }
    void records_flow() {
        *this = idle_wait{};
    }

private:
    int m_iLooks = 0;
    int64_t m_iStretched = MERGE_WAIT_US;
};

idle_wait idle;

bool any_file_is_running() {
    const mutex_guard guard(ctrl.priorityQmutex);
    return ctrl.uRunningFiles != 0;
}

} // namespace

int compare_timestamps(const timespec* pFirst, const timespec* pSecond) {
    if (pFirst->tv_sec != pSecond->tv_sec)
        return pFirst->tv_sec < pSecond->tv_sec ? -1 : 1;
    if (pFirst->tv_nsec != pSecond->tv_nsec)
        return pFirst->tv_nsec < pSecond->tv_nsec ? -1 : 1;
    return 0;
}

int cmp_Q_elements(const trace_queue_element* pFirst, const trace_queue_element* pSecond) {
    return cmp_queue_entries(make_queue_entry(pFirst), make_queue_entry(pSecond));
}

int cmp_trc_file_hdrs(const void* pFirst, const void* pSecond) {
    timespec times[2];
    const TrcPreProcHdrElem* const pElems[2] = {static_cast<const TrcPreProcHdrElem*>(pFirst),
                                                static_cast<const TrcPreProcHdrElem*>(pSecond)};
    for (int i = 0; i < 2; ++i)
        cu_cvt_time_platform_1(pElems[i]->header.timeStamp, &pElems[i]->pTrcFile->timeInfo,
                               &times[i], pElems[i]->pTrcFile->uPlatform);
    return compare_timestamps(&times[0], &times[1]);
}

void sort_files() {
    const std::span files{ctrl.pTrcPreProcHdrList, static_cast<size_t>(anchor.iNumberFiles)};
    std::stable_sort(files.begin(), files.end(),
                     [](const TrcPreProcHdrElem& first, const TrcPreProcHdrElem& second) {
                         return cmp_trc_file_hdrs(&first, &second) < 0;
                     });
    cu_nanoseconds earliest = CU_NANOSECONDS_MAX;
    for (size_t uIndex = files.size(); uIndex-- > 0;) {
        TrcPreProcHdrElem& elem = files[uIndex];
        if (elem.bOldestKnown)
            earliest = std::min(earliest, elem.oldestTime);
        elem.earliestFrom = earliest;
        elem.pTrcFile->index2 = static_cast<uint32_t>(uIndex);
    }
}

void file_starts_running(trace_file* pTraceFile) {
    pTraceFile->bRunning = 1;
    ++ctrl.uRunningFiles;
    if (is_waited_for(pTraceFile))
        ++ctrl.uFilesWithNothingQueued;
}

void file_stops_running(trace_file* pTraceFile) {
    if (is_waited_for(pTraceFile))
        --ctrl.uFilesWithNothingQueued;
    pTraceFile->bRunning = 0;
    --ctrl.uRunningFiles;
}

bool find_and_format_next_record() {
    static taken_records taken; // main thread only
    take_records(taken);
    wake_readers(taken);
    if (taken.uCount == 0) {
        if (!any_file_is_running())
            return false;
        write_handed_over_output();
        idle.wait();
        return true;
    }
    idle.records_flow();
    format_records(taken);
    finish_records(taken);
    return true;
}

void merge_records() {
    for (;;) {
        if (find_and_format_next_record())
            continue;
        write_handed_over_output();
        if (!anchor.bFollow)
            return;
        stdout_flush();
        main_thread_sleep(FOLLOW_WAIT_US);
    }
}
