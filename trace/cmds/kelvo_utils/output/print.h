// printf-style text through the character sink. Main thread only, but for
// output_message.
#pragma once

#include <cstdarg>
#include <cstddef>
#include <string_view>

/// Characters that are kept of one text.
inline constexpr size_t MAX_PRINTED_TEXT = 4095;

/// Stands in place of a text that cannot be formatted.
inline constexpr std::string_view UNFORMATTABLE = "kelvo error in output_vprintf()";

/// Writes the formatted text, or UNFORMATTABLE.
void output_vprintf(const char* pFormat, va_list pArgs) __attribute__((format(printf, 1, 0)));

/// output_vprintf with the arguments given in place.
void output_printf(const char* pFormat, ...) __attribute__((format(printf, 1, 2)));

/// output_printf under the name that messages and summaries use. On another
/// thread than the main one the text is handed over (see handover.h).
void output_message(const char* pMsg, ...) __attribute__((format(printf, 1, 2)));
