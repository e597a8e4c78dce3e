#include "record_text.h"

#include "digits.h"

void add_hex(text_run& out, uint64_t uValue, int iDigits) {
    char* const pText = out.begin_room(2 + 16 + 7);
    pText[0] = '0';
    pText[1] = 'x';
    out.end_room(put_hex_digits(pText + 2, uValue, iDigits));
}

void add_decimal(text_run& out, int64_t iValue) {
    char* pText = out.begin_room(1 + DIGITS_ROOM + 7);
    if (iValue < 0)
        *pText++ = '-';
    const auto uValue = static_cast<uint64_t>(iValue);
    out.end_room(put_decimal(pText, iValue < 0 ? -uValue : uValue));
}

void add_trace_id(text_run& out, uint32_t uTraceId) {
    out.add("id=");
    add_hex(out, uTraceId, 8);
}

void add_index(text_run& out, size_t uIndex) {
    out.add('[');
    add_decimal(out, static_cast<int64_t>(uIndex));
    out.add("]=");
}

void format_string(text_run& out, std::string_view string) {
    if (string.ends_with('\n'))
        string.remove_suffix(1);
    out.add(string);
}
