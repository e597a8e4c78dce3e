// The kinds of records as text: one row per kind says where its parts lie, under
// which trace id its template is looked up and how it is written. What else
// holds of a kind stands in TRC_KINDS.
#pragma once

#include "record_view.h"

#include <cstdint>

/// Writes the body of a record; `pFormat` is null when there is no format.
using record_writer = void (*)(const record_view& record, const format_entry* pFormat);

/// record_kind::iTemplateKey: under which trace id the format of the whole
/// record is looked up. Values from 0 on are that trace id themselves.
enum : int {
    TEMPLATE_KEY_NONE = -2,    ///< no lookup before the writer is called
    TEMPLATE_KEY_OF_BODY = -1, ///< the trace id in the record
};

/// Where the parameter data of a kind lie: elements back to back.
struct parameter_layout {
    uint32_t uOffset;
    uint32_t uElementSize;
    uint32_t uCount;       ///< elements, when uCountOffset is 0
    uint32_t uCountOffset; ///< where the record says how many elements it has
};

/// One row of the table. Offsets and lengths are in bytes from the start of
/// the record, header included.
struct record_kind {
    uint16_t uFunction;      ///< a trace_function
    uint32_t uTraceIdOffset; ///< 0: the body has no trace id
    int iTemplateKey;        ///< a trace id or TEMPLATE_KEY_*
    record_writer pWriter;   ///< null: never written
    parameter_layout data;
};

/// The row of a function code, or null when there is no such kind.
const record_kind* find_record_kind(uint16_t uFunction);

/// Elements of parameter data as the record counts them; it may lie.
uint32_t element_count(const record_view& record);

/// The parameter data, cut at the end of the record.
trace_bytes parameter_data(const record_view& record);
