#include "record_text.h"

#include "digits.h"

#include <charconv>

namespace {

std::string_view text_between(const char* pStart, const char* pEnd) {
    return {pStart, static_cast<size_t>(pEnd - pStart)};
}

} // namespace

void put_hex(text_run& out, uint64_t uValue, int iDigits) {
    char text[2 + DIGITS_ROOM] = {'0', 'x'};
    out.add(text_between(text, put_number(text + 2, uValue, 16, iDigits, '0')));
}

void put_decimal(text_run& out, int64_t iValue) {
    char text[DIGITS_ROOM];
    out.add(text_between(text, std::to_chars(text, text + sizeof(text), iValue).ptr));
}

void put_trace_id(text_run& out, uint32_t uTraceId) {
    out.add("id=");
    put_hex(out, uTraceId, 8);
}

void put_index(text_run& out, size_t uIndex) {
    out.add('[');
    put_decimal(out, static_cast<int64_t>(uIndex));
    out.add("]=");
}

void format_string(text_run& out, std::string_view string) {
    if (string.ends_with('\n'))
        string.remove_suffix(1);
    out.add(string);
}
