// Finding parameters and writing a format with them.
//
// A format is literal text with conversions in between, whose places the
// compiler has noted. What it noted is trusted; the bytes of the record are
// not: every parameter is read through the bounds in its parm_ref.

#include "parms.h"

#include "conversion.h"
#include "direct.h"
#include "field.h"
#include "template_file.h"
#include "text_run.h"

#include <algorithm>
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

constexpr uint8_t NO_PARM = 255; ///< conv_spec: neither a '*' width nor a '*' precision

/// How a packed parameter lies in its run.
struct packed_shape {
    uint8_t uAlignment;
    uint8_t uSize;
};

/// By base type. Strings and the rest have no fixed size; a long has the shape
/// of an int in a 32-bit file.
constexpr packed_shape packedShapes[PARM_BASE_MASK + 1] = {
    {1, 0},  // 0
    {1, 1},  // PARM_CHAR
    {2, 2},  // PARM_SHORT
    {4, 4},  // PARM_INT
    {8, 8},  // PARM_LONG
    {8, 8},  // PARM_LONGLONG
    {8, 8},  // PARM_DOUBLE
    {8, 8},  // PARM_LONGDOUBLE
    {1, 0},  // PARM_STRING
    {4, 20}, // PARM_RESOURCE_HANDLE
    {4, 4},  // PARM_FLOAT
    {1, 0},  // PARM_REST
    {4, 4},  // PARM_TRACE_ID
    {1, 0},  // unused codes
    {1, 0},  {1, 0},
};

constexpr parm_type_t base_type(parm_type_t type) {
    return type & PARM_BASE_MASK;
}

size_t string_length(trace_bytes bytes, size_t uLimit) {
    return strnlen(reinterpret_cast<const char*>(bytes.data()), std::min(bytes.size(), uLimit));
}

/// Bytes that a string takes with its NUL; without one, more than there are.
size_t packed_string_size(trace_bytes bytes) {
    return bytes.empty() ? 1 : string_length(bytes, bytes.size()) + 1;
}

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

// ------------------------------------------------------------------ writing

/// What writing one format needs.
struct format_run {
    const format_entry* pEntry;
    const parm_list* pList; ///< may be null
    int bAddr64;
    text_run out;

    bool is_missing(uint8_t parmNum) const {
        return !pList || parmNum >= pList->numParms;
    }
    const parm_ref& parm(uint8_t parmNum) const {
        return pList->pParms[parmNum];
    }
    /// The value of a '*', or 0 when there is none.
    int32_t star_value(uint8_t parmNum) const {
        return parmNum == NO_PARM ? 0 : load<int32_t>(parm(parmNum).bytes, 0);
    }
};

std::string_view parm_string(const parm_ref& parm) {
    if (parm.bytes.empty())
        return {};
    return {reinterpret_cast<const char*>(parm.bytes.data()),
            string_length(parm.bytes, parm.uStringLimit)};
}

void write_resource_handle(text_run& out, trace_bytes bytes) {
    write_hex(out, load<uint16_t>(bytes, 0), 4);
    out.add(' ');
    write_hex(out, load<uint16_t>(bytes, 2), 4);
    for (size_t uOffset = 4; uOffset < 20; uOffset += 4) {
        out.add(' ');
        write_hex(out, load<uint32_t>(bytes, uOffset), 8);
    }
}

/// Writes the string of the entry for the trace id in the same template file.
void write_format_of_trace_id(text_run& out, const template_file* pFile, int32_t iTraceId) {
    const format_entry* const pEntry = pFile ? find_newest_format(pFile, iTraceId) : nullptr;
    if (pEntry)
        out.add(std::string_view(pEntry->pString));
}

/// Writes a parameter that goes by the flags, width and precision.
void write_value(text_run& out, const conversion& conv, parm_type_t type, const parm_ref& parm,
                 int bAddr64) {
    const bool bUnsigned = type & PARM_UNSIGNED;
    uint64_t uInteger = 0;
    int iBits = conv.bShort ? 16 : 32;
    switch (base_type(type)) {
    case PARM_CHAR:
        uInteger = load<uint8_t>(parm.bytes, 0);
        break;
    case PARM_SHORT: {
        const auto uShort = load<uint16_t>(parm.bytes, 0);
        uInteger = bUnsigned ? uShort : static_cast<uint64_t>(static_cast<int16_t>(uShort));
        break;
    }
    case PARM_INT:
        uInteger = load<uint32_t>(parm.bytes, 0);
        break;
    case PARM_LONG:
        iBits = 64;
        if (bAddr64)
            uInteger = load<uint64_t>(parm.bytes, 0);
        else if (bUnsigned)
            uInteger = load<uint32_t>(parm.bytes, 0);
        else
            uInteger = static_cast<uint64_t>(load<int32_t>(parm.bytes, 0));
        break;
    case PARM_LONGLONG:
        iBits = 64;
        uInteger = load<uint64_t>(parm.bytes, 0);
        break;
    case PARM_DOUBLE:
    case PARM_LONGDOUBLE:
        write_real(out, conv, load<double>(parm.bytes, 0));
        return;
    case PARM_FLOAT:
        write_real(out, conv, static_cast<double>(load<float>(parm.bytes, 0)));
        return;
    case PARM_STRING:
        if (conv.iRebuiltLength == 2) // "%s" alone is written without limit
            out.add(parm_string(parm));
        else
            write_string(out, conv, parm_string(parm));
        return;
    default:
        return;
    }
    if (conv.letter == 'c') {
        const char ch = static_cast<char>(uInteger);
        write_string(out, conv, {&ch, 1});
    } else {
        write_integer(out, conv, uInteger, iBits);
    }
}

void write_conversion(format_run& run, const conv_spec& place, format_piece& piece) {
    const format_entry& entry = *run.pEntry;
    const parm_type_t type = entry.pParmTypes[place.parmNum];
    const std::string_view text(entry.pString + place.offset, place.lenConv);

    if (run.is_missing(place.parmNum) ||
        (place.widthParmNum != NO_PARM && run.is_missing(place.widthParmNum)) ||
        (place.precParmNum != NO_PARM && run.is_missing(place.precParmNum))) {
        if (base_type(type) != PARM_REST)
            run.out.add(text);
        return;
    }
    const parm_ref& parm = run.parm(place.parmNum);
    const bool bNumbered = entry.properties & FORMAT_NUMBERED_PARMS;
    if (piece.uDirect == DIRECT_UNKNOWN) {
        if (place.widthParmNum == NO_PARM && place.precParmNum == NO_PARM)
            choose_direct_writer(&piece, parse_conversion(text, bNumbered, type, 0, 0), type);
        else
            piece.uDirect = DIRECT_NONE;
    }
    if (piece.uDirect != DIRECT_NONE) {
        if (piece.uDirect == DIRECT_STRING)
            run.out.add(parm_string(parm));
        else
            write_direct(run.out, piece, type, parm.bytes, run.bAddr64);
        return;
    }
    // These go by no conversion of printf's, whatever stands in the text.
    switch (base_type(type)) {
    case PARM_RESOURCE_HANDLE:
        write_resource_handle(run.out, parm.bytes);
        return;
    case PARM_TRACE_ID:
        write_format_of_trace_id(run.out, entry.pFile, load<int32_t>(parm.bytes, 0));
        return;
    case PARM_REST:
        return;
    default:
        break;
    }

    const conversion conv =
        parse_conversion(text, bNumbered, type, run.star_value(place.widthParmNum),
                         run.star_value(place.precParmNum));
    if (conv.iRebuiltLength > MAX_REBUILT_CONVERSION || !conversion_fits(conv.letter, type))
        run.out.add(text);
    else
        write_value(run.out, conv, type, parm, run.bAddr64);
}

} // namespace

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
    const trace_bytes run = *pRun;
    const int numParms = parms_of(pFormatEntry);
    size_t uUsed = 0;
    int i = 0;
    for (; i < numParms; i++) {
        const parm_type_t base = base_type(pFormatEntry->pParmTypes[i]);
        const bool bShortLong = base == PARM_LONG && !bAddr64;
        const packed_shape& shape = bShortLong ? packedShapes[PARM_INT] : packedShapes[base];
        const size_t uMask = shape.uAlignment - size_t{1};
        const size_t uStart = (uUsed + uMask) & ~uMask;
        const trace_bytes rest = load_run(run, uStart);
        size_t uSize = shape.uSize;
        if (base == PARM_STRING)
            uSize = packed_string_size(rest);
        else if (base == PARM_REST)
            uSize = rest.size();
        if (!lies_inside(run, uStart, uSize))
            break;
        pList->pParms[i] = {.bytes = rest, .uStringLimit = static_cast<uint32_t>(uSize)};
        uUsed = uStart + uSize;
    }
    pList->numParms = i;
    *pRun = load_run(run, uUsed);
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
        pList->pParms[i] = {.bytes = bytes, .uStringLimit = static_cast<uint32_t>(data.size())};
    }
    pList->numParms = i;
}

void format_parms(const format_entry* pFormatEntry, const parm_list* pList, int bAddr64) {
    format_run run{.pEntry = pFormatEntry, .pList = pList, .bAddr64 = bAddr64, .out = {}};
    format_piece* pPiece = pFormatEntry->pPieces;
    for (const conv_spec& place :
         std::span(pFormatEntry->pConvSpecs, static_cast<size_t>(pFormatEntry->numConvs))) {
        run.out.add(std::string_view(pPiece->pText, pPiece->uLength));
        write_conversion(run, place, *pPiece);
        ++pPiece;
    }
    run.out.add(std::string_view(pPiece->pText, pPiece->uLength));
    run.out.add('\n');
}
