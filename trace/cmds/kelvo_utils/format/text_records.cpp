#include "print.h"
#include "record_bodies.h"
#include "record_text.h"
#include "sink.h"

/// Trace id of an array of strings that has none.
static constexpr uint32_t NO_TRACE_ID = 0xFFFFFFFF;

void write_string(const record_view& record, const format_entry*) {
    output_char(' ');
    format_string(load_string(record.bytes, offsetof(trace_record_string, string)));
    output_char('\n');
}

void write_string_array(const record_view& record, const format_entry* pFormat) {
    if (pFormat) {
        format_data_block(pFormat, parameter_data(record), record.pFile->addrMode64);
        return;
    }
    if (record.uTraceId != NO_TRACE_ID)
        record_text().add("id=").add_hex(record.uTraceId, 8).write();
    output_char(' ');

    const auto uNumber = load<uint32_t>(record.bytes, offsetof(trace_record_strings, number));
    size_t uOffset = sizeof(trace_record_strings);
    for (uint32_t i = 0; i < uNumber && uOffset < record.bytes.size(); i++) {
        if (uNumber > 1)
            record_text().add("\n[").add_decimal(i).add("]=").write();
        const std::string_view string = load_string(record.bytes, uOffset);
        format_string(string);
        uOffset += string.size() + 1;
    }
    output_char('\n');
}

void write_discarded(const record_view&, const format_entry*) {
    output_message("%s: 2625-152 Unable to keep up with program being traced, trace records have "
                   "been discarded at this point.\n",
                   anchor.pProgName);
}
