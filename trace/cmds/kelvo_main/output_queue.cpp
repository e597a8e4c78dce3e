#include "output_queue.h"

#include "trace_load.h"

#include <algorithm>
#include <cstdlib>
#include <memory>
#include <new>

output_queue TrcOutput_Q;

namespace {

/// Heap order: the earliest entry is on top.
struct greater_Q_compare {
    bool operator()(const queue_entry& first, const queue_entry& second) const {
        return cmp_queue_entries(first, second) > 0;
    }
};

void add_to_heap(queue_entries& heap, const queue_entry& entry) {
    heap.pEntries[heap.uSize++] = entry;
    std::push_heap(heap.pEntries, heap.pEntries + heap.uSize, greater_Q_compare{});
}

queue_entry take_from_heap(queue_entries& heap) {
    std::pop_heap(heap.pEntries, heap.pEntries + heap.uSize, greater_Q_compare{});
    return heap.pEntries[--heap.uSize];
}

/// Puts `entry` in the place of the heap's top and restores the order: one way
/// down instead of a removal and an insertion.
void replace_top(queue_entries& heap, const queue_entry& entry) {
    size_t uHole = 0;
    for (;;) {
        size_t uChild = 2 * uHole + 1;
        if (uChild >= heap.uSize)
            break;
        if (uChild + 1 < heap.uSize &&
            cmp_queue_entries(heap.pEntries[uChild + 1], heap.pEntries[uChild]) < 0)
            ++uChild;
        if (cmp_queue_entries(entry, heap.pEntries[uChild]) <= 0)
            break;
        heap.pEntries[uHole] = heap.pEntries[uChild];
        uHole = uChild;
    }
    heap.pEntries[uHole] = entry;
}

int compare(cu_nanoseconds first, cu_nanoseconds second) {
    return first < second ? -1 : first > second ? 1 : 0;
}

} // namespace

queue_entry make_queue_entry(const trace_queue_element* pElement) {
    const uint16_t uFunction = pElement->header.function;
    queue_entry entry{};
    entry.uTimeStamp = pElement->header.timeStamp;
    entry.pushSeqn = pElement->pushSeqn & ((uint64_t{1} << 62) - 1);
    entry.bOwnBase = uFunction == TRC_FUNC_START;
    entry.bChangesBase = changes_time_base(uFunction);
    entry.pFile = pElement->pFile;
    entry.pElement = const_cast<trace_queue_element*>(pElement);
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
    return static_cast<int32_t>(static_cast<uint32_t>(first.pushSeqn) -
                                static_cast<uint32_t>(second.pushSeqn));
}

bool queue_entries::reserve_one() {
    if (uSize < uCapacity)
        return true;
    const size_t uNewCapacity = uCapacity == 0 ? 64 : 2 * uCapacity;
    auto* pNew = static_cast<queue_entry*>(malloc(uNewCapacity * sizeof(queue_entry)));
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

void queue_entries::release() {
    free(pEntries);
    *this = queue_entries{};
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
    queue_entries& ring = pFile->pQueuedRun->ring;
    const queue_entry entry = make_queue_entry(pElement);
    if (ring.uSize != 0 && cmp_queue_entries(entry, ring.at(ring.uSize - 1)) < 0) {
        if (!m_late.reserve_one())
            return false;
        add_to_heap(m_late, entry);
        return true;
    }
    if (!ring.reserve_one() || (ring.uSize == 0 && !m_heads.reserve_one()))
        return false;
    ring.at(ring.uSize++) = entry;
    if (ring.uSize == 1)
        add_to_heap(m_heads, entry);
    return true;
}

queue_entry output_queue::pop() {
    if (empty())
        return {};
    if (m_late.uSize != 0 &&
        (m_heads.uSize == 0 || cmp_queue_entries(m_late.pEntries[0], m_heads.pEntries[0]) < 0))
        return take_from_heap(m_late);

    const queue_entry earliest = m_heads.pEntries[0];
    queue_entries& ring = earliest.pFile->pQueuedRun->ring;
    ring.uFirst = (ring.uFirst + 1) & (ring.uCapacity - 1);
    if (--ring.uSize != 0)
        replace_top(m_heads, ring.at(0));
    else
        take_from_heap(m_heads);
    return earliest;
}

void output_queue::time_base_changed() {
    std::make_heap(m_heads.pEntries, m_heads.pEntries + m_heads.uSize, greater_Q_compare{});
    std::make_heap(m_late.pEntries, m_late.pEntries + m_late.uSize, greater_Q_compare{});
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
