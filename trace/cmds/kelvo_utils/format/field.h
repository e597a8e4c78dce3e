// Writes one value in the field of its conversion: the text that printf gives
// for width, precision, flags and value, of which the first MAX_PRINTED_TEXT
// characters are kept. Main thread only, nothing is allocated.
//
// Widths and precisions may be as large as they like: beyond the characters kept
// padding is counted, not made.
#pragma once

#include "format_plan.h"
#include "text_run.h"

#include <string_view>

/// An integer by "diouxXp". Of `uValue` as many bits count as the conversion asks
/// for, all of them with "p"; the letter says whether they are signed.
void write_integer(text_run& out, const conversion& conv, uint64_t uValue);

/// A floating-point number by "eEfgG".
void write_real(text_run& out, const conversion& conv, double value);

/// A string by "s", or a character by "c" (which has no precision).
void write_string(text_run& out, const conversion& conv, std::string_view value);
