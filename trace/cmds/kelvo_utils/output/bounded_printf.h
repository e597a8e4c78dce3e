#pragma once

#include <cstdarg>
#include <cstddef>

/// Most characters that one call keeps, the NUL included.
inline constexpr size_t BOUNDED_PRINTF_SIZE = 4096;

/// vsnprintf whose cost does not depend on widths and precisions: they may be
/// any 32-bit value, also through '*', and cost neither time nor memory beyond
/// what is kept. `size` is 1 to BOUNDED_PRINTF_SIZE.
///
/// Returns the length of the whole text, of which the first `size` - 1
/// characters are in `pBuffer`; or -1 where printf refuses (a width above
/// INT_MAX, a text longer than that). A format with a width or precision of
/// four digits or more, or a '*', is also refused for "%n", wide characters,
/// numbered arguments and unknown letters. Any thread.
int bounded_vsnprintf(char* pBuffer, size_t size, const char* pFormat, va_list args)
    __attribute__((format(printf, 3, 0)));

/// bounded_vsnprintf with the arguments given in place.
int bounded_snprintf(char* pBuffer, size_t size, const char* pFormat, ...)
    __attribute__((format(printf, 3, 4)));
