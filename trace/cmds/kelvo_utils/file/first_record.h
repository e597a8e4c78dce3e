// The search for the oldest record. It is made between request_tail and release_tail
// (reader_words.h), so that the record stays where it is.
#pragma once

#include "kelvo.h"

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
