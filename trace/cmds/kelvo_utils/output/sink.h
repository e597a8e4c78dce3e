// The character sink: every text of a record, and every message to standard
// output, passes through it. It keeps the column, indents the lines of a record
// body and interprets the nesting markers at its start. Main thread only.
#pragma once

#include <string_view>

/// Writes one character.
void output_char(char ch);

/// The same as output_char for each character of `text`, in runs.
void output_text(std::string_view text);

/// The same as output_char for each character; null writes nothing.
void output_string(const char* pString);
