#include "format_plan.h"

#include "sink.h"

#include <cstring>

namespace {

constexpr int MAX_DIRECT_WIDTH = 32;
static_assert(MAX_DIRECT_WIDTH <= UINT8_MAX); // kept as uWidth

/// The writer of a number, when the conversion says of its sign and size what the type
/// says: with numbered parameters it may not.
piece_writer writer_of_integer(const conversion& conv, parm_type_t type) {
    const bool bUnsigned = type & PARM_UNSIGNED;
    const parm_type_t base = base_type(type);
    if (base == PARM_CHAR || conv.uBits != (base == PARM_SHORT ? 16 : base == PARM_INT ? 32 : 64))
        return WRITE_FIELD;
    switch (conv.letter) {
    case 'd':
    case 'i':
        return bUnsigned ? WRITE_FIELD : WRITE_SIGNED;
    case 'u':
        return bUnsigned ? WRITE_UNSIGNED : WRITE_FIELD;
    case 'x':
        return bUnsigned ? WRITE_HEX : WRITE_FIELD;
    default:
        return WRITE_FIELD;
    }
}

piece_writer writer_of(const conversion& conv, parm_type_t type, bool bStars) {
    const parm_type_t base = base_type(type);
    // These go by no conversion of printf's, whatever stands in the text.
    if (base == PARM_REST)
        return WRITE_NOTHING;
    if (base == PARM_RESOURCE_HANDLE)
        return WRITE_HANDLE;
    if (base == PARM_TRACE_ID)
        return WRITE_TRACE_ID;

    if (conv.iRebuiltLength > MAX_REBUILT_CONVERSION ||
        (conv.argument & PARM_ROWS[true][base].arguments) == 0)
        return WRITE_OWN_TEXT;
    if (bStars || conv.iPrecision >= 0 || conv.iWidth > MAX_DIRECT_WIDTH ||
        (conv.uFlags & ~CONVERSION_ZERO) != 0)
        return WRITE_FIELD;
    if (conv.argument == ARGUMENT_INTEGER)
        return writer_of_integer(conv, type);
    const bool bBare = conv.iRebuiltLength == 2;
    if (bBare && base == PARM_STRING)
        return WRITE_STRING;
    return bBare && base == PARM_CHAR ? WRITE_CHAR : WRITE_FIELD;
}

void choose_writer(const format_entry& entry, int iConv) {
    const conversion& conv = entry.pPlan->pConversions[iConv];
    const conv_spec& place = entry.pConvSpecs[iConv];
    const parm_type_t type = entry.pParmTypes[place.parmNum];
    format_piece& piece = entry.pPlan->pPieces[iConv];
    piece.writer =
        writer_of(conv, type, place.widthParmNum != NO_PARM || place.precParmNum != NO_PARM);
    if (piece.writer < WRITE_SIGNED)
        return;
    piece.uWidth = static_cast<uint8_t>(conv.iWidth);
    piece.bZeros = conv.uFlags & CONVERSION_ZERO;
    for (const bool bAddr64 : {false, true})
        piece.uShape[bAddr64] = shape_of_integer(type, bAddr64);
}

/// Copies literal text to `pOut`, a pair of percent signs as one; returns the end.
char* copy_literal(char* pOut, std::string_view text) {
    for (size_t i = 0; i < text.size(); ++i) {
        *pOut++ = text[i];
        if (text[i] == '%')
            ++i;
    }
    return pOut;
}

bool uses_parms_in_order(const format_entry& entry) {
    for (int i = 0; i < entry.numConvs; ++i) {
        const conv_spec& place = entry.pConvSpecs[i];
        if (place.parmNum != i || place.widthParmNum != NO_PARM || place.precParmNum != NO_PARM)
            return false;
    }
    return entry.numConvs == entry.numParms;
}

/// Bytes that the text before a number and the number are written with, at most.
size_t room_for(const format_piece& piece) {
    return std::max<size_t>(piece.uLength, PADDED_TEXT) + direct_room(piece);
}

/// Notes where the parameter lies. Returns the end of the last one.
size_t place_parm(format_piece& piece, parm_type_t type, bool bAddr64, size_t uEnd) {
    const parm_row& row = PARM_ROWS[bAddr64][base_type(type)];
    const size_t uStart = align_parm(uEnd, row);
    piece.uOffset[bAddr64] = static_cast<uint16_t>(uStart);
    return uStart + row.uSize;
}

/// Whether the conversion and the text before it can be written in one go.
bool is_plain(const format_piece& piece, bool bFirst) {
    const std::string_view text(piece.pText, piece.uLength);
    return piece.writer >= WRITE_SIGNED && piece.writer != WRITE_CHAR && // could be a newline
           text.find('\n') == text.npos && !(bFirst && !text.empty() && is_marker(text.front()));
}

leading_numbers find_leading_numbers(const format_entry& entry) {
    leading_numbers found{};
    size_t uRoom = 0;
    for (; found.uCount < entry.numConvs; ++found.uCount) {
        format_piece& piece = entry.pPlan->pPieces[found.uCount];
        uRoom += room_for(piece);
        if (uRoom > LEADING_ROOM || !is_plain(piece, found.uCount == 0))
            break;
        for (const bool bAddr64 : {false, true})
            found.uEnd[bAddr64] = static_cast<uint16_t>(
                place_parm(piece, entry.pParmTypes[found.uCount], bAddr64, found.uEnd[bAddr64]));
    }
    const format_piece& next = entry.pPlan->pPieces[found.uCount];
    found.bTakesRest = found.uCount != 0 && found.uCount < entry.numConvs &&
                       next.writer == WRITE_NOTHING && next.uLength == 0;
    return found;
}

} // namespace

void lay_out_plan(const format_entry& entry, char* pText) {
    const char* pCursor = entry.pString;
    for (int i = 0; i <= entry.numConvs; ++i) {
        const bool bLast = i == entry.numConvs;
        const char* const pEnd =
            bLast ? pCursor + std::strlen(pCursor) : entry.pString + entry.pConvSpecs[i].offset;
        std::string_view literal(pCursor, static_cast<size_t>(pEnd - pCursor));
        if (bLast && literal.ends_with('\n'))
            literal.remove_suffix(1); // every text is ended with a newline of its own
        char* const pTextEnd = copy_literal(pText, literal);
        format_piece& piece = entry.pPlan->pPieces[i] = format_piece{};
        piece.pText = pText;
        piece.uLength = static_cast<uint32_t>(pTextEnd - pText);
        pText = pTextEnd;
        if (bLast)
            break;
        choose_writer(entry, i);
        pCursor = pEnd + entry.pConvSpecs[i].lenConv;
    }
    entry.pPlan->bParmsInOrder = uses_parms_in_order(entry);
    if (entry.pPlan->bParmsInOrder)
        entry.pPlan->leading = find_leading_numbers(entry);
}
