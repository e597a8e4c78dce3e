// The output queue: the records that wait to be printed, earliest first.
//
// Records of one file nearly always arrive in time order, so each file has a
// first-in first-out run of its own, and a small heap over the heads of the
// runs gives the earliest record. A record that is earlier than the last one of
// its file's run goes to a second heap, for latecomers. The earliest record of
// the queue is thus the earlier of the two heaps' tops, whatever the files hold,
// and the usual push and pop look at no more than a few entries.
//
// Entries hold what is compared, so that ordering never touches the records. The
// time of an entry follows from its raw stamp and the time base in force; only
// the heads of the runs keep it worked out. When a file's time base changes,
// time_base_changed works it out anew and puts both heaps in order again (a run
// stays in order: all of it moves by the same amount).
//
// Everything here is called with priorityQmutex held.
#pragma once

#include "kelvo.h"

#include <cstddef>
#include <cstdint>

/// What the order of a queued record is made of.
struct queue_entry {
    uint64_t uTimeStamp;       ///< raw
    uint64_t pushSeqn : 62;    ///< breaks ties
    uint64_t bOwnBase : 1;     ///< a start record, which carries its own time base
    uint64_t bChangesBase : 1; ///< formatting it replaces the file's time base
    trace_file* pFile;         ///< whose time base holds otherwise
    trace_queue_element* pElement;
};
static_assert(sizeof(queue_entry) == 32);

/// Whether formatting a record of this kind replaces its file's time base.
constexpr bool changes_time_base(uint16_t uFunction) {
    return uFunction == TRC_FUNC_START || uFunction == TRC_FUNC_TIME_CALIBRATION ||
           uFunction == TRC_FUNC_RESTART;
}

/// The entry of an element whose pFile, pushSeqn and record are filled in.
queue_entry make_queue_entry(const trace_queue_element* pElement);

/// Negative when the first comes first, positive when the second does, 0 only
/// for the same entry.
int cmp_queue_entries(const queue_entry& first, const queue_entry& second);

/// Time of a record under the time bases in force, nanoseconds since the epoch.
cu_nanoseconds queue_entry_time(const queue_entry& entry);

struct file_run;

/// The head of a run, by the time that it has under the base in force.
struct queue_head {
    cu_nanoseconds time;
    uint64_t pushSeqn;
    file_run* pRun;
};

/// A growable array, used as a ring or as a heap.
template <class entry> struct queue_array {
    entry* pEntries = nullptr;
    size_t uCapacity = 0; ///< a power of two, or 0
    size_t uFirst = 0;    ///< of a ring: index of its head
    size_t uSize = 0;

    /// Makes room for one more entry. Returns false when memory ran out.
    bool reserve_one();
    /// Of a ring: the entry at `uIndex` counted from the head.
    entry& at(size_t uIndex) {
        return pEntries[(uFirst + uIndex) & (uCapacity - 1)];
    }
    void release();
};

/// The run of one file, made at its first push and kept by the queue.
struct file_run {
    file_run* pNext;
    trace_file* pFile;
    queue_array<queue_entry> ring;
};

/// The queue; TrcOutput_Q is the only instance outside tests.
class output_queue {
public:
    /// Adds an element (pFile, pushSeqn and record filled in). Returns false
    /// when memory ran out; the element then stays the caller's.
    bool push(trace_queue_element* pElement);

    /// Takes the earliest entry out; its element is null when the queue is empty,
    /// and otherwise the caller's from then on.
    queue_entry pop();

    bool empty() const {
        return m_heads.uSize == 0 && m_late.uSize == 0;
    }

    /// Restores the order after the time base of a file was replaced.
    void time_base_changed();

    /// Releases the queue's own memory; the elements are not touched.
    void release();

private:
    queue_array<queue_head> m_heads; ///< heap: the head of every run that is not empty
    queue_array<queue_entry> m_late; ///< heap: latecomers
    file_run* m_pRuns = nullptr;
};

extern output_queue TrcOutput_Q;
