// What a reader hands on: which records, and the copies of them.
#pragma once

#include "kelvo.h"
#include "trace_load.h"

/// The bytes of the record at pCurRec, whose header was judged as `header`. A
/// record that ends beyond the mapping is cut there.
trace_bytes record_at_reader(const trace_file* pTraceFile, const trace_record_header& header);

/// Copies that record into `pRoom`, which holds QUEUE_ELEMENT_OVERHEAD bytes more,
/// as an element without a push number. The copy frees the record in the mapping,
/// which the writer may overwrite. Any thread.
trace_queue_element* copy_record(trace_file* pTraceFile, const trace_record_header& header,
                                 trace_bytes record, void* pRoom);
