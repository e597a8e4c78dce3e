// The reader task of a trace file, and the start of readers in time order.
#pragma once

#include "kelvo.h"

/// Hands the file's reader task to the pool; outside follow mode opens, locks
/// and maps the file again first. Returns 0, or -1 when that failed (reported);
/// the file is then closed.
int start_tracefile_processing(trace_file* pTraceFile);

/// Starts the reader of the next file in time order if its time has come:
/// looking from list index `next` on, when `pElement` (the record about to be
/// pushed; null: any) is not earlier. Called with priorityQmutex held.
void TrcFileProcessingCtrl(const trace_queue_element* pElement, uint32_t next);

/// The reader task; `pTask` is the trace_file. Returns null.
void* thread_main(void* pTask);
