#include "record_text.h"

#include "sink.h"

#include <algorithm>
#include <charconv>
#include <cstring>

record_text& record_text::add(std::string_view piece) {
    const size_t uTaken = std::min(piece.size(), uCapacity - uLength);
    std::memcpy(text + uLength, piece.data(), uTaken);
    uLength += uTaken;
    return *this;
}

record_text& record_text::add_hex(uint64_t uValue, int iDigits) {
    static constexpr char digits[] = "0123456789abcdef";
    char piece[2 + 16] = {'0', 'x'};
    for (int i = iDigits; i > 0; i--) {
        piece[1 + i] = digits[uValue & 0xF];
        uValue >>= 4;
    }
    return add({piece, 2 + static_cast<size_t>(iDigits)});
}

record_text& record_text::add_decimal(int64_t iValue) {
    char piece[24];
    const auto end = std::to_chars(piece, piece + sizeof(piece), iValue).ptr;
    return add({piece, static_cast<size_t>(end - piece)});
}

void record_text::write() const {
    output_text({text, uLength});
}

void format_string(std::string_view string) {
    if (string.ends_with('\n'))
        string.remove_suffix(1);
    output_text(string);
}
