// The character sink: every text of a record, and every message to standard
// output, passes through it. It keeps the column, indents the lines of a record
// body and interprets the nesting markers at its start. Main thread only.
//
// A body begins at column headerIndent + 2 * nesting level and so does each of
// its further lines. Columns are signed 16-bit values: a body nested so deeply
// that its column turns negative is not indented. A thread's level stops at
// MAX_NESTING_LEVEL.
#pragma once

#include <cstdint>
#include <string_view>

/// Deepest level that is counted.
inline constexpr uint16_t MAX_NESTING_LEVEL = UINT16_MAX;

/// Whether `ch` is one of the characters that make nesting markers.
constexpr bool is_marker(char ch) {
    return ch == '<' || ch == '>';
}

/// Writes one character.
void output_char(char ch);

/// The same as output_char for each character of `text`, in runs.
void output_text(std::string_view text);

/// The same as output_char for each character; null writes nothing.
void output_string(const char* pString);

/// Does what output_text does before ordinary text: opens the body, indents a
/// line. For callers that then write to the stream themselves: at least one
/// character, the first no marker, and no newline.
void output_begin_text();

/// Gives up a record that was opened and will not be closed: the sink is
/// between records again. A line that it has begun is ended.
void output_abandon_rec();
