// Numbers and strings of the fixed forms. Main thread only.
#pragma once

#include "text_run.h"

#include <cstdint>
#include <string_view>

/// "0x" and the lowest `iDigits` hexadecimal digits, at most 16.
void add_hex(text_run& out, uint64_t uValue, int iDigits);

void add_decimal(text_run& out, int64_t iValue);

/// "id=" and the trace id.
void add_trace_id(text_run& out, uint32_t uTraceId);

/// "[%d]=" with the position in an array.
void add_index(text_run& out, size_t uIndex);

/// Writes a string of a record, but not a newline that ends it.
void format_string(text_run& out, std::string_view string);
