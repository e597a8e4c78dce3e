// Numbers as text without a printf: each put_ function writes at `pOut` and returns
// the position after what it wrote. Nothing is terminated.
#pragma once

#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

/// Whether `ch` is a decimal digit, in every locale.
constexpr bool is_digit(char ch) {
    return ch >= '0' && ch <= '9';
}

/// Most decimal digits of a number.
inline constexpr size_t DIGITS_ROOM = 20;

/// The eight hexadecimal digits of `value`, the first one in the lowest byte.
inline uint64_t hex_digits_of(uint32_t value) {
    // The nibbles are parted into bytes, from the lowest on.
    uint64_t digits = value;
    digits = (digits & 0xFFFF) | (digits & 0xFFFF0000) << 16;
    digits = (digits & 0x000000FF000000FF) | (digits & 0x0000FF000000FF00) << 8;
    digits = (digits & 0x000F000F000F000F) | (digits & 0x00F000F000F000F0) << 4;
    const uint64_t letters = (digits + 0x0606060606060606) >> 4 & 0x0101010101010101;
    digits += 0x3030303030303030 + letters * ('a' - '0' - 10);
    return __builtin_bswap64(digits);
}

/// Writes eight characters, the first one from the lowest byte.
inline void put_eight(char* pOut, uint64_t characters) {
    if constexpr (std::endian::native == std::endian::big)
        characters = __builtin_bswap64(characters);
    std::memcpy(pOut, &characters, sizeof characters);
}

/// `value` as exactly eight hexadecimal digits.
inline char* put_hex8(char* pOut, uint32_t value) {
    put_eight(pOut, hex_digits_of(value));
    return pOut + 8;
}

/// Hexadecimal digits of `value`; 1 for 0.
inline int count_hex_digits(uint64_t value) {
    return (static_cast<int>(std::bit_width(value | 1)) + 3) / 4;
}

/// The lowest `digits` (1 to 16) hexadecimal digits of `value`, lower case. Up to
/// seven bytes behind them are written, too.
inline char* put_hex_digits(char* pOut, uint64_t value, int digits) {
    if (digits > 8) {
        const auto high = static_cast<uint32_t>(value >> 32);
        put_eight(pOut, hex_digits_of(high) >> 8 * (16 - digits));
        pOut += digits - 8;
        digits = 8;
    }
    put_eight(pOut, hex_digits_of(static_cast<uint32_t>(value)) >> 8 * (8 - digits));
    return pOut + digits;
}

/// The first number of so many digits more than one: 0, 10, 100 and on; 0 has a
/// digit too.
inline constexpr auto FIRST_WITH_DIGITS = [] {
    std::array<uint64_t, 20> numbers{};
    for (size_t i = 1; i < numbers.size(); i++)
        numbers[i] = i == 1 ? 10 : numbers[i - 1] * 10;
    return numbers;
}();

/// Decimal digits of `value`; 1 for 0.
inline int count_decimal_digits(uint64_t value) {
    const int guess = static_cast<int>(std::bit_width(value | 1)) * 1233 >> 12;
    return guess + (value >= FIRST_WITH_DIGITS[static_cast<size_t>(guess)]);
}

/// The eight decimal digits of `value`, below 100000000, as numbers, the first
/// one in the lowest byte. Without a branch, since how many digits a number has
/// cannot be foreseen.
inline uint64_t decimal_digits_of(uint32_t value) {
    // Halves of four digits, then quarters of two, then digits, all side by side;
    // the multiplications divide by 100 and by 10.
    const uint64_t halves = value / 10000 | uint64_t{value % 10000} << 32;
    const uint64_t hundreds = halves * 10486 >> 20 & 0x0000007F0000007F;
    const uint64_t pairs = hundreds | (halves - 100 * hundreds) << 16;
    const uint64_t tens = pairs * 103 >> 10 & 0x000F000F000F000F;
    return tens | (pairs - 10 * tens) << 8;
}

inline constexpr uint64_t ZERO_CHARACTERS = 0x3030303030303030;
inline constexpr uint32_t EIGHT_DIGITS = 100'000'000; ///< first number with more

/// `value`, below EIGHT_DIGITS, as exactly eight decimal digits.
inline char* put_eight_digits(char* pOut, uint32_t value) {
    put_eight(pOut, decimal_digits_of(value) + ZERO_CHARACTERS);
    return pOut + 8;
}

/// `value` in decimal. Up to seven bytes behind it are written, too.
inline char* put_decimal(char* pOut, uint64_t value) {
    if (value >= EIGHT_DIGITS) [[unlikely]] {
        const uint64_t high = value / EIGHT_DIGITS;
        const auto low = static_cast<uint32_t>(value % EIGHT_DIGITS);
        return put_eight_digits(put_decimal(pOut, high), low);
    }
    const uint64_t digits = decimal_digits_of(static_cast<uint32_t>(value));
    const int zeros = std::countr_zero(digits | uint64_t{1} << 56) / 8; // leading ones, at most 7
    put_eight(pOut, (digits + ZERO_CHARACTERS) >> 8 * zeros);
    return pOut + 8 - zeros;
}

/// `value`, below 1000000000, as exactly nine decimal digits.
inline char* put_nanoseconds(char* pOut, uint32_t value) {
    *pOut = static_cast<char>('0' + value / EIGHT_DIGITS);
    return put_eight_digits(pOut + 1, value % EIGHT_DIGITS);
}
