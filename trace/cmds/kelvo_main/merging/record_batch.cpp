#include "record_batch.h"

#include "insufficient.h"
#include "merge_file.h"
#include "mutex.h"
#include "record_copy.h"

#include <atomic>
#include <cstdlib>
#include <new>

namespace {

/// Enough for some hundred short records. With many files, whose batches are
/// short, many share a block; the record that is printed last holds it.
constexpr size_t BLOCK_SIZE = 32 * 1024;

/// Longer records have memory of their own.
constexpr size_t MAX_SHARED = 4096;

/// More than a full queue of short records takes: to get blocks from the system
/// again and again would cost more than to format the records.
constexpr size_t MAX_KEPT = 512;

/// So many blocks rest after their release before they are filled again. By then
/// the main thread's processor has let go of them; to take them away from it holds
/// the reader up: a fifth to a half of all CPU time while both are equally fast.
constexpr size_t RESTING = 64;
static_assert(RESTING < MAX_KEPT);

#if defined(__SANITIZE_ADDRESS__)
#define KELVO_ELEMENTS_APART 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define KELVO_ELEMENTS_APART 1
#endif
#endif
#ifdef KELVO_ELEMENTS_APART
constexpr bool ELEMENTS_APART = true; // so that reads beyond an element show
#else
constexpr bool ELEMENTS_APART = false;
#endif

} // namespace

/// The head of a block; its batches lie behind it.
struct element_block {
    element_block* pNext;           ///< in the list of kept ones
    size_t uUsed;                   ///< bytes from the start, while nobody writes
    std::atomic<uint32_t> uBatches; ///< not yet released; one more while it can be written to
};

namespace {

// Blocks that can be written to, partly filled or empty.
pthread_mutex_t kept_mutex = PTHREAD_MUTEX_INITIALIZER; // taken last
element_block* pFirstKept = nullptr;                    // kept longest, taken first
element_block* pLastKept = nullptr;                     // meaningless when there is none
size_t uKept = 0;

constexpr size_t aligned(size_t uSize, size_t uAlignment) {
    return (uSize + uAlignment - 1) & ~(uAlignment - 1);
}

constexpr size_t BATCH_ALIGNMENT = alignof(record_batch);
constexpr size_t BATCH_SIZE = aligned(sizeof(record_batch), ELEMENT_ALIGNMENT);
constexpr size_t FIRST_BATCH = aligned(sizeof(element_block), BATCH_ALIGNMENT);

std::byte* start_of(void* pBlock) {
    return static_cast<std::byte*>(pBlock);
}

/// The block kept longest, when there are more than `uAbove`; or null.
element_block* take_kept_block(size_t uAbove) {
    const mutex_guard guard(kept_mutex);
    if (uKept <= uAbove)
        return nullptr;
    element_block* const pBlock = pFirstKept;
    pFirstKept = pBlock->pNext;
    --uKept;
    return pBlock;
}

element_block* take_block() {
    if (element_block* const pBlock = take_kept_block(RESTING))
        return pBlock;
    if (void* const pMemory = malloc(BLOCK_SIZE))
        return new (pMemory) element_block{nullptr, FIRST_BATCH, 1};
    return take_kept_block(0);
}

/// Keeps the block, which nobody else writes to.
void keep_block(element_block* pBlock) {
    {
        const mutex_guard guard(kept_mutex);
        if (uKept < MAX_KEPT) {
            pBlock->pNext = nullptr;
            (pFirstKept != nullptr ? pLastKept->pNext : pFirstKept) = pBlock;
            pLastKept = pBlock;
            ++uKept;
            return;
        }
    }
    if (pBlock->uBatches.fetch_sub(1, std::memory_order_acq_rel) == 1)
        free(pBlock);
}

/// One batch less, or no longer written to.
void release_block(element_block* pBlock) {
    if (pBlock->uBatches.fetch_sub(1, std::memory_order_acq_rel) != 1)
        return;
    pBlock->uUsed = FIRST_BATCH;
    pBlock->uBatches.store(1, std::memory_order_relaxed);
    keep_block(pBlock);
}

} // namespace

cu_timeinfo brought_time_base(const trace_queue_element* pElement) {
    const trace_record_header& header = pElement->header;
    const trace_bytes record{reinterpret_cast<const std::byte*>(&header), header.length};
    return load<cu_timeinfo>(record, header.function == TRC_FUNC_TIME_CALIBRATION
                                         ? offsetof(time_calibration, reBase)
                                         : offsetof(trace_record_start, timeInfo));
}

batch_writer::~batch_writer() {
    release_batches(m_batches);
    close_block();
}

size_t batch_writer::room_left() const {
    const std::byte* const pEnd = start_of(m_pBlock) + BLOCK_SIZE;
    return pEnd < m_pFree ? 0 : static_cast<size_t>(pEnd - m_pFree);
}

void batch_writer::close_block() {
    if (m_pBlock == nullptr)
        return;
    m_pBlock->uUsed = aligned(static_cast<size_t>(m_pFree - start_of(m_pBlock)), BATCH_ALIGNMENT);
    if (m_pBlock->uUsed + BATCH_SIZE + MAX_SHARED <= BLOCK_SIZE)
        keep_block(m_pBlock);
    else
        release_block(m_pBlock);
    m_pBlock = nullptr;
}

/// Memory for a batch whose first element takes `uSize` bytes; null when there is
/// none.
void* batch_writer::room_for_batch(size_t uSize, element_block** ppBlock) {
    const size_t uWhole = BATCH_SIZE + aligned(uSize, ELEMENT_ALIGNMENT);
    *ppBlock = nullptr;
    if (ELEMENTS_APART || uSize > MAX_SHARED)
        return malloc(uWhole);
    if (m_pBlock != nullptr)
        m_pFree = start_of(m_pBlock) +
                  aligned(static_cast<size_t>(m_pFree - start_of(m_pBlock)), BATCH_ALIGNMENT);
    if (m_pBlock == nullptr || room_left() < uWhole) {
        close_block();
        m_pBlock = take_block();
        if (m_pBlock == nullptr)
            return nullptr;
        m_pFree = start_of(m_pBlock) + m_pBlock->uUsed;
    }
    std::byte* const pRoom = m_pFree;
    m_pFree += uWhole;
    m_pBlock->uBatches.fetch_add(1, std::memory_order_relaxed);
    *ppBlock = m_pBlock;
    return pRoom;
}

/// Begins a batch with an element of `uSize` bytes and returns that one's place.
/// Null when memory ran out.
void* batch_writer::begin_batch(size_t uSize) {
    element_block* pBlock;
    void* const pMemory = room_for_batch(uSize, &pBlock);
    if (pMemory == nullptr)
        return nullptr;
    m_pOpen = new (pMemory) record_batch{};
    m_pOpen->pFile = m_pFile;
    m_pOpen->pBlock = pBlock;
    m_pOpen->pHead = reinterpret_cast<trace_queue_element*>(start_of(pMemory) + BATCH_SIZE);
    m_batches.add(m_pOpen);
    return m_pOpen->pHead;
}

/// The place of an element of `uSize` bytes behind the last one of the open batch;
/// null when there is no room.
void* batch_writer::extend_batch(size_t uSize) {
    const size_t uRoom = aligned(uSize, ELEMENT_ALIGNMENT);
    if (m_pOpen->pBlock == nullptr || room_left() < uRoom)
        return nullptr;
    std::byte* const pRoom = m_pFree;
    m_pFree += uRoom;
    return pRoom;
}

bool batch_writer::add(const trace_record_header& header, cu_timeinfo* pBase) {
    const trace_bytes record = record_at_reader(m_pFile->pFile, header);
    const size_t uSize = record.size() + QUEUE_ELEMENT_OVERHEAD;
    const bool bOwnBase = trc_kind_has_own_base(header.function);
    void* pRoom = nullptr;
    if (m_pOpen != nullptr && header.timeStamp >= m_pOpen->uLastStamp && !bOwnBase)
        pRoom = extend_batch(uSize);
    if (pRoom == nullptr)
        pRoom = begin_batch(uSize);
    if (pRoom == nullptr) {
        warn_insufficient_resources(m_pFile->pFile->pName, static_cast<int64_t>(uSize));
        return false;
    }
    const trace_queue_element* const pElement = copy_record(m_pFile->pFile, header, record, pRoom);
    m_pOpen->uLastStamp = header.timeStamp;
    m_pOpen->base = *pBase;
    m_pOpen->uBytes += pElement->length;
    ++m_pOpen->uCount;
    ++m_pOpen->uLeft;
    ++m_uCount;
    m_uBytes += pElement->length;
    if (trc_kind_changes_time_base(header.function)) [[unlikely]] {
        *pBase = brought_time_base(pElement);
        if (bOwnBase)
            m_pOpen->base = *pBase;
        m_pOpen->bOwnBase = bOwnBase;
        m_pOpen->bChangesBase = true;
        m_pOpen = nullptr;
    }
    return true;
}

batch_list batch_writer::take_over() {
    const batch_list batches = m_batches;
    m_batches = {};
    m_pOpen = nullptr;
    m_uCount = 0;
    m_uBytes = 0;
    return batches;
}

void release_batches(batch_list batches) {
    while (!batches.empty()) {
        record_batch* const pBatch = batches.take_first();
        if (pBatch->pBlock != nullptr)
            release_block(pBatch->pBlock);
        else
            free(pBatch);
    }
}

void release_kept_blocks() {
    while (element_block* const pBlock = pFirstKept) {
        pFirstKept = pBlock->pNext;
        free(pBlock);
    }
    uKept = 0;
}
