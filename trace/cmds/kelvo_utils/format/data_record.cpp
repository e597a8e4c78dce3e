// Data records: a trace id and blocks of bytes. The format of the record takes
// its parameters from the leading blocks, one each; every further block has a
// format of its own, named by its position, or is dumped.

#include "format_text.h"
#include "hex.h"
#include "record_bodies.h"
#include "record_text.h"

namespace {

/// The form of a block without a format.
void write_block_plainly(uint32_t uBlock, trace_bytes data) {
    text_run out;
    out.add("----------------- Data Block ");
    add_decimal(out, uBlock);
    out.add(" ----------------");
    out.flush();
    format_hex(data);
}

/// Writes the format of the record, or its form without one, and moves
/// `*pBlocks` past the blocks used. Returns their number.
uint32_t write_leading_blocks(const record_view& record, const format_entry* pFormat,
                              uint32_t uBlocks, trace_bytes* pBlocks) {
    if (!pFormat) {
        text_run out;
        add_trace_id(out, record.uTraceId);
        out.add('\n');
        return 0;
    }
    if (pFormat->numParms == 0) {
        format_parms(pFormat, nullptr, record.pFile->addrMode64);
        return 0;
    }
    parm_list parms;
    bld_parm_list_unpacked(pFormat, pBlocks, uBlocks, &parms);
    format_parms(pFormat, &parms, record.pFile->addrMode64);
    return static_cast<uint32_t>(parms.numParms);
}

} // namespace

int format_data_record(const record_view& record) {
    int insufficient_resources;
    const format_entry* pFormat =
        find_record_format(record, record.uTraceId, -1, &insufficient_resources);
    if (insufficient_resources)
        return 1;

    const auto uBlocks = load<uint32_t>(record.bytes, offsetof(trace_record_data, n_blocks));
    trace_bytes blocks = load_run(record.bytes, sizeof(trace_record_data));
    const uint32_t uFirstFree = write_leading_blocks(record, pFormat, uBlocks, &blocks);
    if (anchor.bBrief)
        return 0;

    trace_bytes data;
    for (uint32_t i = uFirstFree; i < uBlocks && take_data_block(&blocks, &data); i++) {
        pFormat = find_record_format(record, record.uTraceId, static_cast<int>(i),
                                     &insufficient_resources);
        if (insufficient_resources)
            return 1;
        if (pFormat)
            format_data_block(pFormat, data, record.pFile->addrMode64);
        else
            write_block_plainly(i, data);
    }
    return 0;
}

void write_data(const record_view& record, const format_entry*) {
    // What was written of the record stands; it is not one that memory was too
    // short to format.
    (void)format_data_record(record);
}
