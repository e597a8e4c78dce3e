#include "exchange.h"

#include "file_starts.h"
#include "mutex.h"
#include "output_queue.h"
#include "pool.h"

#include <algorithm>
#include <atomic>

namespace {

TrcFmtngProcCtrl& ctrl = Glbl_TrcFmtngProcCtrl;

/// What all files together may have queued beyond the cap, in even shares: enough
/// that a merge of many files moves in runs.
constexpr uint32_t FLOORS_TOGETHER = 131'072;
constexpr uint64_t FLOOR_BYTES_TOGETHER = 64ULL << 20;
constexpr uint32_t MOST_FLOOR = 1024;
constexpr uint32_t CHEAP_FLOOR = 64; // of short records
constexpr uint32_t LEAST_FLOOR = 5;

/// From here on large records count: each file has one queued, which the merge rule
/// needs, and no more.
constexpr uint64_t SCARCE_BYTES = 320ULL << 20;

/// The queue is no longer full for so long before everybody is let on: else readers
/// would come and go for a few records each.
constexpr int64_t FULL_QUEUE_WAIT_NS = 500'000;

/// A pool thread is woken for so many files' part of the readers at a time.
constexpr uint32_t FILES_PER_WAKING = 16; // of those that run
constexpr uint32_t MOST_FILES_PER_WAKING = 64;

// Under priorityQmutex:
uint32_t uRunningFiles = 0;
uint64_t uQueuedBytes = 0;
batch_list pushed;                ///< since the last exchange
merge_file* pFirstNews = nullptr; ///< files that began or ended since then
merge_file* pFirstHeldBack = nullptr;
int64_t iNotFullSince = 0; ///< 0: it is full, or nobody is held back

std::atomic<bool> bSomethingPushed{false};

bool queue_is_full() {
    return ctrl.queueDepth >= MAX_QUEUED || uQueuedBytes >= MAX_QUEUED_BYTES;
}

/// How many records the file may have queued while the queue is full.
uint32_t floor_of(const merge_file& file) {
    if (uQueuedBytes >= SCARCE_BYTES)
        return 1;
    if (file.account.uBytes >= FLOOR_BYTES_TOGETHER / uRunningFiles)
        return LEAST_FLOOR;
    return std::clamp(FLOORS_TOGETHER / uRunningFiles, CHEAP_FLOOR, MOST_FLOOR);
}

void hold_back(merge_file& file) {
    queue_account& account = file.account;
    account.bHeldBack = true;
    account.uRoomAt = file.pFile->numRecPushed / 2;
    if (account.bInHeldBack)
        return;
    account.bInHeldBack = true;
    account.pNextHeld = pFirstHeldBack;
    pFirstHeldBack = &file;
}

void tell_news(merge_file& file) {
    bSomethingPushed.store(true, std::memory_order_relaxed);
    if (file.account.bInNews)
        return;
    file.account.bInNews = true;
    file.account.pNextNews = pFirstNews;
    pFirstNews = &file;
}

void push_batch(merge_file& file, record_batch* pBatch) {
    start_files_before(*pBatch);
    trace_queue_element* pElement = pBatch->pHead;
    for (uint32_t i = 0; i < pBatch->uCount; ++i, pElement = next_element(pElement))
        pElement->pushSeqn = ctrl.PushSeqn++;
    ctrl.queueDepth += pBatch->uCount;
    file.pFile->numRecPushed += pBatch->uCount;
    file.account.uBytes += pBatch->uBytes;
    uQueuedBytes += pBatch->uBytes;
}

/// The readers to be resumed when the lock is given up.
class resumptions {
public:
    void add(merge_file& file) {
        file.account.bHeldBack = false;
        file.account.bDrains = false;
        file.account.pNextTask = m_pFirst;
        m_pFirst = &file;
    }
    void carry_out() {
        while (merge_file* const pFile = m_pFirst) {
            m_pFirst = pFile->account.pNextTask; // before the reader goes on
            poolResumeTask(pFile->account.pTask);
        }
    }

private:
    merge_file* m_pFirst = nullptr;
};

/// Settles for a batch all of whose records are formatted.
void settle(const record_batch& batch, resumptions& resumed) {
    merge_file& file = *batch.pFile;
    uint32_t& numRecPushed = file.pFile->numRecPushed;
    numRecPushed -= batch.uCount;
    file.account.uBytes -= batch.uBytes;
    uQueuedBytes -= batch.uBytes;
    if ((file.account.bHeldBack && numRecPushed <= file.account.uRoomAt) ||
        (file.account.bDrains && numRecPushed == 0))
        resumed.add(file);
}

/// Lets everybody on when the queue has not been full for a while.
void end_holding_back(resumptions& resumed) {
    if (pFirstHeldBack == nullptr || queue_is_full()) {
        iNotFullSince = 0;
        return;
    }
    const int64_t iNow = pool_now();
    if (iNotFullSince == 0)
        iNotFullSince = iNow;
    if (iNow - iNotFullSince < FULL_QUEUE_WAIT_NS)
        return;
    while (merge_file* const pFile = pFirstHeldBack) {
        pFirstHeldBack = pFile->account.pNextHeld;
        pFile->account.bInHeldBack = false;
        if (pFile->account.bHeldBack)
            resumed.add(*pFile);
    }
}

/// Takes over which files began and which ended, with the batches in between.
void take_over_pushed() {
    for (merge_file* pFile = pFirstNews; pFile != nullptr; pFile = pFile->account.pNextNews)
        if (!pFile->run.bReads && !pFile->run.bEnded)
            TrcOutput_Q.file_begins(*pFile);
    while (!pushed.empty())
        TrcOutput_Q.push(pushed.take_first());
    while (merge_file* const pFile = pFirstNews) {
        pFirstNews = pFile->account.pNextNews;
        pFile->account.bInNews = false;
        if (!pFile->account.bReads)
            TrcOutput_Q.file_ends(*pFile);
    }
    bSomethingPushed.store(false, std::memory_order_relaxed);
}

/// How many records the file's reader may push next; 0: it is held back.
uint32_t room_to_push(merge_file& file) {
    if (!queue_is_full())
        return MAX_BATCH;
    const uint32_t uFloor = floor_of(file);
    const uint32_t uQueued = file.pFile->numRecPushed;
    if (uQueued >= uFloor) {
        hold_back(file);
        return 0;
    }
    // In two halves at least: one is printed while the other is read.
    return std::min({uFloor - uQueued, std::max(uFloor / 2, 1U), MAX_BATCH});
}

} // namespace

void push_batches(merge_file& file, batch_list batches) {
    if (batches.empty())
        return;
    const mutex_guard guard(ctrl.priorityQmutex);
    for (record_batch* pBatch = batches.pFirst; pBatch != nullptr; pBatch = pBatch->pNext)
        push_batch(file, pBatch);
    pushed.add(batches);
    bSomethingPushed.store(true, std::memory_order_relaxed);
}

uint32_t push_and_ask(merge_file& file, batch_list batches) {
    const mutex_guard guard(ctrl.priorityQmutex);
    push_batches(file, batches);
    return room_to_push(file);
}

void file_starts_running(merge_file& file) {
    ++uRunningFiles;
    file.account.bReads = true;
    tell_news(file);
}

bool stop_pushing(merge_file& file) {
    file.account.bReads = false;
    tell_news(file);
    file.account.bDrains = file.pFile->numRecPushed != 0;
    return !file.account.bDrains;
}

void file_stops_running(merge_file& file) {
    --uRunningFiles;
    file.account.bReads = false;
    tell_news(file);
}

uint32_t running_files() {
    return uRunningFiles;
}

bool something_was_pushed() {
    return bSomethingPushed.load(std::memory_order_relaxed);
}

void exchange_with_readers(uint32_t uTaken) {
    const batch_list finished = TrcOutput_Q.finished;
    TrcOutput_Q.finished = {};
    resumptions resumed;
    uint32_t uRunning;
    {
        const mutex_guard guard(ctrl.priorityQmutex);
        ctrl.queueDepth -= uTaken;
        for (const record_batch* pBatch = finished.pFirst; pBatch != nullptr;
             pBatch = pBatch->pNext)
            settle(*pBatch, resumed);
        end_holding_back(resumed);
        take_over_pushed();
        uRunning = uRunningFiles;
    }
    release_batches(finished);
    resumed.carry_out();
    // Who has taken something has more, mostly, and the readers may come in company.
    poolWakeThread(uTaken == 0 ? 1
                               : std::min(uRunning / FILES_PER_WAKING + 1, MOST_FILES_PER_WAKING));
}
