// How a compiled format is written: its literal text and its conversions, taken apart
// when it was compiled. What is printed goes by the fields here, never by the text of
// the template file.
#pragma once

#include "digits.h"
#include "kelvo.h"
#include "parm_types.h"

#include <algorithm>
#include <string_view>

/// The flags that printf knows, in the order of the bits of conversion::uFlags.
inline constexpr std::string_view PRINTF_FLAGS = "-+ #0'";

/// Bits of conversion::uFlags.
enum : uint8_t {
    CONVERSION_LEFT = 0x01,   ///< "-"
    CONVERSION_PLUS = 0x02,   ///< "+"
    CONVERSION_SPACE = 0x04,  ///< " "
    CONVERSION_ALTERN = 0x08, ///< "#"
    CONVERSION_ZERO = 0x10,   ///< "0"
    CONVERSION_GROUP = 0x20,  ///< "'"
};

/// A conversion as the printf family would get it: without its parameter numbers, the
/// flags that printf does not know and a length modifier that it would not take as it
/// is meant here. Values of '*' are put in when it is printed.
struct conversion {
    int64_t iWidth = 0;      ///< never negative; not bounded by what an int holds
    int64_t iPrecision = -1; ///< -1: none; not bounded either
    int iRebuiltLength = 2;  ///< characters of the rebuilt text, '%' and letter included
    uint8_t uFlags = 0;      ///< CONVERSION_* bits
    uint8_t uBits = 32;      ///< of an integer that its modifier asks for: 16, 32 or 64
    char letter = '\0';      ///< never 'C' or 'S': those are 'c' and 's'
    argument_class argument = ARGUMENT_NONE; ///< that printf reads for the letter
};

/// Longest rebuilt text that is used.
inline constexpr int MAX_REBUILT_CONVERSION = 39;

/// What writes a conversion when its parameters are there.
enum piece_writer : uint8_t {
    WRITE_OWN_TEXT, ///< as it stands in the format: it cannot print its parameter
    WRITE_NOTHING,
    WRITE_HANDLE,
    WRITE_TRACE_ID,
    WRITE_FIELD,  ///< by flags, width and precision
    WRITE_STRING, ///< whole
    // Numbers and characters that go by nothing but the value, a width and zeros to
    // fill it; they give what WRITE_FIELD would give:
    WRITE_SIGNED,
    WRITE_UNSIGNED,
    WRITE_HEX,
    WRITE_CHAR,
};

/// Readable bytes from the begin of a format's literal text on.
inline constexpr size_t PADDED_TEXT = 16;

/// Literal text of a format string as it is written, "%%" as one percent sign,
/// and how the conversion behind it is written.
struct format_piece {
    const char* pText; ///< PADDED_TEXT bytes can be read there, however short it is
    uint32_t uLength;
    piece_writer writer;
    uint8_t uWidth; ///< of a number from WRITE_SIGNED on
    bool bZeros;    ///< it is filled up with zeros rather than blanks

    // Of a number or character from WRITE_SIGNED on, for the traces of 32-bit and of
    // 64-bit programs:
    uint8_t uShape[2];   ///< an integer_shape
    uint16_t uOffset[2]; ///< of a leading number's parameter in a packed run
};

/// The conversions that a format which uses its parameters in order begins with, as
/// far as they are numbers from WRITE_SIGNED on, with no newline between them and no
/// marker at the start, and fit into LEADING_ROOM. In a packed run their parameters
/// have fixed places.
struct leading_numbers {
    bool bTakesRest;  ///< behind them the rest of the run is taken, and nothing printed
    uint8_t uCount;   ///< the numbers
    uint16_t uEnd[2]; ///< of the last one's parameter: the run must be as long
};

/// Most bytes that the leading numbers with the text before each are written with.
inline constexpr size_t LEADING_ROOM = 512;

/// Lies in the block of its format_entry.
struct format_plan {
    conversion* pConversions; ///< numConvs
    format_piece* pPieces;    ///< numConvs + 1: before each conversion, and after the last one
                              ///< (there without a newline at the very end)
    bool bParmsInOrder; ///< the conversions use the parameters in order, each once, without '*'
    leading_numbers leading; ///< when they do
};

/// Most bytes that a number or character from WRITE_SIGNED on is written with: a
/// sign, the digits in their width, and what put_decimal writes behind them.
inline size_t direct_room(const format_piece& piece) {
    return 1 + std::max<size_t>(piece.uWidth, DIGITS_ROOM) + 7;
}

/// Fills in the plan of a compiled format, whose conversions it has: its pieces, with
/// their text at `pText`, and its leading numbers. Of the text no more is written than
/// the format's string is long.
void lay_out_plan(const format_entry& entry, char* pText);
