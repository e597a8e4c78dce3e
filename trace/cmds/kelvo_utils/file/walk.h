// The step round the ring: whether the record at pCurRec may be read, whether
// the reader has caught up with the writer, and the way to the next record.
// Works over plain memory: a trace_file whose pName, pHeader, pWrap and pMapEnd
// are set is all it needs. One reader per file, no lock. The reader's place in the
// sequence is uExpectedSeq; uSeqLock is stored from it, and never read.
//
// Everything is judged, and then worked on, as a copy of the record's header,
// so that nothing which changes in the mapping meanwhile can move a bound after
// its test. What stands on the oldest position may be half replaced when it is
// judged; a writer therefore keeps every mixture of old and new words sound.
#pragma once

#include "kelvo.h"
#include "shared_words.h"
#include "trace_load.h"

/// Offset of a record from the start of the file.
uint32_t get_record_offset(const trace_file* pTraceFile, const trace_record_header* pRec);

/// A copy of the header at `pRec`, each word read once. `pRec` must leave 28
/// bytes before pMapEnd.
inline trace_record_header read_record_header(const trace_record_header* pRec) {
    trace_record_header header;
    load_record_header(pRec, &header);
    return header;
}

/// The bytes of the record at `pRec` whose length field was read as `length`:
/// cut at the end of the mapping; empty when `pRec` lies outside.
trace_bytes record_bytes(const trace_file* pTraceFile, const trace_record_header* pRec,
                         uint32_t length);

/// 1 when the record is corrupt (the warning is written), else 0. `pRec` is
/// where it stands, `header` the copy of its header that is judged.
int record_is_bad(const trace_record_header* pRec, const trace_record_header& header,
                  const trace_file* pTraceFile);

/// 1 when pCurRec is out of bounds or its record corrupt (the warning is
/// written), else 0. Fills `pHeader` with the copy that was judged, unless
/// pCurRec is out of bounds.
int current_record_pointer_is_bad(const trace_file* pTraceFile, trace_record_header* pHeader);

/// Results of is_last_record and get_next_record.
enum walk_result : int {
    WALK_CORRUPT = -1, ///< give the file up; the warning is written
    WALK_RECORD = 0,   ///< the record at pCurRec can be read
    WALK_NO_RECORD = 1 ///< caught up with the writer, or the ring is inconsistent
};

/// Whether a record can be read at pCurRec; fills `pHeader` with the copy of
/// its header that was judged and is to be worked on. May be asked again at the
/// same position any number of times; stores uSeqLock anew each time.
walk_result is_last_record(trace_file* pTraceFile, trace_record_header* pHeader);

/// Whether the record at pCurRec, found readable and copied to `pHeader`, has
/// its seqNumber: the writer stores it a moment after the record can be read.
/// Reads it again if it was not there. Asked again, in the end always true, but
/// for a writer that was killed in that moment.
bool number_has_come(const trace_file* pTraceFile, trace_record_header* pHeader);

/// Steps past the record at pCurRec, which is_last_record has just found
/// readable and copied to `current`; the step goes by that copy. Returns
/// WALK_RECORD, or WALK_CORRUPT when the new position is bad. Raises uSeqLock
/// past the record: from then on the writer may overwrite it.
walk_result step_to_next_record(trace_file* pTraceFile, const trace_record_header& current);

/// step_to_next_record past the record whose judged copy is `*pHeader`, then
/// is_last_record at the new position, with one look at its header.
walk_result step_and_judge(trace_file* pTraceFile, trace_record_header* pHeader);

/// is_last_record, then the step. On WALK_NO_RECORD no step was taken; on
/// WALK_CORRUPT none was taken or the new position is bad.
walk_result get_next_record(trace_file* pTraceFile);
