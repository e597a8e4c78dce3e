// Compiles a printf-like format string into a format_entry. Main thread.
#pragma once

#include "kelvo.h"

/// Compiles `pString`. With `pFile` messages name its lineNumber and the new
/// entry is linked at the head of its pFormats; without, line 1 and no link.
/// trace_id and block_id are left to the caller. Returns null when the string
/// is refused (the message is written) or memory is exhausted (none is).
/// The entry is one block, released with free().
format_entry* parse_format_string(const char* pString, template_file* pFile);

/// Reads an explicit parameter number and its "$" at *ppFormat and moves past
/// it. Returns the number less one, or a negative value (after a message,
/// except for the number 0).
int parse_parm_number(const char** ppFormat, int maxParms, int lineNumber);
