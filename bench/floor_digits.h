// Numbers as text, two digits at a time. Each function writes at `pOut` and
// returns the position after what it wrote.
#pragma once

#include <array>
#include <bit>
#include <cstdint>
#include <cstring>

namespace floor_tables {

constexpr auto DECIMAL_PAIRS = [] {
    std::array<char, 200> pairs{};
    for (size_t i = 0; i < 100; ++i) {
        pairs[2 * i] = static_cast<char>('0' + i / 10);
        pairs[2 * i + 1] = static_cast<char>('0' + i % 10);
    }
    return pairs;
}();

constexpr auto HEX_PAIRS = [] {
    std::array<char, 512> pairs{};
    for (size_t i = 0; i < 256; ++i) {
        pairs[2 * i] = "0123456789abcdef"[i >> 4];
        pairs[2 * i + 1] = "0123456789abcdef"[i & 15];
    }
    return pairs;
}();

} // namespace floor_tables

/// The number from 0 to 99 as two digits.
inline char* put_pair(char* pOut, uint32_t uValue) {
    std::memcpy(pOut, &floor_tables::DECIMAL_PAIRS[2 * uValue], 2);
    return pOut + 2;
}

/// The number from 0 to 9999 as four digits.
inline char* put_four(char* pOut, uint32_t uValue) {
    return put_pair(put_pair(pOut, uValue / 100), uValue % 100);
}

/// The number from 0 to 99999999 as eight digits.
inline char* put_eight(char* pOut, uint32_t uValue) {
    return put_four(put_four(pOut, uValue / 10'000), uValue % 10'000);
}

/// The number from 0 to 9999 without leading zeros.
inline char* put_up_to_four(char* pOut, uint32_t uValue) {
    if (uValue >= 1000)
        return put_four(pOut, uValue);
    if (uValue >= 100) {
        *pOut = static_cast<char>('0' + uValue / 100);
        return put_pair(pOut + 1, uValue % 100);
    }
    if (uValue >= 10)
        return put_pair(pOut, uValue);
    *pOut = static_cast<char>('0' + uValue);
    return pOut + 1;
}

inline char* put_decimal(char* pOut, uint32_t uValue) {
    if (uValue < 10'000)
        return put_up_to_four(pOut, uValue);
    if (uValue < 100'000'000)
        return put_four(put_up_to_four(pOut, uValue / 10'000), uValue % 10'000);
    return put_eight(put_up_to_four(pOut, uValue / 100'000'000), uValue % 100'000'000);
}

inline char* put_signed(char* pOut, uint32_t uValue) {
    if (static_cast<int32_t>(uValue) < 0) {
        *pOut++ = '-';
        uValue = -uValue;
    }
    return put_decimal(pOut, uValue);
}

/// Exactly nine digits.
inline char* put_nine(char* pOut, uint32_t uValue) {
    *pOut = static_cast<char>('0' + uValue / 100'000'000);
    return put_eight(pOut + 1, uValue % 100'000'000);
}

inline char* put_hex_pair(char* pOut, uint8_t uValue) {
    std::memcpy(pOut, &floor_tables::HEX_PAIRS[2 * size_t{uValue}], 2);
    return pOut + 2;
}

/// Exactly eight digits.
inline char* put_hex_eight(char* pOut, uint32_t uValue) {
    for (int iShift = 24; iShift >= 0; iShift -= 8)
        pOut = put_hex_pair(pOut, static_cast<uint8_t>(uValue >> iShift));
    return pOut;
}

/// At least three columns.
inline char* put_hex_right(char* pOut, uint32_t uValue) {
    const int iDigits = (std::bit_width(uValue | 1) + 3) / 4;
    for (int i = iDigits; i < 3; ++i)
        *pOut++ = ' ';
    for (int iShift = 4 * (iDigits - 1); iShift >= 0; iShift -= 4)
        *pOut++ = "0123456789abcdef"[uValue >> iShift & 15];
    return pOut;
}
