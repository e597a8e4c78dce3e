#include "output_queue.h"

#include <utility>

output_queue TrcOutput_Q;

namespace {

/// Has the processor fetch what will be looked at next of the file: it was written
/// on another one, and the files take turns. (A tenth of the time with 1,024 files.)
void fetch(const trace_queue_element* pElement) {
    constexpr size_t LINE = 64;
    const auto* const pBytes = reinterpret_cast<const char*>(pElement);
    __builtin_prefetch(pBytes); // a hint: nothing is read
    __builtin_prefetch(pBytes + LINE);
}

// ----------------------------------------------------------------- late runs
//
// A leftist heap by the first record left: pNext and pOtherRun are a batch's
// children, uRank is the length of its shorter way down (along pOtherRun), so that
// no way that is gone is longer than a logarithm. It needs no memory of its own.

uint32_t rank_of(const record_batch* pBatch) {
    return pBatch == nullptr ? 0 : pBatch->uRank;
}

bool begins_later(const record_batch& first, const record_batch& second) {
    const trace_queue_element& a = *first.pHead;
    const trace_queue_element& b = *second.pHead;
    if (a.header.timeStamp != b.header.timeStamp)
        return a.header.timeStamp > b.header.timeStamp;
    return a.pushSeqn > b.pushSeqn;
}

record_batch* joined(record_batch* pFirst, record_batch* pSecond) {
    if (pFirst == nullptr || pSecond == nullptr)
        return pFirst != nullptr ? pFirst : pSecond;
    if (begins_later(*pFirst, *pSecond))
        std::swap(pFirst, pSecond);
    pFirst->pOtherRun = joined(pFirst->pOtherRun, pSecond);
    if (rank_of(pFirst->pNext) < rank_of(pFirst->pOtherRun))
        std::swap(pFirst->pNext, pFirst->pOtherRun);
    pFirst->uRank = rank_of(pFirst->pOtherRun) + 1;
    return pFirst;
}

record_batch* with_batch(record_batch* pLate, record_batch* pBatch) {
    pBatch->pNext = nullptr;
    pBatch->pOtherRun = nullptr;
    pBatch->uRank = 1;
    return joined(pLate, pBatch);
}

record_batch* without_first(record_batch* pLate) {
    return joined(pLate->pNext, pLate->pOtherRun);
}

// ------------------------------------------------------------------- windows

file_heap::entry entry_of(const record_batch& batch) {
    return {head_time(batch), static_cast<uint32_t>(batch.pHead->pushSeqn), batch.pFile->uNumber};
}

/// Adds the batch to what is compared. Returns false when it stands behind others in
/// any case.
bool add_to_window(file_run& run, record_batch* pBatch) {
    run.bBaseQueued = pBatch->bChangesBase;
    const bool bFirst = run.inOrder.empty();
    if (pBatch->bOwnBase) {
        run.pOwnBase = pBatch;
        return true;
    }
    if (!bFirst && pBatch->pHead->header.timeStamp < run.uLastStamp) {
        run.pLate = with_batch(run.pLate, pBatch);
        return true;
    }
    run.inOrder.add(pBatch);
    run.uLastStamp = pBatch->uLastStamp;
    return bFirst;
}

/// The first record of the batch, which has the file's earliest one, was taken.
void advance(file_run& run, record_batch* pBatch, batch_list* pFinished) {
    const bool bIsLate = pBatch == run.pLate;
    if (bIsLate)
        run.pLate = without_first(run.pLate);
    if (--pBatch->uLeft != 0) {
        pBatch->pHead = next_element(pBatch->pHead);
        fetch(next_element(pBatch->pHead)); // perhaps behind the batch: only a hint
        if (bIsLate)
            run.pLate = with_batch(run.pLate, pBatch);
        return;
    }
    if (pBatch == run.pOwnBase)
        run.pOwnBase = nullptr;
    else if (!bIsLate)
        run.inOrder.take_first();
    pFinished->add(pBatch);
}

} // namespace

cu_nanoseconds head_time(const record_batch& batch) {
    return cu_time_ns(batch.pHead->header.timeStamp,
                      batch.bOwnBase ? batch.base : batch.pFile->pFile->timeInfo);
}

bool output_queue::reserve(std::span<merge_file> files) {
    m_files = files;
    m_uWaitedFor = 0;
    const auto uFiles = static_cast<uint32_t>(files.size());
    return m_heads.reserve(uFiles) && m_awaited.reserve(uFiles);
}

// --------------------------------------------------------------- who is awaited

/// The file is read, and nothing of it is queued: others wait for it.
void output_queue::await(merge_file& file) {
    if (file.run.bHadRecords || !file.bOldestKnown)
        ++m_uWaitedFor;
    else
        m_awaited.put({file.oldestTime, 0, file.uNumber});
}

/// The counterpart of await; harmless when the file was not waited for.
void output_queue::stop_awaiting(merge_file& file) {
    if (!file.run.bReads || file.run.uRecords != 0)
        return;
    if (file.run.bHadRecords || !file.bOldestKnown)
        --m_uWaitedFor;
    else
        m_awaited.remove(file.uNumber);
}

void output_queue::file_begins(merge_file& file) {
    file.run.bReads = true;
    await(file);
}

void output_queue::file_ends(merge_file& file) {
    stop_awaiting(file);
    file.run.bReads = false;
    file.run.bEnded = true;
}

// ------------------------------------------------------------------- the queue

/// Finds the file's earliest record and gives the file its place among the others.
void output_queue::find_head(merge_file& file) {
    file_run& run = file.run;
    run.pHeadBatch = run.inOrder.pFirst;
    file_heap::entry earliest{};
    if (run.pHeadBatch != nullptr)
        earliest = entry_of(*run.pHeadBatch);
    for (record_batch* const pBatch : {run.pLate, run.pOwnBase}) {
        if (pBatch == nullptr) [[likely]]
            continue;
        const file_heap::entry entry = entry_of(*pBatch);
        if (run.pHeadBatch != nullptr && !is_later(earliest, entry))
            continue;
        run.pHeadBatch = pBatch;
        earliest = entry;
    }
    if (run.pHeadBatch != nullptr)
        m_heads.put(earliest);
    else
        m_heads.remove(file.uNumber);
}

void output_queue::push(record_batch* pBatch) {
    merge_file& file = *pBatch->pFile;
    file_run& run = file.run;
    stop_awaiting(file);
    run.uRecords += pBatch->uCount;
    run.bHadRecords = true;
    if (run.bBaseQueued) {
        run.behind.add(pBatch);
        return;
    }
    if (add_to_window(run, pBatch))
        find_head(file);
}

output_queue::taken output_queue::pop() {
    merge_file& file = m_files[m_heads.top().uFile];
    file_run& run = file.run;
    record_batch* const pBatch = run.pHeadBatch;
    trace_queue_element* const pElement = pBatch->pHead;
    advance(run, pBatch, &finished);
    --run.uRecords;
    const bool bReplacesBase = pBatch->bChangesBase && pBatch->uLeft == 0;
    if (bReplacesBase) {
        run.pHeadBatch = nullptr;
        m_heads.remove(file.uNumber);
    } else {
        find_head(file);
    }
    if (run.uRecords == 0 && run.bReads)
        await(file);
    return {pElement, bReplacesBase ? &file : nullptr};
}

void output_queue::base_was_replaced(merge_file& file) {
    file_run& run = file.run;
    run.bBaseQueued = false;
    while (!run.behind.empty() && !run.bBaseQueued)
        add_to_window(run, run.behind.take_first());
    find_head(file);
}
