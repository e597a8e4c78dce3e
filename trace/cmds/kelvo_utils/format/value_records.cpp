#include "record_bodies.h"
#include "record_text.h"

namespace {

/// Bytes of values that stand on one line of an array.
constexpr uint32_t BYTES_PER_LINE = 16;

/// The value at `uOffset`, of 4 or 8 bytes.
uint64_t load_value(trace_bytes bytes, size_t uOffset, uint32_t uSize) {
    return uSize == sizeof(uint64_t) ? load<uint64_t>(bytes, uOffset)
                                     : load<uint32_t>(bytes, uOffset);
}

int hex_digits(uint32_t uSize) {
    return static_cast<int>(2 * uSize);
}

} // namespace

void write_values(const record_view& record, const format_entry* pFormat) {
    if (pFormat) {
        format_data_block(pFormat, parameter_data(record), record.pFile->addrMode64);
        return;
    }
    const parameter_layout& data = record.pKind->data;
    const int iDigits = hex_digits(data.uElementSize);
    const uint64_t uFirst = load_value(record.bytes, data.uOffset, data.uElementSize);

    text_run out;
    add_trace_id(out, record.uTraceId);
    if (data.uCount == 1) {
        out.add(" val=");
        add_hex(out, uFirst, iDigits);
    } else if (data.uCount == 2) {
        out.add(" val1=");
        add_hex(out, uFirst, iDigits);
        out.add(" val2=");
        add_hex(out, load_value(record.bytes, data.uOffset + data.uElementSize, data.uElementSize),
                iDigits);
    }
    out.add('\n');
}

void write_value_array(const record_view& record, const format_entry* pFormat) {
    const trace_bytes values = parameter_data(record);
    if (pFormat) {
        format_data_block(pFormat, values, record.pFile->addrMode64);
        return;
    }
    const uint32_t uSize = record.pKind->data.uElementSize;
    const uint32_t uPerLine = BYTES_PER_LINE / uSize;
    const bool bLines = element_count(record) > uPerLine;
    const size_t uPresent = values.size() / uSize;

    text_run out;
    add_trace_id(out, record.uTraceId);
    for (size_t i = 0; i < uPresent; i++) {
        out.add(bLines && i % uPerLine == 0 ? '\n' : ' ');
        add_index(out, i);
        add_hex(out, load_value(values, i * uSize, uSize), hex_digits(uSize));
    }
    out.add('\n');
}
