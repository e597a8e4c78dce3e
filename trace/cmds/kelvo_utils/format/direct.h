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

/// Settles how the entry's conversion number `uConv` is written, if it is not
/// settled yet.
void settle_direct_writer(const format_entry& entry, size_t uConv);

/// How an integer or a character lies in a record.
enum integer_shape : uint8_t {
    INTEGER_CHAR,
    INTEGER_SIGNED_16,
    INTEGER_UNSIGNED_16,
    INTEGER_SIGNED_32,
    INTEGER_UNSIGNED_32,
    INTEGER_64,
};

/// The shape of a parameter of an integer type or of PARM_CHAR.
inline integer_shape shape_of_integer(parm_type_t type, int bAddr64) {
    const bool bUnsigned = type & PARM_UNSIGNED;
    switch (base_type(type)) {
    case PARM_CHAR:
        return INTEGER_CHAR;
    case PARM_SHORT:
        return bUnsigned ? INTEGER_UNSIGNED_16 : INTEGER_SIGNED_16;
    case PARM_LONG:
        if (bAddr64)
            return INTEGER_64;
        [[fallthrough]];
    case PARM_INT:
        return bUnsigned ? INTEGER_UNSIGNED_32 : INTEGER_SIGNED_32;
    default:
        return INTEGER_64;
    }
}

/// The value at `uOffset` in 64 bits, with its sign or without as its shape says.
inline uint64_t load_integer(integer_shape shape, trace_bytes bytes, size_t uOffset) {
    switch (shape) {
    case INTEGER_CHAR:
        return load<uint8_t>(bytes, uOffset);
    case INTEGER_SIGNED_16:
        return static_cast<uint64_t>(load<int16_t>(bytes, uOffset));
    case INTEGER_UNSIGNED_16:
        return load<uint16_t>(bytes, uOffset);
    case INTEGER_SIGNED_32:
        return static_cast<uint64_t>(load<int32_t>(bytes, uOffset));
    case INTEGER_UNSIGNED_32:
        return load<uint32_t>(bytes, uOffset);
    default:
        return load<uint64_t>(bytes, uOffset);
    }
}

/// Writes the sign and what fills up the width when `iDigits` digits follow.
char* put_before_digits(char* pOut, const format_piece& piece, bool bNegative, int iDigits);

/// Whether the piece's conversion is written by put_direct.
inline bool is_put_directly(const format_piece& piece) {
    return piece.uDirect >= DIRECT_SIGNED && piece.uDirect <= DIRECT_CHAR;
}

/// Most bytes that put_direct writes: a sign, the digits in their width, and
/// what put_decimal writes behind them.
inline size_t direct_room(const format_piece& piece) {
    return 1 + std::max<size_t>(piece.uWidth, DIGITS_ROOM) + 7;
}

/// Writes the number or character at `pOut`; returns the position after it.
[[gnu::always_inline]] inline char* put_direct(char* pOut, const format_piece& piece,
                                               uint64_t uValue) {
    if (piece.uDirect == DIRECT_CHAR) {
        *pOut = static_cast<char>(uValue);
        return pOut + 1;
    }
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
