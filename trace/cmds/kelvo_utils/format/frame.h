// The record frame: the prefix of a record's first line, the indentation of its
// body and the nesting of its thread. Main thread only.
#pragma once

#include "kelvo.h"
#include "sink.h"         // output_abandon_rec
#include "thread_state.h" // free_thread_info

/// Opens a record: ends an abandoned line, writes the prefix chosen with -o and
/// sets the body column. `pCompId` are 4 characters without terminator.
/// Returns 0, or 1 when memory ran out (nothing of the record is written).
int output_start_rec(trace_file* pTraceFile, const char* pCompId, uint64_t threadId,
                     uint32_t funcId, uint32_t seqNumber, uint32_t offset, uint64_t timeStamp,
                     const cu_timeinfo* pTimeInfo);

/// Closes the record: applies the nesting, ends its last line. Without an open
/// record at most a pending newline is written.
void output_end_rec();
