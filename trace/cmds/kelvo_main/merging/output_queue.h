// The output queue: the records that wait to be printed, earliest first.
//
// Readers push batches, in which the raw stamps ascend. Records of one file nearly
// always arrive in time order, so each file has a first-in first-out run of batches,
// and a heap over the files, by their earliest records, gives the earliest of all. A
// batch that begins earlier than the last record of its file's run goes into a heap
// of the file's own, the late ones. So the usual push and take look at no more than
// a few entries, whatever the files hold.
//
// The order is by the time under the base in force, then by the push number. Within
// a file the raw stamps tell it, whatever the base. A record that changes its file's
// time base is taken by itself: base_was_replaced must follow before the next take.
// What was pushed behind it is not compared with anything before that, so no two
// records are ever compared under a base that one of them is about to end; and a
// change costs the file's own place in the heap only.
//
// Main thread only. What may be taken, and when, is the merge rule (merge.h).
#pragma once

#include "file_heap.h"
#include "merge_file.h"
#include "record_batch.h"

#include <cstdint>
#include <span>

/// The queue; TrcOutput_Q is the only instance outside tests.
class output_queue {
public:
    /// Prepares for these files, numbered in their order, of which nothing is queued.
    /// Returns false when memory ran out.
    bool reserve(std::span<merge_file> files);

    /// The file's reader begins: from now on it is waited for while nothing of it is
    /// queued, or, while nothing of it ever was and its oldest time is known, as soon
    /// as a record is not earlier than that.
    void file_begins(merge_file& file);

    /// No more batches will come from it.
    void file_ends(merge_file& file);

    /// Adds a batch, whose elements have their push numbers.
    void push(record_batch* pBatch);

    bool empty() const {
        return m_heads.empty();
    }

    /// Whether nothing earlier than the earliest record can come any more: every
    /// file that is read has something queued, or is known to come later.
    bool is_complete() const {
        return m_uWaitedFor == 0 &&
               (m_awaited.empty() || m_heads.top().time < m_awaited.top().time);
    }

    struct taken {
        trace_queue_element* pElement;
        merge_file* pBaseOf; ///< not null: the record replaces this file's time base, and
                             ///< base_was_replaced must be called when it has
    };

    /// Takes the earliest record out; the queue is not empty. Its memory is its
    /// batch's, which is in `finished` after its last record.
    taken pop();

    /// The record with which the base changes was formatted; the file's timeInfo is
    /// the new base.
    void base_was_replaced(merge_file& file);

    batch_list finished; ///< batches without a record left; the caller takes them away

private:
    void find_head(merge_file& file);
    void await(merge_file& file);
    void stop_awaiting(merge_file& file);

    std::span<merge_file> m_files;
    file_heap m_heads;         ///< the files with a record to compare
    file_heap m_awaited;       ///< by their oldest times: files that have only begun
    uint32_t m_uWaitedFor = 0; ///< files that are read and have nothing queued
};

/// Time of the first record left in the batch, under the base in force.
cu_nanoseconds head_time(const record_batch& batch);

extern output_queue TrcOutput_Q;
