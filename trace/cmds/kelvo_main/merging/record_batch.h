// Batches: the records that a reader hands on in one piece, as copies that lie one
// behind the other in memory, in ascending order of their raw time stamps. So the
// main thread finds the next one where the processor already looks, and a push, a
// take and a release cost something per batch only.
//
// Batches of different files share blocks of memory. A block serves again when its
// last batch is released; large records have memory of their own.
#pragma once

#include "kelvo.h"
#include "trace_load.h"

#include <cstddef>
#include <cstdint>

struct element_block;
struct merge_file;

/// Consecutive records of one file. Made by a batch_writer, the main thread's from
/// its push on.
struct record_batch {
    record_batch* pNext; ///< in the list that it stands in
    merge_file* pFile;
    element_block* pBlock;      ///< its memory; null: a block of malloc
    trace_queue_element* pHead; ///< the first record not yet taken
    uint32_t uCount;            ///< records
    uint32_t uLeft;             ///< records not yet taken
    uint32_t uBytes;            ///< memory taken, for the account
    bool bOwnBase;              ///< one start record, which carries its own time base
    bool bChangesBase;          ///< formatting its last record replaces the file's time base
    uint64_t uLastStamp;        ///< raw, the highest
    cu_timeinfo base;           ///< under which the reader found its last record
    record_batch* pOtherRun;    ///< of a late run: see late_runs
    uint32_t uRank;             ///< likewise
};

/// Batches linked by pNext.
struct batch_list {
    record_batch* pFirst = nullptr;
    record_batch* pLast = nullptr; ///< meaningless when the list is empty

    void add(record_batch* pBatch) {
        pBatch->pNext = nullptr;
        (pFirst != nullptr ? pLast->pNext : pFirst) = pBatch;
        pLast = pBatch;
    }
    void add(const batch_list& others) {
        if (others.pFirst == nullptr)
            return;
        (pFirst != nullptr ? pLast->pNext : pFirst) = others.pFirst;
        pLast = others.pLast;
    }
    record_batch* take_first() {
        record_batch* const pBatch = pFirst;
        pFirst = pBatch->pNext;
        return pBatch;
    }
    bool empty() const {
        return pFirst == nullptr;
    }
};

/// Elements of a batch begin at multiples of this.
inline constexpr size_t ELEMENT_ALIGNMENT = alignof(trace_queue_element);

/// The element behind `pElement` in its batch.
inline trace_queue_element* next_element(trace_queue_element* pElement) {
    const size_t uSize = (pElement->length + ELEMENT_ALIGNMENT - 1) & ~(ELEMENT_ALIGNMENT - 1);
    return reinterpret_cast<trace_queue_element*>(reinterpret_cast<std::byte*>(pElement) + uSize);
}

/// The time base that a record of a kind which changes it brings.
cu_timeinfo brought_time_base(const trace_queue_element* pElement);

/// Copies records of one file into batches, during one step of its reader.
class batch_writer {
public:
    explicit batch_writer(merge_file* pFile) : m_pFile(pFile) {}
    batch_writer(const batch_writer&) = delete;
    batch_writer& operator=(const batch_writer&) = delete;
    ~batch_writer(); ///< what was not taken over is released

    /// Copies the record at pCurRec, whose header was judged as `header`. `*pBase`
    /// is the base under which the file's records are read, and follows those that
    /// change it. Returns false when memory ran out (reported).
    bool add(const trace_record_header& header, cu_timeinfo* pBase);

    /// Records added and not yet taken over.
    uint32_t count() const {
        return m_uCount;
    }

    /// Memory that they take.
    uint64_t bytes() const {
        return m_uBytes;
    }

    /// The batches so far, now the caller's.
    batch_list take_over();

private:
    void close_block();
    size_t room_left() const;
    void* room_for_batch(size_t uSize, element_block** ppBlock);
    void* begin_batch(size_t uSize);
    void* extend_batch(size_t uSize);

    merge_file* m_pFile;
    batch_list m_batches;
    record_batch* m_pOpen = nullptr; ///< the last batch while records may be added to it
    element_block* m_pBlock = nullptr;
    std::byte* m_pFree = nullptr; ///< the free part of m_pBlock
    uint32_t m_uCount = 0;
    uint64_t m_uBytes = 0;
};

/// Releases batches, whatever is left in them. Any thread.
void release_batches(batch_list batches);

/// Returns the blocks that are kept for later to the allocator. When no reader
/// runs.
void release_kept_blocks();
