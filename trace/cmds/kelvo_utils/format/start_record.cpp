#include "record_bodies.h"
#include "record_text.h"

void write_start(const record_view& record, const format_entry* pFormat) {
    replace_time_base(record.pFile,
                      load_time_base(record.bytes, offsetof(trace_record_start, timeInfo)));
    if (pFormat)
        format_data_block(pFormat, parameter_data(record), record.pFile->addrMode64);

    text_run out;
    if (!pFormat) {
        add_trace_id(out, record.uTraceId);
        add_index(out, 0);
        add_hex(out, load<uint32_t>(record.bytes, offsetof(trace_record_start, pid)), 8);
        out.add('\n');
    }
    if (record.pKind->uFunction == TRC_FUNC_RESTART)
        format_string(out, load_string(record.bytes, sizeof(trace_record_start)));
}
