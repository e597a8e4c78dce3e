// Numbers as text without a printf: each function writes at `pOut` and returns
// the position after what it wrote. Nothing is terminated.
#pragma once

#include <algorithm>
#include <array>
#include <bit>
#include <charconv>
#include <cstddef>
#include <cstdint>
#include <cstring>

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

/// All numbers of two decimal digits, one behind the other.
inline constexpr auto DIGIT_PAIRS = [] {
    std::array<char, 200> pairs{};
    for (size_t i = 0; i < 100; i++) {
        pairs[2 * i] = static_cast<char>('0' + i / 10);
        pairs[2 * i + 1] = static_cast<char>('0' + i % 10);
    }
    return pairs;
}();

/// `value`, below 1000000000, as exactly nine decimal digits.
inline char* put_nanoseconds(char* pOut, uint32_t value) {
    for (int i = 7; i > 0; i -= 2) {
        std::memcpy(pOut + i, &DIGIT_PAIRS[2 * (value % 100)], 2);
        value /= 100;
    }
    *pOut = static_cast<char>('0' + value);
    return pOut + 9;
}

/// `value` in hexadecimal, lower case, right-aligned with blanks in `width`.
inline char* put_hex(char* pOut, uint64_t value, int width) {
    const int digits = std::max(1, (static_cast<int>(std::bit_width(value)) + 3) / 4);
    for (; width > digits; width--)
        *pOut++ = ' ';
    for (int shift = 4 * (digits - 1); shift >= 0; shift -= 4)
        *pOut++ = "0123456789abcdef"[(value >> shift) & 0xF];
    return pOut;
}
