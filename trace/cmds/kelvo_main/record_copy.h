// What a reader hands on: which records, and the copies of them.
#pragma once

#include "element_memory.h"
#include "kelvo.h"

/// Kinds that are handed on for output; the others are only stepped over.
inline bool is_for_output(const trace_record_header& header) {
    return header.function >= TRC_FUNC_ID && header.function <= TRC_FUNC_TIME_CALIBRATION;
}

/// Copies the record at pCurRec, whose header was judged as `header`, into a
/// new element without a push number. The copy frees the record in the mapping,
/// which the writer may overwrite. A record that ends beyond the mapping is
/// copied as far as it is there. Null when memory ran out (reported). Without
/// `pMemory` the element is a block of malloc. Any thread.
trace_queue_element* copy_record(trace_file* pTraceFile, const trace_record_header& header,
                                 element_memory* pMemory = nullptr);
