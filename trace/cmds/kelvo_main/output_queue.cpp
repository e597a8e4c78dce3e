#include "output_queue.h"

#include "trace_load.h"

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <new>

output_queue TrcOutput_Q;

namespace {

/// Negative when the push `uFirst` came before the push `uSecond`.
int32_t compare_pushes(uint64_t uFirst, uint64_t uSecond) {
    return static_cast<int32_t>(static_cast<uint32_t>(uFirst) - static_cast<uint32_t>(uSecond));
}

bool is_later(const queue_entry& first, const queue_entry& second) {
    return cmp_queue_entries(first, second) > 0;
}

bool is_later(const queue_head& first, const queue_head& second) {
    if (first.time != second.time)
        return first.time > second.time;
    return compare_pushes(first.pushSeqn, second.pushSeqn) > 0;
}

/// Heap order: the earliest entry is on top.
struct greater_Q_compare {
    template <class entry> bool operator()(const entry& first, const entry& second) const {
        return is_later(first, second);
    }
};

template <class entry> void order_heap(queue_array<entry>& heap) {
    std::make_heap(heap.pEntries, heap.pEntries + heap.uSize, greater_Q_compare{});
}

template <class entry> void add_to_heap(queue_array<entry>& heap, const entry& added) {
    heap.pEntries[heap.uSize++] = added;
    std::push_heap(heap.pEntries, heap.pEntries + heap.uSize, greater_Q_compare{});
}

template <class entry> entry take_from_heap(queue_array<entry>& heap) {
    std::pop_heap(heap.pEntries, heap.pEntries + heap.uSize, greater_Q_compare{});
    return heap.pEntries[--heap.uSize];
}

/// Puts `added` in the place of the heap's top and restores the order: one way
/// down instead of a removal and an insertion.
template <class entry> void replace_top(queue_array<entry>& heap, const entry& added) {
    size_t uHole = 0;
    for (;;) {
        size_t uChild = 2 * uHole + 1;
        if (uChild >= heap.uSize)
            break;
        if (uChild + 1 < heap.uSize && is_later(heap.pEntries[uChild], heap.pEntries[uChild + 1]))
            ++uChild;
        if (!is_later(added, heap.pEntries[uChild]))
            break;
        heap.pEntries[uHole] = heap.pEntries[uChild];
        uHole = uChild;
    }
    heap.pEntries[uHole] = added;
}

/// The head of a run that is not empty.
queue_head head_of(file_run* pRun) {
    const queue_entry& entry = pRun->ring.at(0);
    return {queue_entry_time(entry), entry.pushSeqn, pRun};
}

/// In place: a copy of what was just stored by fields would wait for the stores.
void fill_queue_entry(queue_entry* pEntry, const trace_queue_element* pElement) {
    const uint16_t uFunction = pElement->header.function;
    pEntry->uTimeStamp = pElement->header.timeStamp;
    pEntry->pushSeqn = pElement->pushSeqn & ((uint64_t{1} << 62) - 1);
    pEntry->bOwnBase = uFunction == TRC_FUNC_START;
    pEntry->bChangesBase = changes_time_base(uFunction);
    pEntry->pFile = pElement->pFile;
    pEntry->pElement = const_cast<trace_queue_element*>(pElement);
}

int compare(cu_nanoseconds first, cu_nanoseconds second) {
    return first < second ? -1 : first > second ? 1 : 0;
}

} // namespace

queue_entry make_queue_entry(const trace_queue_element* pElement) {
    queue_entry entry;
    fill_queue_entry(&entry, pElement);
    return entry;
}

cu_nanoseconds queue_entry_time(const queue_entry& entry) {
    if (!entry.bOwnBase)
        return cu_time_ns(entry.uTimeStamp, entry.pFile->timeInfo);
    const trace_record_header& header = entry.pElement->header;
    const trace_bytes record{reinterpret_cast<const std::byte*>(&header), header.length};
    return cu_time_ns(entry.uTimeStamp,
                      load<cu_timeinfo>(record, offsetof(trace_record_start, timeInfo)));
}

int cmp_queue_entries(const queue_entry& first, const queue_entry& second) {
    int iResult;
    if (first.pFile == second.pFile && !first.bOwnBase && !second.bOwnBase)
        iResult = first.uTimeStamp < second.uTimeStamp ? -1 : first.uTimeStamp > second.uTimeStamp;
    else
        iResult = compare(queue_entry_time(first), queue_entry_time(second));
    if (iResult != 0)
        return iResult;
    return compare_pushes(first.pushSeqn, second.pushSeqn);
}

template <class entry> bool queue_array<entry>::reserve_one() {
    if (uSize < uCapacity)
        return true;
    const size_t uNewCapacity = uCapacity == 0 ? 64 : 2 * uCapacity;
    // Aligned, so that no entry lies in two cache lines.
    auto* pNew = static_cast<entry*>(aligned_alloc(CACHE_LINE, uNewCapacity * sizeof(entry)));
    if (pNew == nullptr)
        return false;
    for (size_t uIndex = 0; uIndex < uSize; ++uIndex)
        pNew[uIndex] = at(uIndex);
    free(pEntries);
    pEntries = pNew;
    uCapacity = uNewCapacity;
    uFirst = 0;
    return true;
}

template <class entry> void queue_array<entry>::release() {
    free(pEntries);
    *this = queue_array{};
}

bool output_queue::push(trace_queue_element* pElement) {
    trace_file* const pFile = pElement->pFile;
    if (pFile->pQueuedRun == nullptr) {
        auto* pRun = new (std::nothrow) file_run{m_pRuns, pFile, {}};
        if (pRun == nullptr)
            return false;
        m_pRuns = pRun;
        pFile->pQueuedRun = pRun;
    }
    queue_array<queue_entry>& ring = pFile->pQueuedRun->ring;
    if (!ring.reserve_one() || (ring.uSize == 0 && !m_heads.reserve_one()))
        return false;
    queue_entry& entry = ring.at(ring.uSize);
    fill_queue_entry(&entry, pElement);
    if (ring.uSize != 0 && is_later(ring.at(ring.uSize - 1), entry)) {
        if (!m_late.reserve_one())
            return false;
        add_to_heap(m_late, entry);
        return true;
    }
    if (++ring.uSize == 1)
        add_to_heap(m_heads, head_of(pFile->pQueuedRun));
    return true;
}

queue_entry output_queue::pop() {
    if (empty())
        return {};
    if (m_late.uSize != 0 &&
        (m_heads.uSize == 0 || is_later(m_heads.pEntries[0].pRun->ring.at(0), m_late.pEntries[0])))
        return take_from_heap(m_late);

    file_run* const pRun = m_heads.pEntries[0].pRun;
    queue_array<queue_entry>& ring = pRun->ring;
    const queue_entry earliest = ring.at(0);
    ring.uFirst = (ring.uFirst + 1) & (ring.uCapacity - 1);
    __builtin_prefetch(&ring.at(1)); // the next head but one: pushed on another processor
    if (--ring.uSize != 0)
        replace_top(m_heads, head_of(pRun));
    else
        take_from_heap(m_heads);
    return earliest;
}

void output_queue::time_base_changed() {
    for (size_t uIndex = 0; uIndex < m_heads.uSize; ++uIndex)
        m_heads.pEntries[uIndex] = head_of(m_heads.pEntries[uIndex].pRun);
    order_heap(m_heads);
    order_heap(m_late);
}

void output_queue::release() {
    while (m_pRuns != nullptr) {
        const std::unique_ptr<file_run> run(m_pRuns);
        m_pRuns = run->pNext;
        run->pFile->pQueuedRun = nullptr;
        run->ring.release();
    }
    m_heads.release();
    m_late.release();
}
