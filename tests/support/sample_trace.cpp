#include "sample_trace.h"

sample_record sample_uint32(uint64_t timeStamp, uint32_t traceId, uint32_t value) {
    return {TRC_FUNC_UINT32, "_TST", 1, timeStamp, raw_bytes(traceId, value)};
}

sample_record sample_string(uint64_t timeStamp, std::string_view text) {
    return {TRC_FUNC_STRING, "_TST", 1, timeStamp, raw_bytes(text, '\0')};
}

trace_writer_status append_all(trace_writer& writer, const std::vector<sample_record>& records) {
    for (const sample_record& record : records) {
        const trace_origin origin{record.compId, record.threadId, record.timeStamp};
        const trace_writer_status status = writer.append(record.function, origin, record.body);
        if (status != TRACE_WRITER_OK)
            return status;
    }
    return TRACE_WRITER_OK;
}

trace_writer_status write_sample_trace(const std::string& path,
                                       const std::vector<sample_record>& records,
                                       const trace_writer_options& options) {
    trace_writer writer;
    const trace_writer_status status = writer.create(path.c_str(), options);
    return status == TRACE_WRITER_OK ? append_all(writer, records) : status;
}
