// One conversion of a format string, taken apart for printing. The text of the
// conversion comes from a template file; what is printed goes by the fields
// here, never by that text.
#pragma once

#include "kelvo.h"

#include <string_view>

/// Bits of conversion::uFlags.
enum : uint8_t {
    CONVERSION_LEFT = 0x01,   ///< "-"
    CONVERSION_PLUS = 0x02,   ///< "+"
    CONVERSION_SPACE = 0x04,  ///< " "
    CONVERSION_ALTERN = 0x08, ///< "#"
    CONVERSION_ZERO = 0x10,   ///< "0"
    CONVERSION_GROUP = 0x20,  ///< "'"
};

/// A conversion as the printf family would get it, rebuilt for one record.
struct conversion {
    int64_t iWidth = 0;      ///< never negative; not bounded by what an int holds
    int64_t iPrecision = -1; ///< -1: none; not bounded either
    int iRebuiltLength = 2;  ///< characters of the rebuilt text, '%' and letter included
    uint8_t uFlags = 0;      ///< CONVERSION_* bits
    uint8_t uBits = 32;      ///< of an integer that its modifier asks for: 16, 32 or 64
    char letter = '\0';      ///< never 'C' or 'S': those are 'c' and 's'
};

/// Longest rebuilt text that is used.
inline constexpr int MAX_REBUILT_CONVERSION = 39;

/// Takes the conversion `text`, from its '%' through its letter, apart.
/// `bNumbered`: the string has numbered parameters. The values stand in for a '*'
/// width and a '*' precision.
///
/// Left out are the flags "B", "N" and "J", which printf does not know, a
/// length modifier that printf would not take as it is meant here, and a negative
/// '*' precision; a negative '*' width is the flag "-" and its magnitude.
conversion parse_conversion(std::string_view text, bool bNumbered, int32_t iStarWidth,
                            int32_t iStarPrecision);

/// Whether printf's `letter` can print a value of type `type`. Always so in a
/// string without numbered parameters.
bool conversion_fits(char letter, parm_type_t type);
