// Sound trace files from plain lists of records, by way of the trace writer.
#pragma once

#include "raw_trace.h"
#include "trace_writer.h"

#include <string>
#include <vector>

/// One record of a list: its kind, its origin and its body (see raw_bytes).
struct sample_record {
    uint16_t function = TRC_FUNC_ID;
    std::string_view compId = "_TST";
    uint32_t threadId = 1;
    uint64_t timeStamp = 0;
    std::vector<std::byte> body{};
};

/// A record of kind TRC_FUNC_UINT32 with a value, the commonest case.
sample_record sample_uint32(uint64_t timeStamp, uint32_t traceId, uint32_t value);

/// A record of kind TRC_FUNC_STRING.
sample_record sample_string(uint64_t timeStamp, std::string_view text);

/// Appends all records. Returns the first status that is not TRACE_WRITER_OK.
trace_writer_status append_all(trace_writer& writer, const std::vector<sample_record>& records);

/// Makes the file `path` with these records and closes it.
trace_writer_status write_sample_trace(const std::string& path,
                                       const std::vector<sample_record>& records,
                                       const trace_writer_options& options = {});
