#include "direct.h"

#include <algorithm>

namespace {

constexpr int MAX_DIRECT_WIDTH = 32;
static_assert(MAX_DIRECT_WIDTH <= UINT8_MAX); // kept as uWidth

bool is_integer(parm_type_t base) {
    return base == PARM_SHORT || base == PARM_INT || base == PARM_LONG || base == PARM_LONGLONG;
}

/// The writer of an integer, when the conversion says of its sign and size what
/// the type says: with numbered parameters it may not.
direct_writer integer_writer(const conversion& conv, parm_type_t type) {
    const bool bUnsigned = type & PARM_UNSIGNED;
    const parm_type_t base = base_type(type);
    if (conv.uBits != (base == PARM_SHORT ? 16 : base == PARM_INT ? 32 : 64))
        return DIRECT_NONE;
    switch (conv.letter) {
    case 'd':
    case 'i':
        return bUnsigned ? DIRECT_NONE : DIRECT_SIGNED;
    case 'u':
        return bUnsigned ? DIRECT_UNSIGNED : DIRECT_NONE;
    case 'x':
        return bUnsigned ? DIRECT_HEX : DIRECT_NONE;
    default:
        return DIRECT_NONE;
    }
}

direct_writer find_direct_writer(const conversion& conv, parm_type_t type) {
    if (conv.iPrecision >= 0 || conv.iWidth > MAX_DIRECT_WIDTH ||
        (conv.uFlags & ~CONVERSION_ZERO) != 0)
        return DIRECT_NONE;
    const parm_type_t base = type & PARM_BASE_MASK;
    if (is_integer(base))
        return integer_writer(conv, type);
    const bool bBare = conv.iRebuiltLength == 2;
    if (bBare && base == PARM_CHAR && conv.letter == 'c')
        return DIRECT_CHAR;
    if (bBare && base == PARM_STRING && conv.letter == 's')
        return DIRECT_STRING;
    return DIRECT_NONE;
}

/// Settles how `conv` is written for a parameter of type `type`.
void choose_direct_writer(format_piece& piece, const conversion& conv, parm_type_t type) {
    if (base_type(type) == PARM_REST) {
        piece.uDirect = DIRECT_NOTHING;
        return;
    }
    const bool bUsed =
        conv.iRebuiltLength <= MAX_REBUILT_CONVERSION && conversion_fits(conv.letter, type);
    piece.uDirect = bUsed ? find_direct_writer(conv, type) : DIRECT_NONE;
    if (piece.uDirect == DIRECT_NONE)
        return;
    piece.uWidth = static_cast<uint8_t>(conv.iWidth);
    piece.bZeros = conv.uFlags & CONVERSION_ZERO;
}

} // namespace

void settle_direct_writer(const format_entry& entry, size_t uConv) {
    format_piece& piece = entry.pPieces[uConv];
    const conv_spec& place = entry.pConvSpecs[uConv];
    if (piece.uDirect != DIRECT_UNKNOWN)
        return;
    if (place.widthParmNum != NO_PARM || place.precParmNum != NO_PARM) {
        piece.uDirect = DIRECT_NONE;
        return;
    }
    const parm_type_t type = entry.pParmTypes[place.parmNum];
    const std::string_view text(entry.pString + place.offset, place.lenConv);
    choose_direct_writer(
        piece, parse_conversion(text, entry.properties & FORMAT_NUMBERED_PARMS, 0, 0), type);
}

char* put_before_digits(char* pOut, const format_piece& piece, bool bNegative, int iDigits) {
    const int iMissing = piece.uWidth - iDigits - bNegative;
    if (iMissing > 0 && !piece.bZeros)
        pOut = std::fill_n(pOut, iMissing, ' ');
    if (bNegative)
        *pOut++ = '-';
    if (iMissing > 0 && piece.bZeros)
        pOut = std::fill_n(pOut, iMissing, '0');
    return pOut;
}
