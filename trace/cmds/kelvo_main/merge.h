// The order in which records leave the output queue, and the loop that takes
// and formats them. Main thread.
//
// The merge rule. Outside follow mode the earliest queued record may be taken
// only when every running file has at least one record in the queue. Then no
// earlier record can still arrive:
// - a running file queues its records in time order, so what it queues later is
//   not earlier than the earliest one that it has queued;
// - of the files not yet started, the reader of the last started file starts the
//   next one before it queues a record that is not earlier than any of them
//   holds (see reader.h), and one of its records is in the queue, or it has
//   finished and has started the next one before it did.
// In follow mode the earliest of whatever is queued is taken at once.
#pragma once

#include "kelvo.h"

/// -1, 0 or 1: seconds first, then nanoseconds.
int compare_timestamps(const timespec* pFirst, const timespec* pSecond);

/// Record order: negative when the first record comes first, positive when the
/// second does, 0 only for the same element. By time under the time bases in
/// force now, then by push number.
int cmp_Q_elements(const trace_queue_element* pFirst, const trace_queue_element* pSecond);

/// Sort comparison of two TrcPreProcHdrElem by the time of their `header`.
int cmp_trc_file_hdrs(const void* pFirst, const void* pSecond);

/// Sorts the pre-processing list, tells each file its position (index2) and
/// fills earliestFrom. Before any reader runs.
void sort_files();

/// Bookkeeping of the merge rule; called with priorityQmutex held, once per
/// file each: when its reader is started, and when it has finished or could not
/// be started after all.
void file_starts_running(trace_file* pTraceFile);
void file_stops_running(trace_file* pTraceFile);

/// Takes records out of the queue, as many in a row as the merge rule allows,
/// and formats them; waits a little when there is none to take. Returns false
/// when no file is running any more.
bool find_and_format_next_record();

/// The merge loop. Returns when every file is finished; in follow mode never.
void merge_records();
