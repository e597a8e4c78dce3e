// A format is literal text with conversions in between, whose places the
// compiler has noted. What it noted is trusted; the bytes of the record are
// not: every parameter is read through the bounds in its parm_ref.

#include "format_text.h"

#include "direct.h"
#include "field.h"
#include "packed_parms.h"
#include "record_text.h"
#include "template_file.h"
#include "text_run.h"

#include <cstdlib>
#include <span>

namespace {

/// What writing one format needs.
struct format_run {
    const format_entry* pEntry;
    const parm_list* pList; ///< for the values of '*'; null where the format has none
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
    int32_t star_value(uint8_t parmNum) const {
        return pList ? load<int32_t>(pList->pParms[parmNum].bytes(), 0) : 0;
    }
    std::string_view text_of(const conv_spec& place) const {
        return {pEntry->pString + place.offset, place.lenConv};
    }
};

std::string_view literal(const format_piece& piece) {
    return {piece.pText, piece.uLength};
}

void write_resource_handle(text_run& out, trace_bytes bytes) {
    add_hex(out, load<uint16_t>(bytes, 0), 4);
    out.add(' ');
    add_hex(out, load<uint16_t>(bytes, 2), 4);
    for (size_t uOffset = 4; uOffset < 20; uOffset += 4) {
        out.add(' ');
        add_hex(out, load<uint32_t>(bytes, uOffset), 8);
    }
}

/// Writes the string of the entry for the trace id in the same template file.
void write_format_of_trace_id(text_run& out, const template_file* pFile, int32_t iTraceId) {
    const format_entry* const pEntry = pFile ? find_newest_format(pFile, iTraceId) : nullptr;
    if (pEntry)
        out.add(std::string_view(pEntry->pString));
}

/// Writes the conversion whose parameter is missing: as it stands in the format.
void write_without_parm(const format_run& run, const conv_spec& place) {
    if (base_type(run.pEntry->pParmTypes[place.parmNum]) != PARM_REST)
        run.out.add(run.text_of(place));
}

/// Characters of the number as printf's "%d".
int decimal_length(int32_t iValue) {
    return count_decimal_digits(static_cast<uint64_t>(std::abs(int64_t{iValue}))) + (iValue < 0);
}

/// Puts the values of a '*' width and a '*' precision into the conversion: a negative
/// width is the flag "-" and its magnitude, a negative precision none.
void put_in_stars(conversion& conv, const format_run& run, const conv_spec& place) {
    if (place.widthParmNum != NO_PARM) {
        const int32_t iWidth = run.star_value(place.widthParmNum);
        conv.iRebuiltLength += decimal_length(iWidth);
        conv.iWidth = std::abs(int64_t{iWidth});
        if (iWidth < 0)
            conv.uFlags |= CONVERSION_LEFT;
    }
    if (place.precParmNum != NO_PARM) {
        const int32_t iPrecision = run.star_value(place.precParmNum);
        if (iPrecision < 0)
            return;
        conv.iRebuiltLength += 1 + decimal_length(iPrecision);
        conv.iPrecision = iPrecision;
    }
}

/// Writes a parameter by flags, width and precision.
void write_field(const format_run& run, size_t uConv, const parm_ref& parm) {
    const conv_spec& place = run.pEntry->pConvSpecs[uConv];
    conversion conv = run.pEntry->pPlan->pConversions[uConv];
    put_in_stars(conv, run, place);
    if (conv.iRebuiltLength > MAX_REBUILT_CONVERSION) {
        run.out.add(run.text_of(place));
        return;
    }
    const parm_value value = decode_parm(run.pEntry->pParmTypes[place.parmNum], parm, run.bAddr64);
    if (value.kind == VALUE_REAL) {
        write_real(run.out, conv, value.real);
    } else if (value.kind == VALUE_STRING) {
        if (conv.iRebuiltLength == 2) // "%s" alone is written without limit
            run.out.add(value.string);
        else
            write_string(run.out, conv, value.string);
    } else if (conv.letter == 'c') {
        const char ch = static_cast<char>(value.uInteger);
        write_string(run.out, conv, {&ch, 1});
    } else {
        write_integer(run.out, conv, value.uInteger);
    }
}

/// Writes the entry's conversion number `uConv`.
void write_conversion(const format_run& run, size_t uConv, const parm_ref& parm) {
    const format_piece& piece = run.pEntry->pPlan->pPieces[uConv];
    switch (piece.writer) {
    case WRITE_OWN_TEXT:
        run.out.add(run.text_of(run.pEntry->pConvSpecs[uConv]));
        break;
    case WRITE_NOTHING:
        break;
    case WRITE_HANDLE:
        write_resource_handle(run.out, parm.bytes());
        break;
    case WRITE_TRACE_ID:
        write_format_of_trace_id(run.out, run.pEntry->pFile, load<int32_t>(parm.bytes(), 0));
        break;
    case WRITE_FIELD:
        write_field(run, uConv, parm);
        break;
    case WRITE_STRING:
        run.out.add(parm_string(parm));
        break;
    default:
        run.out.end_room(put_direct(run.out.begin_room(direct_room(piece)), piece,
                                    load_integer(piece.uShape[run.bAddr64 != 0], parm.bytes(), 0)));
    }
}

std::span<const conv_spec> conversions(const format_entry& entry) {
    return {entry.pConvSpecs, static_cast<size_t>(entry.numConvs)};
}

void end_text(const format_run& run, const format_piece& last) {
    run.out.add_padded(literal(last));
    run.out.add('\n');
}

/// A format that uses its parameters in their order, each once: they are found
/// and written one by one.
void write_in_order(const format_entry& entry, trace_bytes* pRun, int bAddr64) {
    size_t uUsed = 0;
    size_t uConv = write_leading_numbers(*entry.pPlan, *pRun, bAddr64, &uUsed);
    if (uConv != 0 && uConv == conversions(entry).size()) { // most often that was all
        output_text(literal(entry.pPlan->pPieces[uConv]));
        output_char('\n');
        *pRun = load_run(*pRun, uUsed);
        return;
    }
    text_run out;
    const format_run run{.pEntry = &entry, .pList = nullptr, .bAddr64 = bAddr64, .out = out};
    packed_parms packed(*pRun, bAddr64, uUsed);
    bool bMissing = false;
    for (const conv_spec& place : conversions(entry).subspan(uConv)) {
        out.add_padded(literal(entry.pPlan->pPieces[uConv]));
        parm_ref parm;
        bMissing = bMissing || !packed.take(entry.pParmTypes[place.parmNum], &parm);
        if (bMissing)
            write_without_parm(run, place);
        else
            write_conversion(run, uConv, parm);
        ++uConv;
    }
    end_text(run, entry.pPlan->pPieces[uConv]);
    *pRun = packed.rest();
}

} // namespace

void format_parms(const format_entry* pFormatEntry, const parm_list* pList, int bAddr64) {
    text_run out;
    const format_run run{.pEntry = pFormatEntry, .pList = pList, .bAddr64 = bAddr64, .out = out};
    size_t uConv = 0;
    for (const conv_spec& place : conversions(*pFormatEntry)) {
        run.out.add_padded(literal(pFormatEntry->pPlan->pPieces[uConv]));
        if (run.has_parms(place))
            write_conversion(run, uConv, pList->pParms[place.parmNum]);
        else
            write_without_parm(run, place);
        ++uConv;
    }
    end_text(run, pFormatEntry->pPlan->pPieces[uConv]);
}

void format_packed_parms(const format_entry* pFormatEntry, trace_bytes* pRun, int bAddr64) {
    if (pFormatEntry->pPlan->bParmsInOrder) {
        write_in_order(*pFormatEntry, pRun, bAddr64);
        return;
    }
    parm_list parms;
    bld_parm_list_packed(pFormatEntry, pRun, bAddr64, &parms);
    format_parms(pFormatEntry, &parms, bAddr64);
}
