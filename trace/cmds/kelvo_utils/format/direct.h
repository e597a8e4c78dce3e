// The way of the usual conversions: a number, character or string with at most
// a width and zeros to fill it. Which conversions can go this way is found out
// once for each; they give the same text as the long way by conversion.h and
// field.h. Main thread only.
#pragma once

#include "conversion.h"
#include "digits.h"
#include "kelvo.h"
#include "parms.h"
#include "text_run.h"
#include "trace_load.h"

/// Settles how `conv`, which takes no width or precision from a parameter, is
/// written for a parameter of type `type`.
void choose_direct_writer(format_piece* pPiece, const conversion& conv, parm_type_t type);

/// The value in 64 bits, with its sign or without as its type says.
inline uint64_t load_integer(parm_type_t type, trace_bytes bytes, int bAddr64) {
    const bool bUnsigned = type & PARM_UNSIGNED;
    parm_type_t base = base_type(type);
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

/// Writes the sign and what fills up the width when `iDigits` digits follow.
char* put_before_digits(char* pOut, const format_piece& piece, bool bNegative, int iDigits);

/// Whether the piece's conversion is written by put_direct.
inline bool is_put_directly(const format_piece& piece) {
    return piece.uDirect >= DIRECT_SIGNED && piece.uDirect <= DIRECT_CHAR;
}

/// Writes a number or a character at `pOut`, where there is room for
/// text_run::MAX_ROOM; returns the position after it.
[[gnu::always_inline]] inline char* put_direct(char* pOut, const format_piece& piece,
                                               parm_type_t type, trace_bytes bytes, int bAddr64) {
    if (piece.uDirect == DIRECT_CHAR) {
        *pOut = load<char>(bytes, 0);
        return pOut + 1;
    }
    uint64_t uValue = load_integer(type, bytes, bAddr64);
    if (piece.uDirect == DIRECT_HEX) {
        const int iDigits = count_hex_digits(uValue);
        if (piece.uWidth > iDigits)
            pOut = put_before_digits(pOut, piece, false, iDigits);
        return put_hex_digits(pOut, uValue, iDigits);
    }
    const bool bNegative = piece.uDirect == DIRECT_SIGNED && static_cast<int64_t>(uValue) < 0;
    if (bNegative)
        uValue = -uValue;
    if (bNegative || piece.uWidth > 1)
        pOut = put_before_digits(pOut, piece, bNegative, count_decimal_digits(uValue));
    return put_decimal(pOut, uValue);
}
