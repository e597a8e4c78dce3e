// Numbers as text without a printf: each function writes at `pOut` and returns
// the position after what it wrote. Nothing is terminated.
#pragma once

#include <algorithm>
#include <charconv>
#include <cstddef>
#include <cstdint>

/// Room that one call needs when its width is not above 20.
inline constexpr size_t DIGITS_ROOM = 20;

/// `value` in `base`, lower case, right-aligned in `width` (at most 20) with `pad`.
inline char* put_number(char* pOut, uint64_t value, int base, int width, char pad) {
    char digits[DIGITS_ROOM];
    const char* pEnd = std::to_chars(digits, digits + sizeof digits, value, base).ptr;
    const std::ptrdiff_t missing = width - (pEnd - digits);
    if (missing > 0)
        pOut = std::fill_n(pOut, missing, pad);
    return std::copy(static_cast<const char*>(digits), pEnd, pOut);
}

/// `value` as exactly eight hexadecimal digits.
inline char* put_hex8(char* pOut, uint32_t value) {
    for (int shift = 28; shift >= 0; shift -= 4)
        *pOut++ = "0123456789abcdef"[(value >> shift) & 0xF];
    return pOut;
}

/// `value`, below 1000000000, as exactly nine decimal digits.
inline char* put_nanoseconds(char* pOut, uint32_t value) {
    for (int i = 8; i >= 0; i--) {
        pOut[i] = static_cast<char>('0' + value % 10);
        value /= 10;
    }
    return pOut + 9;
}
