// The loop that gives each record its turn. Main thread.
//
// The merge rule. Outside follow mode the earliest queued record may be taken only
// when every file that is read has at least one record in the queue, or is known to
// begin later. Then no earlier record can still arrive:
// - a file queues its records in time order, so what it queues later is not earlier
//   than the earliest one that it has queued;
// - a file not yet started holds nothing earlier than any record that is queued: it
//   would have been started before that was pushed (see file_starts.h).
// In follow mode the earliest of whatever is queued is taken at once.
#pragma once

#include "kelvo.h"

/// Who gets the records, and what else the main thread does meanwhile. Called on the
/// main thread, without a lock.
class merge_listener {
public:
    /// The record's turn has come. It is the caller's again when this returns. A
    /// record that replaces its file's time base has done so by then.
    virtual void take_record(trace_queue_element* pElement) = 0;

    /// After each record, and now and then while there is none.
    virtual void between_records() = 0;

    /// Nothing can be taken at the moment: sleeps, at most so long.
    virtual void wait(int64_t iMicroseconds) = 0;

protected:
    ~merge_listener() = default;
};

/// Takes records out of the queue, as many in a row as the merge rule allows, and
/// hands them on; waits a little when there is none to take. Returns false when no
/// file is running any more.
bool find_and_format_next_record(merge_listener& listener);

/// The merge loop. Returns when every file is finished; in follow mode never.
void merge_records(merge_listener& listener);
