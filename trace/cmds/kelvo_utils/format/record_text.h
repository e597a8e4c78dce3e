// Text of the fixed forms, put together without the printf family. Main thread
// only.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

/// A short piece of text under construction. What does not fit is cut; every
/// fixed form fits.
class record_text {
public:
    record_text& add(std::string_view text);
    /// "0x" and the lowest `iDigits` hexadecimal digits of `uValue`.
    record_text& add_hex(uint64_t uValue, int iDigits);
    record_text& add_decimal(int64_t iValue);

    /// Hands the text to the character sink.
    void write() const;

private:
    static constexpr size_t uCapacity = 128;

    char text[uCapacity];
    size_t uLength = 0;
};

/// Writes a string of a record, but not a newline that ends it.
void format_string(std::string_view string);
