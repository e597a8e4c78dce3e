// A queued record as the formatters see it: its bytes, bounded by what the
// queue element holds, its file and its kind. Main thread only.
#pragma once

#include "kelvo.h"
#include "trace_load.h"

struct record_kind;

/// The record that is being written. Nothing here is owned.
struct record_view {
    trace_queue_element* pElement;
    trace_file* pFile;        ///< file of the element
    const record_kind* pKind; ///< its row of the table of kinds
    trace_bytes bytes;        ///< the record from its header on
    uint32_t uTraceId;        ///< 0 when the kind has none
};

/// The bytes of the record copy, from its header on: as many as its own length
/// names, but never more than the block holds.
trace_bytes element_record_bytes(const trace_queue_element* pElement);

/// The two words of a time base at `uOffset` of a record.
cu_timeinfo load_time_base(trace_bytes bytes, size_t uOffset);

/// Makes `base` the file's time base, under priorityQmutex: comparisons of
/// queued records read it on other threads.
void replace_time_base(trace_file* pTraceFile, const cu_timeinfo& base);

/// The format of the record's component for `uTraceId` and `iBlockId` (-1: the
/// record as a whole), or null. Raw output has no formats.
/// *pInsufficientResources: 1 when memory ran out, else 0.
const format_entry* find_record_format(const record_view& record, uint32_t uTraceId, int iBlockId,
                                       int* pInsufficientResources);

/// Writes one format over one packed run of parameters, then a hex dump of the
/// bytes that no parameter took.
void format_data_block(const format_entry* pFormatEntry, trace_bytes data, int bAddr64);
