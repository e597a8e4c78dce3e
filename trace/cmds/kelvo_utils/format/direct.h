// The way of the usual conversions: numbers and characters with at most a width and
// zeros to fill it, which the plan of a format names from WRITE_SIGNED on. They give
// the same text as the long way by field.h. Main thread only.
#pragma once

#include "format_plan.h"
#include "trace_load.h"

/// The value at `uOffset` in 64 bits, with its sign or without as its shape says.
inline uint64_t load_integer(uint8_t uShape, trace_bytes bytes, size_t uOffset) {
    switch (uShape) {
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

/// Writes the number or character at `pOut`, where direct_room is; returns the position
/// after it.
[[gnu::always_inline]] inline char* put_direct(char* pOut, const format_piece& piece,
                                               uint64_t uValue) {
    if (piece.writer == WRITE_CHAR) {
        *pOut = static_cast<char>(uValue);
        return pOut + 1;
    }
    if (piece.writer == WRITE_HEX) {
        const int iDigits = count_hex_digits(uValue);
        if (piece.uWidth > iDigits)
            pOut = put_before_digits(pOut, piece, false, iDigits);
        return put_hex_digits(pOut, uValue, iDigits);
    }
    const bool bNegative = piece.writer == WRITE_SIGNED && static_cast<int64_t>(uValue) < 0;
    if (bNegative)
        uValue = -uValue;
    if (bNegative || piece.uWidth > 1)
        pOut = put_before_digits(pOut, piece, bNegative, count_decimal_digits(uValue));
    return put_decimal(pOut, uValue);
}

/// Writes the leading numbers of a format, with the text before each, in one go: they
/// are most of what is written at all. Returns how many conversions are done with
/// that, and stores how many bytes of `run` they took: both 0, and nothing written,
/// where the run is too short for all of them.
size_t write_leading_numbers(const format_plan& plan, trace_bytes run, int bAddr64, size_t* puUsed);
