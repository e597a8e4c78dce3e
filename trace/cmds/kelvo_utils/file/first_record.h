// The reader's handshake with the writer and the search for the oldest record.
#pragma once

#include "kelvo.h"

/// Raises uTailReq and waits, at most five times 10 milliseconds, for the
/// writer to acknowledge it.
void request_tail(trace_file* pTraceFile);

/// Lowers uTailReq: the writer may give up old records again.
void release_tail(trace_file* pTraceFile);

/// Places pCurRec on the oldest record, past fillers and unfinished records,
/// keeping uSeqLock, modTime and timeStampIsValid. Works over plain memory.
/// Returns 0, or -1 when the file is corrupt (the warning is written).
int find_first_record(trace_file* pTraceFile);

/// Finds the converted time of the oldest record without storing anything in
/// the file and without a message. Returns false where anything is odd.
bool oldest_record_time(const trace_file* pTraceFile, cu_nanoseconds* pTime);
