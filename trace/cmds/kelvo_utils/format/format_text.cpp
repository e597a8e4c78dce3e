// A format is literal text with conversions in between, whose places the
// compiler has noted. What it noted is trusted; the bytes of the record are
// not: every parameter is read through the bounds in its parm_ref.

#include "format_text.h"

#include "conversion.h"
#include "direct.h"
#include "field.h"
#include "leading_numbers.h"
#include "packed_parms.h"
#include "record_text.h"
#include "template_file.h"
#include "text_run.h"

#include <algorithm>
#include <cstring>
#include <span>

namespace {

/// What writing one format needs.
struct format_run {
    const format_entry* pEntry;
    const parm_list* pList; ///< for the values of '*'; may be null
    int bAddr64;
    text_run& out; ///< not a part of this: setting up this one would clear its text

    /// Whether the conversion has all its parameters.
    bool has_parms(const conv_spec& place) const {
        return has_parm(place.parmNum) &&
               (place.widthParmNum == NO_PARM || has_parm(place.widthParmNum)) &&
               (place.precParmNum == NO_PARM || has_parm(place.precParmNum));
    }
    bool has_parm(uint8_t parmNum) const {
        return pList && parmNum < pList->numParms;
    }
    /// The value of a '*', or 0 when there is none.
    int32_t star_value(uint8_t parmNum) const {
        return parmNum == NO_PARM ? 0 : load<int32_t>(pList->pParms[parmNum].bytes, 0);
    }
    std::string_view text_of(const conv_spec& place) const {
        return {pEntry->pString + place.offset, place.lenConv};
    }
};

std::string_view literal(const format_piece& piece) {
    return {piece.pText, piece.uLength};
}

std::string_view parm_string(const parm_ref& parm) {
    if (parm.bytes.empty())
        return {};
    return {reinterpret_cast<const char*>(parm.bytes.data()),
            strnlen(reinterpret_cast<const char*>(parm.bytes.data()),
                    std::min<size_t>(parm.bytes.size(), parm.uStringLimit))};
}

void write_resource_handle(text_run& out, trace_bytes bytes) {
    put_hex(out, load<uint16_t>(bytes, 0), 4);
    out.add(' ');
    put_hex(out, load<uint16_t>(bytes, 2), 4);
    for (size_t uOffset = 4; uOffset < 20; uOffset += 4) {
        out.add(' ');
        put_hex(out, load<uint32_t>(bytes, uOffset), 8);
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
        if (bUnsigned)
            uInteger = load<uint32_t>(parm.bytes, 0);
        else
            uInteger = static_cast<uint64_t>(load<int32_t>(parm.bytes, 0));
        break;
    case PARM_LONG:
        if (bAddr64)
            uInteger = load<uint64_t>(parm.bytes, 0);
        else if (bUnsigned)
            uInteger = load<uint32_t>(parm.bytes, 0);
        else
            uInteger = static_cast<uint64_t>(load<int32_t>(parm.bytes, 0));
        break;
    case PARM_LONGLONG:
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
        write_integer(out, conv, uInteger);
    }
}

/// Writes the conversion whose parameter is missing: as it stands in the format.
void write_without_parm(format_run& run, const conv_spec& place) {
    if (base_type(run.pEntry->pParmTypes[place.parmNum]) != PARM_REST)
        run.out.add(run.text_of(place));
}

/// The way of the conversions that are not written directly.
void write_by_text(format_run& run, const conv_spec& place, const parm_ref& parm) {
    const format_entry& entry = *run.pEntry;
    const parm_type_t type = entry.pParmTypes[place.parmNum];
    // These go by no conversion of printf's, whatever stands in the text.
    switch (base_type(type)) {
    case PARM_RESOURCE_HANDLE:
        write_resource_handle(run.out, parm.bytes);
        return;
    case PARM_TRACE_ID:
        write_format_of_trace_id(run.out, entry.pFile, load<int32_t>(parm.bytes, 0));
        return;
    case PARM_REST: // here when it has a '*'
        return;
    default:
        break;
    }

    const std::string_view text = run.text_of(place);
    const conversion conv =
        parse_conversion(text, entry.properties & FORMAT_NUMBERED_PARMS,
                         run.star_value(place.widthParmNum), run.star_value(place.precParmNum));
    if (conv.iRebuiltLength > MAX_REBUILT_CONVERSION || !conversion_fits(conv.letter, type))
        run.out.add(text);
    else
        write_value(run.out, conv, type, parm, run.bAddr64);
}

/// Writes the entry's conversion number `uConv`.
void write_conversion(format_run& run, size_t uConv, const parm_ref& parm) {
    const format_piece& piece = run.pEntry->pPieces[uConv];
    const conv_spec& place = run.pEntry->pConvSpecs[uConv];
    if (piece.uDirect == DIRECT_UNKNOWN) [[unlikely]]
        settle_direct_writer(*run.pEntry, uConv);
    switch (piece.uDirect) {
    case DIRECT_NONE:
        write_by_text(run, place, parm);
        break;
    case DIRECT_NOTHING:
        break;
    case DIRECT_STRING:
        run.out.add(parm_string(parm));
        break;
    default:
        run.out.end_room(put_direct(
            run.out.begin_room(direct_room(piece)), piece,
            load_integer(shape_of_integer(run.pEntry->pParmTypes[place.parmNum], run.bAddr64),
                         parm.bytes, 0)));
    }
}

std::span<const conv_spec> conversions(const format_entry& entry) {
    return {entry.pConvSpecs, static_cast<size_t>(entry.numConvs)};
}

void end_text(format_run& run, const format_piece& last) {
    run.out.add_padded(literal(last));
    run.out.add('\n');
}

/// A format that uses its parameters in their order, each once: they are found
/// and written one by one.
void write_in_order(const format_entry& entry, trace_bytes* pRun, int bAddr64) {
    size_t uUsed = 0;
    size_t uConv = write_leading_numbers(entry, *pRun, bAddr64, &uUsed);
    if (uConv != 0 && uConv == conversions(entry).size()) { // most often that was all
        output_text(literal(entry.pPieces[uConv]));
        output_char('\n');
        *pRun = load_run(*pRun, uUsed);
        return;
    }
    text_run out;
    format_run run{.pEntry = &entry, .pList = nullptr, .bAddr64 = bAddr64, .out = out};
    packed_parms packed(*pRun, bAddr64, uUsed);
    bool bMissing = false;
    for (const conv_spec& place : conversions(entry).subspan(uConv)) {
        out.add_padded(literal(entry.pPieces[uConv]));
        parm_ref parm;
        bMissing = bMissing || !packed.take(entry.pParmTypes[place.parmNum], &parm);
        if (bMissing)
            write_without_parm(run, place);
        else
            write_conversion(run, uConv, parm);
        ++uConv;
    }
    end_text(run, entry.pPieces[uConv]);
    *pRun = packed.rest();
}

} // namespace

void format_parms(const format_entry* pFormatEntry, const parm_list* pList, int bAddr64) {
    text_run out;
    format_run run{.pEntry = pFormatEntry, .pList = pList, .bAddr64 = bAddr64, .out = out};
    size_t uConv = 0;
    for (const conv_spec& place : conversions(*pFormatEntry)) {
        run.out.add_padded(literal(pFormatEntry->pPieces[uConv]));
        if (run.has_parms(place))
            write_conversion(run, uConv, pList->pParms[place.parmNum]);
        else
            write_without_parm(run, place);
        ++uConv;
    }
    end_text(run, pFormatEntry->pPieces[uConv]);
}

void format_packed_parms(const format_entry* pFormatEntry, trace_bytes* pRun, int bAddr64) {
    if (pFormatEntry->bParmsInOrder) {
        write_in_order(*pFormatEntry, pRun, bAddr64);
        return;
    }
    // Static, because setting up room for MAX_PARMS parameters anew would cost
    // more than most records need for the rest.
    static constinit parm_list parms{};
    bld_parm_list_packed(pFormatEntry, pRun, bAddr64, &parms);
    format_parms(pFormatEntry, &parms, bAddr64);
}
