// The reader's handshake with the writer and the search for the oldest record.
//
// While uTailReq is raised the writer leaves the oldest record where it is, so
// that the reader can take its place there. The reader waits for the writer's
// acknowledgement only for a short time: a file whose writer has ended is read
// without one.
#pragma once

#include "kelvo.h"

/// Raises uTailReq: asks the writer to leave the oldest record where it is.
void request_tail(trace_file* pTraceFile);

/// Whether the writer has acknowledged it.
bool tail_is_kept(const trace_file* pTraceFile);

/// Lowers uTailReq: the writer may give up old records again.
void release_tail(trace_file* pTraceFile);

/// Places pCurRec on the oldest record, past fillers and unfinished records,
/// keeping uExpectedSeq, uSeqLock, modTime and timeStampIsValid. Works over plain
/// memory and goes once around the ring at most. When there is nothing but fillers
/// and unfinished records, pCurRec is back on the oldest position.
/// Returns 0, or -1 when the file is corrupt (the warning is written).
int find_first_record(trace_file* pTraceFile);

/// Finds the converted time of the oldest record that can be output, under the
/// time base that holds for it, without storing anything in the file and
/// without a message. Returns false where anything is odd, and when there is no
/// such record.
bool oldest_record_time(const trace_file* pTraceFile, cu_nanoseconds* pTime);
