#include "print.h"
#include "record_bodies.h"
#include "record_text.h"

namespace {

/// Trace id of an array of strings that has none.
constexpr uint32_t NO_TRACE_ID = 0xFFFFFFFF;

} // namespace

void write_string(const record_view& record, const format_entry*) {
    text_run out;
    out.add(' ');
    format_string(out, load_string(record.bytes, offsetof(trace_record_string, string)));
    out.add('\n');
}

void write_string_array(const record_view& record, const format_entry* pFormat) {
    if (pFormat) {
        format_data_block(pFormat, parameter_data(record), record.pFile->addrMode64);
        return;
    }
    text_run out;
    if (record.uTraceId != NO_TRACE_ID)
        add_trace_id(out, record.uTraceId);
    out.add(' ');

    // As many as the record names, while its bytes last.
    const auto uNumber = load<uint32_t>(record.bytes, offsetof(trace_record_strings, number));
    size_t uOffset = sizeof(trace_record_strings);
    for (uint32_t i = 0; i < uNumber && uOffset < record.bytes.size(); i++) {
        if (uNumber > 1) {
            out.add('\n');
            add_index(out, i);
        }
        const std::string_view string = load_string(record.bytes, uOffset);
        format_string(out, string);
        uOffset += string.size() + 1;
    }
    out.add('\n');
}

void write_discarded(const record_view&, const format_entry*) {
    output_message("%s: 2625-152 Unable to keep up with program being traced, trace records have "
                   "been discarded at this point.\n",
                   anchor.pProgName);
}
