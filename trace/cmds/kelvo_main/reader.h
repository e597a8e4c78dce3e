// The reader task of a trace file, and the start of readers in time order.
//
// A reader runs on a pool thread. It makes the handshake with the writer, walks
// the ring from the oldest record on, copies each record that is to be output
// out of the mapping and pushes the copies into the output queue, some hundred
// at a time. It holds back
// - at the cap: while the queue holds MAX_QUEUED records or more and this file
//   has more than ALWAYS_QUEUED of them (so that a file with little queued is
//   never held back, and the merge rule never waits for ever);
// - at its share: when this file has queued its part of the cap, until most of
//   that is printed, so that a file which comes later finds room;
// - behind a record that changes the file's time base, until that record is
//   formatted: what follows is compared under the new base only.
//
// Outside follow mode the readers are started in the order of the pre-processing
// list: before one that runs pushes a record that is not earlier than the first
// record of the next file's area (raw), or not earlier than the oldest record of
// any file not yet started (converted), and at the end of the predecessor at the
// latest. So a file is mapped only while the merge has reached its time range,
// and no record is printed before an earlier one.
#pragma once

#include "kelvo.h"

/// The cap of the output queue, and what every file may have queued above it.
inline constexpr uint32_t MAX_QUEUED = 40000;
inline constexpr uint32_t ALWAYS_QUEUED = 4;

/// Hands the file's reader task to the pool; outside follow mode opens, locks
/// and maps the file again first. Returns 0, or -1 when that failed (reported);
/// the file is then closed. Counts the file as running on success.
/// Called with priorityQmutex held.
int start_tracefile_processing(trace_file* pTraceFile);

/// Starts the readers of the next files in the order of the list. With an
/// element, the record about to be pushed, all those whose time has come; with
/// null only the list element `next`, or the one behind it that can be started,
/// when it was not started yet. Called with priorityQmutex held.
void TrcFileProcessingCtrl(const trace_queue_element* pElement, uint32_t next);

/// The reader task; `pTask` is the trace_file. Returns null.
void* thread_main(void* pTask);
