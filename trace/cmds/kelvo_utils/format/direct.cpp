#include "direct.h"

#include "digits.h"

#include <bit>

namespace {

constexpr int MAX_DIRECT_WIDTH = 32;
static_assert(MAX_DIRECT_WIDTH + 1 <= static_cast<int>(text_run::MAX_ROOM));

bool is_integer(parm_type_t base) {
    return base == PARM_SHORT || base == PARM_INT || base == PARM_LONG || base == PARM_LONGLONG;
}

/// The writer of an integer, when the letter says of the sign what the type
/// says: with numbered parameters it may not.
direct_writer integer_writer(const conversion& conv, parm_type_t type) {
    const bool bUnsigned = type & PARM_UNSIGNED;
    const bool bShort = (type & PARM_BASE_MASK) == PARM_SHORT;
    if (conv.bShort != bShort)
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

/// The value in 64 bits, with its sign or without as its type says.
uint64_t load_integer(parm_type_t type, trace_bytes bytes, int bAddr64) {
    const bool bUnsigned = type & PARM_UNSIGNED;
    parm_type_t base = type & PARM_BASE_MASK;
    if (base == PARM_LONG)
        base = bAddr64 ? PARM_LONGLONG : PARM_INT;
    if (base == PARM_INT)
        return bUnsigned ? load<uint32_t>(bytes, 0)
                         : static_cast<uint64_t>(load<int32_t>(bytes, 0));
    if (base == PARM_SHORT)
        return bUnsigned ? load<uint16_t>(bytes, 0)
                         : static_cast<uint64_t>(load<int16_t>(bytes, 0));
    return load<uint64_t>(bytes, 0);
}

/// Writes a number of `iLength` characters, of which `pPut` makes those behind
/// the sign.
template <class put_digits> void write_padded(text_run& out, const format_piece& piece,
                                              bool bNegative, int iDigits, put_digits pPut) {
    char* pOut = out.begin_room(text_run::MAX_ROOM);
    int iMissing = piece.uWidth - iDigits - bNegative;
    if (!piece.bZeros)
        for (; iMissing > 0; --iMissing)
            *pOut++ = ' ';
    if (bNegative)
        *pOut++ = '-';
    for (; iMissing > 0; --iMissing)
        *pOut++ = '0';
    out.end_room(pPut(pOut));
}

} // namespace

void choose_direct_writer(format_piece* pPiece, const conversion& conv, parm_type_t type) {
    const bool bUsed =
        conv.iRebuiltLength <= MAX_REBUILT_CONVERSION && conversion_fits(conv.letter, type);
    pPiece->uDirect = bUsed ? find_direct_writer(conv, type) : DIRECT_NONE;
    if (pPiece->uDirect == DIRECT_NONE)
        return;
    pPiece->uWidth = static_cast<uint8_t>(conv.iWidth);
    pPiece->bZeros = conv.uFlags & CONVERSION_ZERO;
}

void write_direct(text_run& out, const format_piece& piece, parm_type_t type, trace_bytes bytes,
                  int bAddr64) {
    if (piece.uDirect == DIRECT_CHAR) {
        out.add(load<char>(bytes, 0));
        return;
    }
    uint64_t uValue = load_integer(type, bytes, bAddr64);
    if (piece.uDirect == DIRECT_HEX) {
        const int iDigits = std::max(1, (static_cast<int>(std::bit_width(uValue)) + 3) / 4);
        write_padded(out, piece, false, iDigits,
                     [=](char* pOut) { return put_hex(pOut, uValue, iDigits); });
        return;
    }
    const bool bNegative = piece.uDirect == DIRECT_SIGNED && static_cast<int64_t>(uValue) < 0;
    if (bNegative)
        uValue = -uValue;
    const int iDigits = count_decimal_digits(uValue);
    write_padded(out, piece, bNegative, iDigits,
                 [=](char* pOut) { return put_decimal(pOut, uValue, iDigits); });
}
