#include "record_bodies.h"
#include "record_text.h"

void write_start(const record_view& record, const format_entry* pFormat) {
    replace_time_base(record.pFile,
                      load_time_base(record.bytes, offsetof(trace_record_start, timeInfo)));
    if (pFormat) {
        format_data_block(pFormat, parameter_data(record), record.pFile->addrMode64);
    } else {
        const auto uPid = load<uint32_t>(record.bytes, offsetof(trace_record_start, pid));
        record_text()
            .add("id=")
            .add_hex(record.uTraceId, 8)
            .add("[0]=")
            .add_hex(uPid, 8)
            .add("\n")
            .write();
    }
    if (record.pKind->uFunction == TRC_FUNC_RESTART)
        format_string(load_string(record.bytes, sizeof(trace_record_start)));
}
