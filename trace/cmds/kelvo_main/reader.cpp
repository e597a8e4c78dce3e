#include "reader.h"

#include "element_memory.h"
#include "first_record.h"
#include "insufficient.h"
#include "merge.h"
#include "messages.h"
#include "mutex.h"
#include "open.h"
#include "output_queue.h"
#include "pool.h"
#include "progress.h"
#include "record_copy.h"
#include "start.h"
#include "walk.h"

#include <algorithm>
#include <array>
#include <cstdlib>
#include <sched.h>
#include <span>
#include <unistd.h>

namespace {

TrcFmtngProcCtrl& ctrl = Glbl_TrcFmtngProcCtrl;

constexpr int64_t FULL_QUEUE_WAIT_NS = 500'000;
constexpr int64_t HELD_BACK_WAIT_NS = 10'000'000; // woken earlier when the room is there
constexpr useconds_t FOLLOW_WAIT_US = 100'000;
constexpr int LOOKS_BEFORE_SLEEPING = 20;
constexpr useconds_t NUMBER_WAIT_US = 100;
constexpr int NUMBER_WAITS = 500; // a writer that was killed stores no number any more

/// With as many files running, a reader that has come to its end starts the next
/// one only when its own records are printed. (No record waits for that: one that
/// is not earlier than the next file's starts it before it is queued.) Otherwise
/// a long row of short files would be open all at once, each started by the last
/// before the main thread gets to print anything.
constexpr uint32_t ENOUGH_RUNNING_FILES = 16;

/// More files than this at once do not make a file's share of the cap smaller.
constexpr int64_t MAX_SHARES = 64;

/// A reader that has its share queued goes on when a third of it is left. Going on
/// costs two changes of threads, so it should be rare; but many readers come to
/// this point together, and the last of them must push again before the main
/// thread has printed what is left of its records.
constexpr uint32_t SHARE_LEFT_DIVISOR = 3;

/// Copies of records that are not yet pushed: enough to make the lock cheap, few
/// enough to be still in the processor's nearest cache when they are pushed.
struct record_batch {
    std::array<trace_queue_element*, 128> pElements;
    size_t uCount = 0;
    element_memory memory;
};

/// Diagnostic line of the low-memory mode.
void say(const char* pWhat, const trace_file* pTraceFile) {
    if (memory_is_restricted)
        output_err_text("%s: %s\n", pWhat, pTraceFile->pName);
}

// ------------------------------------------------------------- room to push

/// This file's part of the cap.
uint32_t share_of_queue() {
    const int64_t iUnfinished = int64_t{anchor.iNumberFiles} - ctrl.uFinishedFiles;
    return MAX_QUEUED / static_cast<uint32_t>(std::clamp<int64_t>(iUnfinished, 1, MAX_SHARES));
}

bool queue_is_full_for(const trace_file* pTraceFile) {
    return ctrl.queueDepth >= MAX_QUEUED && pTraceFile->numRecPushed > ALWAYS_QUEUED;
}

/// Waits at most `iNanoseconds`, or until the file has at most `uRoomAt` records
/// queued or its time base was replaced.
void wait_on_room(trace_file* pTraceFile, uint32_t uRoomAt, int64_t iNanoseconds) {
    timespec until;
    clock_gettime(CLOCK_MONOTONIC, &until);
    until.tv_nsec += iNanoseconds;
    until.tv_sec += until.tv_nsec / 1'000'000'000;
    until.tv_nsec %= 1'000'000'000;
    pTraceFile->uRoomAt = uRoomAt;
    pTraceFile->bWaitsForRoom = 1;
    pthread_cond_clockwait(&pTraceFile->roomCond, &ctrl.priorityQmutex, CLOCK_MONOTONIC, &until);
    pTraceFile->bWaitsForRoom = 0;
}

/// Waits until no record that changes the file's time base is queued: a moment
/// without sleeping, since the main thread formats it as soon as it may.
void wait_for_time_base(trace_file* pTraceFile) {
    for (int i = 0; i < LOOKS_BEFORE_SLEEPING && pTraceFile->bTimeBaseInQueue; ++i) {
        pthread_mutex_unlock(&ctrl.priorityQmutex);
        sched_yield();
        pthread_mutex_lock(&ctrl.priorityQmutex);
    }
    while (pTraceFile->bTimeBaseInQueue)
        wait_on_room(pTraceFile, 0, HELD_BACK_WAIT_NS);
}

/// Called with priorityQmutex held, which it gives up while it waits.
void wait_for_room(trace_file* pTraceFile) {
    if (pTraceFile->numRecPushed >= share_of_queue())
        while (pTraceFile->numRecPushed > share_of_queue() / SHARE_LEFT_DIVISOR)
            wait_on_room(pTraceFile, share_of_queue() / SHARE_LEFT_DIVISOR, HELD_BACK_WAIT_NS);
    wait_for_time_base(pTraceFile);
    while (queue_is_full_for(pTraceFile))
        wait_on_room(pTraceFile, ALWAYS_QUEUED, FULL_QUEUE_WAIT_NS);
}

// ------------------------------------------------------------------ pushing

/// Pushes one element. Returns false when memory ran out.
bool push_element(trace_file* pTraceFile, trace_queue_element* pElement) {
    wait_for_room(pTraceFile);
    pElement->pushSeqn = ctrl.PushSeqn;
    if (!anchor.bFollow)
        TrcFileProcessingCtrl(pElement, pTraceFile->index2 + 1);
    if (!TrcOutput_Q.push(pElement))
        return false;
    if (changes_time_base(pElement->header.function))
        pTraceFile->bTimeBaseInQueue = 1;
    if (pTraceFile->numRecPushed++ == 0)
        --ctrl.uFilesWithNothingQueued;
    ++ctrl.PushSeqn;
    ++ctrl.queueDepth;
    return true;
}

/// Pushes what the batch holds. Returns 0, or -1 when memory ran out (reported;
/// the elements from there on are lost).
int push_batch(trace_file* pTraceFile, record_batch& batch) {
    size_t uPushed = 0;
    {
        const mutex_guard guard(ctrl.priorityQmutex);
        while (uPushed < batch.uCount && push_element(pTraceFile, batch.pElements[uPushed]))
            ++uPushed;
    }
    const bool bFailed = uPushed < batch.uCount;
    if (bFailed)
        warn_insufficient_resources(pTraceFile->pName, batch.pElements[uPushed]->length);
    release_elements(std::span(batch.pElements).subspan(uPushed, batch.uCount - uPushed));
    batch.uCount = 0;
    return bFailed ? -1 : 0;
}

/// Queues the record at pCurRec. Returns 0, or -1 when memory ran out.
int queue_record_for_formating(trace_file* pTraceFile, const trace_record_header& header,
                               record_batch& batch) {
    if (batch.uCount == batch.pElements.size() && push_batch(pTraceFile, batch) != 0)
        return -1;
    trace_queue_element* const pElement = copy_record(pTraceFile, header, &batch.memory);
    if (pElement == nullptr)
        return -1;
    batch.pElements[batch.uCount++] = pElement;
    return 0;
}

// ------------------------------------------------------------------ reading

/// Makes the handshake and stands on the first record. Returns 0, or -1 when
/// the file is corrupt.
int begin_reading(trace_file* pTraceFile) {
    request_tail(pTraceFile);
    int iResult = find_first_record(pTraceFile);
    if (iResult == 0)
        iResult = set_file_start(pTraceFile);
    release_tail(pTraceFile);
    pTraceFile->recordNumber = 0;
    return iResult;
}

/// Gives the writer the moment that it takes from making a record readable to
/// storing its sequence number.
void wait_for_number(const trace_file* pTraceFile, trace_record_header& header) {
    for (int i = 0; i < NUMBER_WAITS && !number_has_come(pTraceFile, &header); ++i)
        usleep(NUMBER_WAIT_US);
}

void read_records(trace_file* pTraceFile, record_batch& batch) {
    trace_record_header header;
    walk_result here = is_last_record(pTraceFile, &header);
    while (!pTraceFile->bDone && here != WALK_CORRUPT) {
        if (here == WALK_NO_RECORD) {
            if (!anchor.bFollow || push_batch(pTraceFile, batch) != 0)
                return;
            usleep(FOLLOW_WAIT_US);
            here = is_last_record(pTraceFile, &header);
            continue;
        }
        if (is_for_output(header) && start_is_reached(pTraceFile, header)) {
            wait_for_number(pTraceFile, header);
            if (queue_record_for_formating(pTraceFile, header, batch) != 0)
                return;
        }
        here = step_and_judge(pTraceFile, &header);
    }
}

/// Waits until none of the file's records is queued or being formatted: until
/// then the main thread works with what closing the file releases.
void wait_until_drained(trace_file* pTraceFile) {
    while (pTraceFile->numRecPushed != 0 || pTraceFile->bRecUnderProcess)
        pthread_cond_wait(&pTraceFile->roomCond, &ctrl.priorityQmutex);
}

void end_reading(trace_file* pTraceFile) {
    {
        const mutex_guard guard(ctrl.priorityQmutex);
        if (ctrl.uRunningFiles < ENOUGH_RUNNING_FILES)
            TrcFileProcessingCtrl(nullptr, pTraceFile->index2 + 1);
        wait_until_drained(pTraceFile);
        TrcFileProcessingCtrl(nullptr, pTraceFile->index2 + 1);
        if (!anchor.bFollow)
            kelvo_progress_status();
    }
    close_trace_file(pTraceFile, 0);
    say("Closed", pTraceFile);
    const mutex_guard guard(ctrl.priorityQmutex);
    file_stops_running(pTraceFile);
    ++ctrl.uFinishedFiles;
    pTraceFile->bDone = 1;
}

/// Whether the reader of the list element must run before the record is pushed.
bool its_time_has_come(const TrcPreProcHdrElem& candidate, const trace_queue_element& element) {
    return element.header.timeStamp >= candidate.header.timeStamp ||
           queue_entry_time(make_queue_entry(&element)) >= candidate.earliestFrom;
}

/// Whether only files that could not be started lie between the list elements
/// `next` and `candidate`.
bool is_successor(uint32_t candidate, uint32_t next) {
    while (next < candidate && ctrl.pTrcPreProcHdrList[next].pTrcFile->bErrorProcessing)
        ++next;
    return next == candidate;
}

} // namespace

int start_tracefile_processing(trace_file* pTraceFile) {
    say("Starting", pTraceFile);
    if (!anchor.bFollow) {
        free(pTraceFile->pHeader);
        pTraceFile->pHeader = nullptr;
    }
    pthread_cond_init(&pTraceFile->roomCond, nullptr);
    if (anchor.bFollow || open_lock_map_trace_file(pTraceFile) == 0) {
        file_starts_running(pTraceFile);
        if (poolAddNewTask(&pTraceFile->threadId, pTraceFile) == 0) {
            say("Queued", pTraceFile);
            return 0;
        }
        file_stops_running(pTraceFile);
        warn_insufficient_resources_during_open(pTraceFile->pName, pTraceFile->uSize);
    }
    close_trace_file(pTraceFile, 0);
    return -1;
}

void TrcFileProcessingCtrl(const trace_queue_element* pElement, uint32_t next) {
    if (anchor.bFollow)
        return;
    const uint32_t uFiles = static_cast<uint32_t>(anchor.iNumberFiles);
    // Files start in the order of the list. A record may start any number of
    // them: those that begin at about the same time make their handshakes side
    // by side. A reader that has come to its end starts its successor only.
    while (ctrl.uNextUnOpenFileIdx < uFiles) {
        TrcPreProcHdrElem& candidate = ctrl.pTrcPreProcHdrList[ctrl.uNextUnOpenFileIdx];
        if (pElement != nullptr ? !its_time_has_come(candidate, *pElement)
                                : !is_successor(ctrl.uNextUnOpenFileIdx, next))
            return;
        candidate.isOpenned = 1;
        const bool bStarted = start_tracefile_processing(candidate.pTrcFile) == 0;
        ++ctrl.uNextUnOpenFileIdx;
        if (bStarted)
            continue;
        candidate.isOpenned = 0;
        candidate.pTrcFile->bErrorProcessing = 1;
        ++ctrl.uFinishedFiles;
    }
}

void* thread_main(void* pTask) {
    auto* const pTraceFile = static_cast<trace_file*>(pTask);
    say("Processing", pTraceFile);
    if (begin_reading(pTraceFile) == 0) {
        record_batch batch;
        read_records(pTraceFile, batch);
        push_batch(pTraceFile, batch);
    }
    end_reading(pTraceFile);
    return nullptr;
}
