// A field that is written directly has the shape
//
//     blanks  prefix  zeros  digits  blanks
//
// with blanks on one side only; the prefix is the sign or "0x".

#include "field.h"

#include "print.h"

#include <algorithm>
#include <charconv>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdio>

namespace {

struct field_parts {
    std::string_view prefix;
    int64_t iZeros = 0;
    std::string_view digits;
    bool bZeroPadding = false; ///< fill the width with zeros after the prefix
};

int64_t size_of(std::string_view text) {
    return static_cast<int64_t>(text.size());
}

/// printf refuses a width or precision that an int does not hold.
bool is_refused(const conversion& conv) {
    return conv.iWidth > INT_MAX || conv.iPrecision > INT_MAX;
}

void write_parts(text_run& out, const conversion& conv, const field_parts& parts) {
    const int64_t iLength = size_of(parts.prefix) + parts.iZeros + size_of(parts.digits);
    if (is_refused(conv) || iLength > INT_MAX) {
        out.add(UNFORMATTABLE);
        return;
    }
    const int64_t iPadding = std::max<int64_t>(conv.iWidth - iLength, 0);
    const bool bLeft = conv.uFlags & CONVERSION_LEFT;
    const bool bZeros = parts.bZeroPadding && !bLeft;

    kept_text kept(out);
    if (!bLeft && !bZeros)
        kept.fill(' ', iPadding);
    kept.add(parts.prefix);
    kept.fill('0', parts.iZeros + (bZeros ? iPadding : 0));
    kept.add(parts.digits);
    if (bLeft)
        kept.fill(' ', iPadding);
}

// glibc writes the padding of a wide conversion to its end even when the buffer is
// long full, and builds a precise number in memory as a whole: a width of
// 2,000,000,000 takes seconds, a precision gigabytes. So both are lowered as far as
// the characters that are kept stay the same.

// A precision beyond this only adds zeros behind the characters that are kept:
// a double has at most 1,074 digits after the point.
constexpr int64_t MAX_PRECISION = MAX_PRINTED_TEXT + 1100;

// A width above this is padding for all characters that are kept: no double has more
// digits before the point than 309, which may be grouped, and none has more than
// MAX_PRECISION after it.
constexpr int64_t MAX_WIDTH = MAX_PRINTED_TEXT + MAX_PRECISION + 1000;

/// Makes "%*.*" with the conversion's flags before and `length` and its letter behind.
void make_plain_conversion(char (&plain)[16], const conversion& conv, std::string_view length) {
    char* pEnd = plain;
    *pEnd++ = '%';
    for (size_t i = 0; i < PRINTF_FLAGS.size(); i++)
        if (conv.uFlags & 1U << i)
            *pEnd++ = PRINTF_FLAGS[i];
    pEnd = std::copy_n("*.*", 3, pEnd);
    pEnd = std::copy(length.begin(), length.end(), pEnd);
    *pEnd++ = conv.letter;
    *pEnd = '\0';
}

/// Writes a number by printf. `bGrows`: every step of precision is one more character.
template <class T> void write_by_printf(text_run& out, const conversion& conv,
                                        std::string_view length, bool bGrows, T value) {
    const int64_t iPrecision = std::min(conv.iPrecision, MAX_PRECISION);
    const int64_t iLeftOut = bGrows ? conv.iPrecision - iPrecision : 0;
    const int64_t iWidth = std::max<int64_t>(conv.iWidth - iLeftOut, 0);
    char plain[16];
    make_plain_conversion(plain, conv, length);
    char text[MAX_PRINTED_TEXT + 1];
    const int iLength =
        std::snprintf(text, sizeof(text), plain, static_cast<int>(std::min(iWidth, MAX_WIDTH)),
                      static_cast<int>(iPrecision), value);
    if (is_refused(conv) || iLength < 0 || iLength + iLeftOut > INT_MAX)
        out.add(UNFORMATTABLE);
    else
        out.add({text, std::min(static_cast<size_t>(iLength), MAX_PRINTED_TEXT)});
}

bool is_signed(char letter) {
    return letter == 'd' || letter == 'i';
}

/// The lowest `iBits` bits as a number, signed or not.
int64_t narrow(uint64_t uValue, int iBits, bool bSigned) {
    const int iUnused = 64 - iBits;
    const uint64_t uShifted = uValue << iUnused;
    return bSigned ? static_cast<int64_t>(uShifted) >> iUnused
                   : static_cast<int64_t>(uShifted >> iUnused);
}

/// Room for the digits of any integer and a sign.
constexpr size_t INTEGER_ROOM = 24;
static_assert(INTEGER_ROOM <= text_run::MAX_ROOM);

/// Writes the digits of `uValue` at `pOut`; returns their end.
char* put_digits(char* pOut, char letter, uint64_t uValue) {
    const int iBase = letter == 'o' ? 8 : letter == 'x' || letter == 'X' ? 16 : 10;
    char* pEnd = std::to_chars(pOut, pOut + INTEGER_ROOM - 1, uValue, iBase).ptr;
    if (letter == 'X')
        for (; pOut < pEnd; pOut++)
            if (*pOut >= 'a')
                *pOut = static_cast<char>(*pOut - 'a' + 'A');
    return pEnd;
}

std::string_view sign_of(const conversion& conv, bool bNegative) {
    if (bNegative)
        return "-";
    if (conv.uFlags & CONVERSION_PLUS)
        return "+";
    return conv.uFlags & CONVERSION_SPACE ? " " : "";
}

/// What "#" adds to a number.
void add_base_mark(field_parts& parts, char letter, bool bZero) {
    if (letter == 'o' && parts.iZeros == 0 && !parts.digits.starts_with('0'))
        parts.iZeros = 1;
    else if (letter == 'x' && !bZero)
        parts.prefix = "0x";
    else if (letter == 'X' && !bZero)
        parts.prefix = "0X";
}

void write_number(text_run& out, const conversion& conv, int64_t iValue) {
    const bool bSigned = is_signed(conv.letter);
    const bool bNegative = bSigned && iValue < 0;
    const auto uValue = static_cast<uint64_t>(iValue);
    const uint64_t uMagnitude = bNegative ? -uValue : uValue;
    char buffer[INTEGER_ROOM];
    field_parts parts;
    if (bSigned)
        parts.prefix = sign_of(conv, bNegative);
    if (iValue != 0 || conv.iPrecision != 0)
        parts.digits = {buffer, put_digits(buffer, conv.letter, uMagnitude)};
    parts.iZeros = std::max<int64_t>(conv.iPrecision - size_of(parts.digits), 0);
    if (conv.uFlags & CONVERSION_ALTERN)
        add_base_mark(parts, conv.letter, iValue == 0);
    parts.bZeroPadding = (conv.uFlags & CONVERSION_ZERO) && conv.iPrecision < 0;
    write_parts(out, conv, parts);
}

} // namespace

void write_integer(text_run& out, const conversion& conv, uint64_t uValue) {
    const int64_t iValue = narrow(uValue, conv.uBits, is_signed(conv.letter));
    if (conv.letter == 'p')
        write_by_printf(out, conv, "", uValue != 0, // null is a word
                        reinterpret_cast<void*>(static_cast<uintptr_t>(uValue)));
    else if (conv.uFlags & CONVERSION_GROUP)
        write_by_printf(out, conv, "ll", true, static_cast<long long>(iValue));
    else
        write_number(out, conv, iValue);
}

void write_real(text_run& out, const conversion& conv, double value) {
    const bool bShortest =
        (conv.letter == 'g' || conv.letter == 'G') && !(conv.uFlags & CONVERSION_ALTERN);
    write_by_printf(out, conv, "", std::isfinite(value) && !bShortest, value);
}

void write_string(text_run& out, const conversion& conv, std::string_view value) {
    if (conv.letter == 's' && conv.iPrecision >= 0)
        value = value.substr(0, static_cast<size_t>(conv.iPrecision));
    write_parts(out, conv, {.prefix = {}, .digits = value});
}
