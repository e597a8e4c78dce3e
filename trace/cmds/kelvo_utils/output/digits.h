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

/// Decimal digits of `value`; 1 for 0.
inline int count_decimal_digits(uint64_t value) {
    constexpr auto POWERS = [] {
        std::array<uint64_t, 20> powers{};
        uint64_t power = 1;
        for (uint64_t& entry : powers) {
            entry = power;
            power *= 10;
        }
        powers[0] = 0; // 0 has a digit too
        return powers;
    }();
    const int guess = static_cast<int>(std::bit_width(value | 1)) * 1233 >> 12;
    return guess + (value >= POWERS[static_cast<size_t>(guess)]);
}

/// `value` as `digits` decimal digits, as many as count_decimal_digits says.
inline char* put_decimal(char* pOut, uint64_t value, int digits) {
    char* pDigit = pOut + digits;
    while (value >= 100) {
        pDigit -= 2;
        std::memcpy(pDigit, &DIGIT_PAIRS[2 * (value % 100)], 2);
        value /= 100;
    }
    if (value >= 10)
        std::memcpy(pOut, &DIGIT_PAIRS[2 * value], 2);
    else
        *pOut = static_cast<char>('0' + value);
    return pOut + digits;
}

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
