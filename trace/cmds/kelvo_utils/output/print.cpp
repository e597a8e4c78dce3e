#include "print.h"

#include "handover.h"
#include "sink.h"

#include <algorithm>
#include <cstdio>
#include <string_view>

namespace {

using format_buffer = char[MAX_PRINTED_TEXT + 1];

// The formatted text, cut at what the buffer keeps, or the replacement.
__attribute__((format(printf, 2, 0))) std::string_view
format_text(format_buffer& buffer, const char* pFormat, va_list args) {
    const int length = std::vsnprintf(buffer, sizeof buffer, pFormat, args);
    if (length < 0)
        return UNFORMATTABLE;
    return {buffer, std::min(static_cast<size_t>(length), MAX_PRINTED_TEXT)};
}

} // namespace

void output_vprintf(const char* pFormat, va_list pArgs) {
    format_buffer buffer;
    output_text(format_text(buffer, pFormat, pArgs));
}

void output_printf(const char* pFormat, ...) {
    va_list args;
    va_start(args, pFormat);
    output_vprintf(pFormat, args);
    va_end(args);
}

void output_message(const char* pMsg, ...) {
    format_buffer buffer;
    va_list args;
    va_start(args, pMsg);
    const std::string_view text = format_text(buffer, pMsg, args);
    va_end(args);
    if (owns_standard_output())
        output_text(text);
    else
        hand_over_output(text);
}
