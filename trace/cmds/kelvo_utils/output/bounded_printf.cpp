// glibc writes the padding of a wide conversion to its end even when the buffer
// is long full, and builds a precise number in memory as a whole: a width of
// 2,000,000,000 takes seconds, a precision gigabytes. So a format that could ask
// for that is taken apart here. Every conversion goes to snprintf by itself,
// with its width and precision lowered as far as the characters that are kept
// stay the same, and the length is counted as it would have been.
#include "bounded_printf.h"

#include "digits.h"

#include <algorithm>
#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstring>
#include <string_view>

namespace {

constexpr int64_t NOT_GIVEN = -1;

// A precision beyond this only adds zeros behind the characters that are kept:
// a double has at most 1,074 digits after the point.
constexpr int64_t MAX_PRECISION = BOUNDED_PRINTF_SIZE + 1100;

// A width above this is blanks (or zeros) for all characters that are kept: the
// longest number has 4,933 digits before the point and MAX_PRECISION after it.
constexpr int64_t MAX_WIDTH = 4 * BOUNDED_PRINTF_SIZE;
static_assert(MAX_WIDTH > MAX_PRECISION + 4950 + int64_t{BOUNDED_PRINTF_SIZE});

struct argument_list {
    va_list args;
};

struct conversion {
    char flags[8];
    size_t uFlags;
    int64_t width;
    int64_t precision;
    std::string_view length;
    char letter;

    bool has_flag(char flag) const {
        return std::memchr(flags, flag, uFlags) != nullptr;
    }
    void add_flag(char flag) {
        if (!has_flag(flag))
            flags[uFlags++] = flag;
    }
};

// The text so far: the first characters are kept, all are counted.
struct text_sink {
    char* pNext;
    size_t room; // without the NUL
    int64_t total;

    void keep(size_t count) {
        pNext += count;
        room -= count;
    }
    void append(const char* pText, size_t count) {
        const size_t kept = std::min(count, room);
        std::memcpy(pNext, pText, kept);
        keep(kept);
        total += static_cast<int64_t>(count);
    }
    void fill(char ch, int64_t count) {
        const size_t kept = std::min(static_cast<size_t>(std::max<int64_t>(count, 0)), room);
        std::memset(pNext, ch, kept);
        keep(kept);
        total += std::max<int64_t>(count, 0);
    }
};

// Whether a width or precision could be large: a '*', or four digits or more.
bool may_be_large(const char* pFormat) {
    while ((pFormat = std::strchr(pFormat, '%')) != nullptr) {
        pFormat++;
        int digits = 0;
        for (; *pFormat != '\0' && std::strchr("-+ #0'123456789.*$I", *pFormat); pFormat++) {
            digits = is_digit(*pFormat) ? digits + 1 : 0;
            if (*pFormat == '*' || digits > 3)
                return true;
        }
        if (*pFormat != '\0')
            pFormat++;
    }
    return false;
}

// Reads decimal digits; INT_MAX + 1 stands for everything above INT_MAX.
int64_t read_digits(const char** ppFormat) {
    int64_t value = 0;
    for (; is_digit(**ppFormat); ++*ppFormat)
        value = std::min<int64_t>(value * 10 + (**ppFormat - '0'), int64_t{INT_MAX} + 1);
    return value;
}

int64_t read_number(const char** ppFormat, argument_list* pList) {
    if (**ppFormat != '*')
        return read_digits(ppFormat);
    ++*ppFormat;
    return va_arg(pList->args, int);
}

// Reads the conversion after a '%' up to and including its letter.
bool read_conversion(const char** ppFormat, argument_list* pList, conversion* pConv) {
    *pConv = {{}, 0, NOT_GIVEN, NOT_GIVEN, {}, '\0'};
    for (; **ppFormat != '\0' && std::strchr("-+ #0'", **ppFormat); ++*ppFormat)
        pConv->add_flag(**ppFormat);
    if (**ppFormat == '*' || is_digit(**ppFormat)) {
        pConv->width = read_number(ppFormat, pList);
        if (pConv->width < 0) {
            pConv->add_flag('-');
            pConv->width = -pConv->width;
        }
    }
    if (**ppFormat == '.') {
        ++*ppFormat;
        pConv->precision = std::max(read_number(ppFormat, pList), NOT_GIVEN);
    }
    for (const std::string_view length : {"hh", "h", "ll", "l", "L", "q", "j", "z", "t"}) {
        if (std::string_view(*ppFormat).starts_with(length)) {
            pConv->length = length;
            *ppFormat += length.size();
            break;
        }
    }
    pConv->letter = **ppFormat;
    if (pConv->letter != '\0')
        ++*ppFormat;
    return pConv->letter != '\0' && pConv->width <= INT_MAX && pConv->precision <= INT_MAX;
}

// Writes one number. `bGrows`: every step of precision is one more character.
template <class T> bool put_value(text_sink* pOut, const conversion& conv, bool bGrows, T value) {
    const int64_t precision = std::min(conv.precision, MAX_PRECISION);
    const int64_t left_out =
        bGrows ? std::max<int64_t>(conv.precision, 0) - std::max<int64_t>(precision, 0) : 0;
    const int64_t width = std::max<int64_t>(conv.width - left_out, 0);

    char format[24] = "%";
    char* pEnd = std::copy_n(conv.flags, conv.uFlags, format + 1);
    pEnd = std::copy_n("*.*", 3, pEnd);
    pEnd = std::copy(conv.length.begin(), conv.length.end(), pEnd);
    *pEnd = conv.letter;
    const int length = std::snprintf(pOut->pNext, pOut->room + 1, format,
                                     static_cast<int>(std::min(width, MAX_WIDTH)),
                                     static_cast<int>(precision), value);
    if (length < 0)
        return false;
    pOut->keep(std::min(static_cast<size_t>(length), pOut->room));
    pOut->total += std::max<int64_t>(length, width) + left_out;
    return true;
}

// Integers are fetched by their length; signedness does not change how.
bool put_integer(text_sink* pOut, const conversion& conv, argument_list* pList) {
    if (conv.length == "ll" || conv.length == "q" || conv.length == "L")
        return put_value(pOut, conv, true, va_arg(pList->args, long long));
    if (conv.length == "l")
        return put_value(pOut, conv, true, va_arg(pList->args, long));
    if (conv.length == "j")
        return put_value(pOut, conv, true, va_arg(pList->args, intmax_t));
    if (conv.length == "z")
        return put_value(pOut, conv, true, va_arg(pList->args, size_t));
    if (conv.length == "t")
        return put_value(pOut, conv, true, va_arg(pList->args, ptrdiff_t));
    return put_value(pOut, conv, true, va_arg(pList->args, int));
}

template <class T> bool put_real(text_sink* pOut, const conversion& conv, T value) {
    const bool bShortest = (conv.letter == 'g' || conv.letter == 'G') && !conv.has_flag('#');
    return put_value(pOut, conv, std::isfinite(value) && !bShortest, value);
}

void put_text(text_sink* pOut, const conversion& conv, const char* pText, size_t length) {
    const int64_t padding = conv.width - static_cast<int64_t>(length);
    if (!conv.has_flag('-'))
        pOut->fill(' ', padding);
    pOut->append(pText, length);
    if (conv.has_flag('-'))
        pOut->fill(' ', padding);
}

bool put_conversion(text_sink* pOut, const conversion& conv, argument_list* pList) {
    switch (conv.letter) {
    case 'd':
    case 'i':
    case 'u':
    case 'o':
    case 'x':
    case 'X':
        return put_integer(pOut, conv, pList);
    case 'f':
    case 'F':
    case 'e':
    case 'E':
    case 'g':
    case 'G':
    case 'a':
    case 'A':
        if (conv.length == "L")
            return put_real(pOut, conv, va_arg(pList->args, long double));
        return put_real(pOut, conv, va_arg(pList->args, double));
    case 'p':
        return put_value(pOut, conv, false, va_arg(pList->args, void*));
    case '%':
        pOut->append("%", 1);
        return true;
    case 'c':
    case 's':
        break;
    default:
        return false;
    }
    if (!conv.length.empty())
        return false;
    if (conv.letter == 'c') {
        const char ch = static_cast<char>(va_arg(pList->args, int));
        put_text(pOut, conv, &ch, 1);
        return true;
    }
    const char* pText = va_arg(pList->args, const char*);
    if (pText == nullptr)
        pText = conv.precision == NOT_GIVEN || conv.precision >= 6 ? "(null)" : "";
    put_text(pOut, conv, pText,
             conv.precision == NOT_GIVEN ? std::strlen(pText)
                                         : strnlen(pText, static_cast<size_t>(conv.precision)));
    return true;
}

int format_in_pieces(char* pBuffer, size_t size, const char* pFormat, argument_list* pList) {
    text_sink out{pBuffer, size - 1, 0};
    while (*pFormat != '\0') {
        if (*pFormat != '%') {
            const size_t plain = std::strcspn(pFormat, "%");
            out.append(pFormat, plain);
            pFormat += plain;
            continue;
        }
        pFormat++;
        conversion conv;
        if (!read_conversion(&pFormat, pList, &conv) || !put_conversion(&out, conv, pList) ||
            out.total > INT_MAX)
            return -1;
    }
    *out.pNext = '\0';
    return static_cast<int>(out.total);
}

} // namespace

int bounded_vsnprintf(char* pBuffer, size_t size, const char* pFormat, va_list args) {
    if (!may_be_large(pFormat))
        return std::vsnprintf(pBuffer, size, pFormat, args);
    argument_list list;
    va_copy(list.args, args);
    const int length =
        format_in_pieces(pBuffer, std::min(size, BOUNDED_PRINTF_SIZE), pFormat, &list);
    va_end(list.args);
    return length;
}

int bounded_snprintf(char* pBuffer, size_t size, const char* pFormat, ...) {
    va_list args;
    va_start(args, pFormat);
    const int length = bounded_vsnprintf(pBuffer, size, pFormat, args);
    va_end(args);
    return length;
}
