#include "hex.h"

#include "digits.h"
#include "sink.h"

#include <algorithm>

namespace {

constexpr size_t LINE_BYTES = 16;
constexpr size_t GROUP_BYTES = 4;
// Newline, position and colon; groups with their blank; bars around the characters.
constexpr size_t LINE_ROOM = 12 + LINE_BYTES / GROUP_BYTES + 2 * LINE_BYTES + 3 + LINE_BYTES;

char* put_hex_byte(char* pOut, uint8_t byte) {
    *pOut++ = "0123456789abcdef"[byte >> 4];
    *pOut++ = "0123456789abcdef"[byte & 0xF];
    return pOut;
}

// One line of the dump: `line` are its 1 to 16 bytes, `position` the first
// one's in the dump.
void write_line(uint32_t position, trace_bytes line) {
    char text[LINE_ROOM];
    char characters[LINE_BYTES];
    std::fill_n(characters, LINE_BYTES, ' ');
    char* pOut = std::copy_n("\n0x", 3, text);
    pOut = put_hex8(pOut, position);
    *pOut++ = ':';
    for (size_t i = 0; i < LINE_BYTES; i++) {
        if (i % GROUP_BYTES == 0)
            *pOut++ = ' ';
        if (i >= line.size()) {
            pOut = std::fill_n(pOut, 2, ' ');
            continue;
        }
        const auto byte = std::to_integer<uint8_t>(line[i]);
        pOut = put_hex_byte(pOut, byte);
        characters[i] = byte >= 0x20 && byte <= 0x7F ? static_cast<char>(byte) : '.';
    }
    pOut = std::copy_n(" |", 2, pOut);
    pOut = std::copy_n(characters, LINE_BYTES, pOut);
    *pOut++ = '|';
    output_text({text, static_cast<size_t>(pOut - text)});
}

} // namespace

void format_hex(trace_bytes data) {
    for (size_t i = 0; i < data.size(); i += LINE_BYTES)
        write_line(static_cast<uint32_t>(i), load_run(data, i, LINE_BYTES));
    output_char('\n');
}
