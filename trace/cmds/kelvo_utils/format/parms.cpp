#include "parms.h"

#include "direct.h"
#include "packed_parms.h"

#include <algorithm>
#include <cstring>
#include <span>

namespace {

/// An integer widened from a short block.
union isv_t {
    int32_t i32;
    uint32_t u32;
    int64_t i64;
    uint64_t u64;
};
static_assert(sizeof(isv_t) == 8);

/// The widened integers of the unpacked list in use.
isv_t ivs_vals[20];

int parms_of(const format_entry* pFormatEntry) {
    return std::min<int>(pFormatEntry->numParms, MAX_PARMS);
}

/// Stores the integer of a block in `slot` as 32 bits. `data` are the bytes
/// from the block's first to the record's end.
void widen_integer(isv_t& slot, parm_type_t type, int32_t iLength, trace_bytes data) {
    const bool bUnsigned = type & PARM_UNSIGNED;
    if (iLength == 1 && bUnsigned)
        slot.u32 = load<uint8_t>(data, 0);
    else if (iLength == 1)
        slot.i32 = load<int8_t>(data, 0); // NOLINT(bugprone-signed-char-misuse): a number
    else if (iLength == 2 && bUnsigned)
        slot.u32 = load<uint16_t>(data, 0);
    else if (iLength == 2)
        slot.i32 = load<int16_t>(data, 0);
    else
        slot.u32 = load<uint32_t>(data, 0);
}

} // namespace

std::string_view parm_string(const parm_ref& parm) {
    if (parm.uSize == 0)
        return {};
    const auto* pText = reinterpret_cast<const char*>(parm.pBytes);
    return {pText, strnlen(pText, std::min(parm.uSize, parm.uStringLimit))};
}

parm_value decode_parm(parm_type_t type, const parm_ref& parm, int bAddr64) {
    const trace_bytes bytes = parm.bytes();
    const parm_row& row = parm_rows_of(bAddr64)[base_type(type)];
    switch (base_type(type)) {
    case PARM_DOUBLE:
    case PARM_LONGDOUBLE:
        return {.kind = VALUE_REAL, .real = load<double>(bytes, 0)};
    case PARM_FLOAT:
        return {.kind = VALUE_REAL, .real = static_cast<double>(load<float>(bytes, 0))};
    case PARM_STRING:
        return {.kind = VALUE_STRING, .string = parm_string(parm)};
    case PARM_RESOURCE_HANDLE:
        return {.kind = VALUE_BYTES, .bytes = load_run(bytes, 0, row.uSize)};
    case PARM_TRACE_ID:
        return {.kind = VALUE_TRACE_ID, .uInteger = load<uint32_t>(bytes, 0)};
    case PARM_REST:
        return {.kind = VALUE_BYTES, .bytes = bytes};
    default:
        return {.kind = type & PARM_UNSIGNED ? VALUE_UNSIGNED : VALUE_SIGNED,
                .uInteger = load_integer(shape_of_integer(type, bAddr64), bytes, 0)};
    }
}

bool take_data_block(trace_bytes* pBlocks, trace_bytes* pData) {
    if (!lies_inside(*pBlocks, 0, sizeof(trace_data)))
        return false;
    // A negative length, taken as unsigned, is beyond any end.
    *pData = load_run(*pBlocks, sizeof(trace_data), load<uint32_t>(*pBlocks, 0));
    const size_t uUsed = sizeof(trace_data) + pData->size();
    *pBlocks = load_run(*pBlocks, (uUsed + 3) / 4 * 4);
    return true;
}

void bld_parm_list_packed(const format_entry* pFormatEntry, trace_bytes* pRun, int bAddr64,
                          parm_list* pList) {
    packed_parms packed(*pRun, bAddr64);
    const int numParms = parms_of(pFormatEntry);
    int i = 0;
    while (i < numParms && packed.take(pFormatEntry->pParmTypes[i], &pList->pParms[i]))
        i++;
    pList->numParms = i;
    *pRun = packed.rest();
}

void bld_parm_list_unpacked(const format_entry* pFormatEntry, trace_bytes* pBlocks,
                            uint32_t numBlocks, parm_list* pList) {
    const auto numParms =
        static_cast<int>(std::min(static_cast<uint32_t>(parms_of(pFormatEntry)), numBlocks));
    isv_t* pSlot = ivs_vals;
    int i = 0;
    for (; i < numParms; i++) {
        const auto iLength = load<int32_t>(*pBlocks, 0);
        trace_bytes bytes = load_run(*pBlocks, sizeof(trace_data));
        trace_bytes data;
        if (!take_data_block(pBlocks, &data))
            break;
        const parm_type_t type = pFormatEntry->pParmTypes[i];
        if (base_type(type) == PARM_INT && pSlot != std::end(ivs_vals)) {
            widen_integer(*pSlot, type, iLength, bytes);
            bytes = std::as_bytes(std::span(pSlot, 1)).first(sizeof(int32_t));
            pSlot++;
        }
        pList->pParms[i] = make_parm_ref(bytes, data.size());
    }
    pList->numParms = i;
}
