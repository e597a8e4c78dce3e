// The compiler of format strings. One pass over the string:
//
//   format     = { literal | "%%" | conversion }
//   conversion = "%" [number] { flag } [width] [precision] [length] letter
//   number     = digits "$"                 numbered mode only, there required
//   width      = "*" [number] | digits
//   precision  = "." ( "*" [number] | [digits] )
//   length     = "h" | "l" | "ll" | "L"
//
// The first conversion decides for the whole string whether its parameters are
// numbered. What is found is collected in arrays of fixed size and moved into
// one block at the end, so that a refused string leaves nothing behind. Each
// conversion is taken apart on the way, once and for all.
#include "compile.h"

#include "digits.h"
#include "format_plan.h"
#include "messages.h"

#include <cstdlib>
#include <cstring>
#include <limits>
#include <memory>
#include <new>
#include <string_view>

namespace {

constexpr int MAX_NUMBER_DIGITS = 15;
constexpr std::string_view DROPPED_FLAGS = "BNJ"; // accepted, and mean nothing

/// Widths and precisions stop growing here, far above any int.
constexpr int64_t MAX_NUMBER = 1'000'000'000'000;

enum class numbering { undecided, sequential, numbered };

enum length_modifier { LENGTH_NONE, LENGTH_H, LENGTH_L, LENGTH_LL, LENGTH_LONG_DOUBLE };

constexpr parm_type_t unsigned_of(parm_type_t type) {
    return static_cast<parm_type_t>(type | PARM_UNSIGNED);
}

/// Conversion letters of one family, what printf reads for them, and the type that each
/// length modifier, in the order of length_modifier, gives to the parameter.
struct letter_family {
    std::string_view letters;
    argument_class argument;
    parm_type_t types[5];
};

constexpr letter_family every_length(std::string_view letters, argument_class argument,
                                     parm_type_t type) {
    return {letters, argument, {type, type, type, type, type}};
}

constexpr letter_family LETTER_FAMILIES[] = {
    {"di", ARGUMENT_INTEGER, {PARM_INT, PARM_SHORT, PARM_LONG, PARM_LONGLONG, PARM_INT}},
    {"ouxX",
     ARGUMENT_INTEGER,
     {unsigned_of(PARM_INT), unsigned_of(PARM_SHORT), unsigned_of(PARM_LONG),
      unsigned_of(PARM_LONGLONG), unsigned_of(PARM_INT)}},
    {"eEfgG", ARGUMENT_REAL, {PARM_DOUBLE, PARM_FLOAT, PARM_DOUBLE, PARM_DOUBLE, PARM_LONGDOUBLE}},
    every_length("cC", ARGUMENT_CHARACTER, unsigned_of(PARM_CHAR)),
    every_length("sS", ARGUMENT_STRING, PARM_STRING),
    every_length("p", ARGUMENT_POINTER, unsigned_of(PARM_LONG)),
    every_length("r", ARGUMENT_NONE, PARM_RESOURCE_HANDLE),
    every_length("z", ARGUMENT_NONE, PARM_REST),
    every_length("T", ARGUMENT_NONE, PARM_TRACE_ID),
};

/// What a length modifier asks of an integer, in the order of length_modifier, and
/// the characters of it that printf gets.
constexpr struct {
    uint8_t uBits;
    int iCharacters;
} INTEGER_LENGTHS[] = {{32, 0}, {16, 1}, {64, 1}, {64, 2}, {32, 0}};

/// The state of one compilation.
struct format_scan {
    const char* pString;
    const char* pNext; ///< next character to look at
    int lineNumber;    ///< for messages
    numbering mode;
    int numParms;
    int numConvs;
    parm_type_t parmTypes[MAX_PARMS];
    conv_spec convSpecs[MAX_PARMS];
    conversion conversions[MAX_PARMS];
};

/// A width or precision: digits, or where its '*' stands and the parameter of that.
struct field_size {
    int64_t iNumber = 0;
    int iDigits = 0;
    size_t uStarOffset = 0;
    uint8_t starParm = NO_PARM;
};

const char* skip_digits(const char* pText) {
    while (is_digit(*pText))
        ++pText;
    return pText;
}

int refuse_too_many_parms(int lineNumber) {
    output_err_message("%s: 2625-119 Format error on line %d. Too many parameters.\n",
                       anchor.pProgName, lineNumber);
    return -1;
}

bool refuse_unrepresentable(const format_scan& scan) {
    output_err_message(
        "%s: 2625-121 Format error on line %d. Format string cannot be represented.\n",
        anchor.pProgName, scan.lineNumber);
    return false;
}

/// The mode that a conversion sets whose '%' stands right before `pText`.
numbering numbering_of(const char* pText) {
    return is_digit(*pText) && *skip_digits(pText) == '$' ? numbering::numbered
                                                          : numbering::sequential;
}

/// Takes the parameter that the conversion or the '*' before scan.pNext uses:
/// the one it names, or the next of the sequence. Returns its index, or a
/// negative value when the string is refused.
int take_parm(format_scan& scan) {
    int index = scan.numParms;
    if (scan.mode == numbering::numbered) {
        index = parse_parm_number(&scan.pNext, MAX_PARMS, scan.lineNumber);
        if (index < 0)
            return index;
    }
    if (index >= MAX_PARMS)
        return refuse_too_many_parms(scan.lineNumber);
    while (scan.numParms <= index)
        scan.parmTypes[scan.numParms++] = PARM_UNREFERENCED;
    return index;
}

void scan_flags(format_scan& scan, conversion& conv) {
    // The NUL at the end of the string is no member of the views.
    for (;; ++scan.pNext) {
        const size_t uFlag = PRINTF_FLAGS.find(*scan.pNext);
        if (uFlag != std::string_view::npos) {
            conv.uFlags |= static_cast<uint8_t>(1U << uFlag);
            ++conv.iRebuiltLength;
        } else if (DROPPED_FLAGS.find(*scan.pNext) == std::string_view::npos) {
            return;
        }
    }
}

/// Reads a '*' with its parameter, or digits. `pStart` is the conversion's '%'.
bool scan_size(format_scan& scan, const char* pStart, field_size& size) {
    if (*scan.pNext != '*') {
        for (; is_digit(*scan.pNext); ++scan.pNext, ++size.iDigits)
            if (size.iNumber < MAX_NUMBER)
                size.iNumber = size.iNumber * 10 + (*scan.pNext - '0');
        return true;
    }
    size.uStarOffset = static_cast<size_t>(scan.pNext - pStart);
    ++scan.pNext;
    const int index = take_parm(scan);
    if (index < 0)
        return false;
    scan.parmTypes[index] = PARM_INT;
    size.starParm = static_cast<uint8_t>(index);
    return true;
}

/// Reads a width and a precision.
bool scan_sizes(format_scan& scan, const char* pStart, conv_spec& place, conversion& conv) {
    field_size width;
    if (!scan_size(scan, pStart, width))
        return false;
    field_size precision;
    const bool bPrecision = *scan.pNext == '.';
    if (bPrecision) {
        ++scan.pNext;
        if (!scan_size(scan, pStart, precision))
            return false;
    }
    // Offsets that are cut here belong to a conversion too long to be recorded.
    place.widthOffset = static_cast<uint8_t>(width.uStarOffset);
    place.widthParmNum = width.starParm;
    place.precOffset = static_cast<uint8_t>(precision.uStarOffset);
    place.precParmNum = precision.starParm;
    conv.iWidth = width.iNumber;
    conv.iRebuiltLength += width.iDigits;
    if (bPrecision && precision.starParm == NO_PARM) {
        conv.iPrecision = precision.iNumber;
        conv.iRebuiltLength += 1 + precision.iDigits;
    }
    return true;
}

length_modifier scan_length_modifier(format_scan& scan) {
    switch (*scan.pNext) {
    case 'h':
        ++scan.pNext;
        return LENGTH_H;
    case 'L':
        ++scan.pNext;
        return LENGTH_LONG_DOUBLE;
    case 'l':
        ++scan.pNext;
        if (*scan.pNext != 'l')
            return LENGTH_L;
        ++scan.pNext;
        return LENGTH_LL;
    default:
        return LENGTH_NONE;
    }
}

/// Reads the conversion letter and gives its type to parameter `index`.
bool scan_letter(format_scan& scan, length_modifier length, int index, conversion& conv) {
    const char letter = *scan.pNext;
    for (const letter_family& family : LETTER_FAMILIES) {
        if (family.letters.find(letter) == std::string_view::npos)
            continue;
        scan.parmTypes[index] = family.types[length];
        ++scan.pNext;
        conv.letter = letter == 'C' ? 'c' : letter == 'S' ? 's' : letter;
        conv.argument = family.argument;
        if (conv.argument == ARGUMENT_INTEGER) {
            conv.uBits = INTEGER_LENGTHS[length].uBits;
            conv.iRebuiltLength += INTEGER_LENGTHS[length].iCharacters;
        }
        return true;
    }
    output_err_message("%s: 2625-120 Format error on line %d. Invalid data type %c specified.\n",
                       anchor.pProgName, scan.lineNumber, letter);
    return false;
}

/// Reads the conversion whose '%' scan.pNext points to. The value takes its
/// parameter before the width and the precision take theirs.
bool scan_conversion(format_scan& scan) {
    const char* const pStart = scan.pNext++;
    if (scan.mode == numbering::undecided)
        scan.mode = numbering_of(scan.pNext);
    const int valueParm = take_parm(scan);
    if (valueParm < 0)
        return false;
    conv_spec place{};
    conversion conv;
    scan_flags(scan, conv);
    if (!scan_sizes(scan, pStart, place, conv))
        return false;
    const length_modifier length = scan_length_modifier(scan);
    if (!scan_letter(scan, length, valueParm, conv))
        return false;

    // The narrow fields must hold it, and there must be room for one more.
    const auto uOffset = static_cast<size_t>(pStart - scan.pString);
    const auto uLength = static_cast<size_t>(scan.pNext - pStart);
    if (scan.numConvs == MAX_PARMS || uOffset > std::numeric_limits<uint16_t>::max() ||
        uLength > std::numeric_limits<uint8_t>::max())
        return refuse_unrepresentable(scan);
    place.parmNum = static_cast<uint8_t>(valueParm);
    place.lenConv = static_cast<uint8_t>(uLength);
    place.offset = static_cast<uint16_t>(uOffset);
    scan.convSpecs[scan.numConvs] = place;
    scan.conversions[scan.numConvs++] = conv;
    return true;
}

bool scan_format(format_scan& scan) {
    while ((scan.pNext = std::strchr(scan.pNext, '%')) != nullptr) {
        if (scan.pNext[1] == '%')
            scan.pNext += 2;
        else if (!scan_conversion(scan))
            return false;
    }
    for (int index = 0; index < scan.numParms; ++index) {
        if (scan.parmTypes[index] != PARM_UNREFERENCED)
            continue;
        output_err_message("%s: 2625-122 Format error on line %d. Argument %d is not referenced in "
                           "format string.\n",
                           anchor.pProgName, scan.lineNumber, index + 1);
        return false;
    }
    return true;
}

constexpr size_t round_up(size_t uValue, size_t uMultiple) {
    return (uValue + uMultiple - 1) / uMultiple * uMultiple;
}

/// Moves what was found into one block: the entry, its conversions, its type
/// codes, its string, and its plan with its parts. Null when memory is exhausted.
format_entry* make_entry(const format_scan& scan) {
    static_assert(sizeof(format_entry) % alignof(conv_spec) == 0);
    static_assert(sizeof(parm_type_t) == 1);
    static_assert(alignof(format_plan) >= alignof(format_piece));
    static_assert(alignof(format_piece) >= alignof(conversion));
    const auto uConvs = static_cast<size_t>(scan.numConvs);
    const auto uParms = static_cast<size_t>(scan.numParms);
    const size_t uStringSize = std::strlen(scan.pString) + 1;
    const size_t uConvsAt = sizeof(format_entry);
    const size_t uTypesAt = uConvsAt + uConvs * sizeof(conv_spec);
    const size_t uStringAt = uTypesAt + uParms;
    const size_t uPlanAt = round_up(uStringAt + uStringSize, alignof(format_plan));
    const size_t uPiecesAt = uPlanAt + sizeof(format_plan); // every record needs these two
    const size_t uConversionsAt = uPiecesAt + (uConvs + 1) * sizeof(format_piece);
    const size_t uTextAt = uConversionsAt + uConvs * sizeof(conversion);

    auto* const pBlock = static_cast<std::byte*>(std::malloc(uTextAt + uStringSize + PADDED_TEXT));
    if (pBlock == nullptr)
        return nullptr;
    auto* const pEntry = new (pBlock) format_entry{};
    pEntry->block_id = -1;
    pEntry->properties = scan.mode == numbering::numbered ? FORMAT_NUMBERED_PARMS : 0;
    pEntry->numParms = scan.numParms;
    pEntry->numConvs = scan.numConvs;
    pEntry->pConvSpecs = reinterpret_cast<conv_spec*>(pBlock + uConvsAt);
    std::uninitialized_copy_n(scan.convSpecs, uConvs, pEntry->pConvSpecs);
    pEntry->pParmTypes = reinterpret_cast<parm_type_t*>(pBlock + uTypesAt);
    std::uninitialized_copy_n(scan.parmTypes, uParms, pEntry->pParmTypes);
    pEntry->pString = reinterpret_cast<char*>(pBlock + uStringAt);
    std::memcpy(pEntry->pString, scan.pString, uStringSize);
    pEntry->pPlan = new (pBlock + uPlanAt) format_plan{};
    pEntry->pPlan->pConversions = reinterpret_cast<conversion*>(pBlock + uConversionsAt);
    std::uninitialized_copy_n(scan.conversions, uConvs, pEntry->pPlan->pConversions);
    pEntry->pPlan->pPieces = reinterpret_cast<format_piece*>(pBlock + uPiecesAt);
    lay_out_plan(*pEntry, reinterpret_cast<char*>(pBlock + uTextAt));
    std::memset(pBlock + uTextAt + uStringSize, 0, PADDED_TEXT);
    return pEntry;
}

} // namespace

int parse_parm_number(const char** ppFormat, int maxParms, int lineNumber) {
    const char* pText = *ppFormat;
    int64_t number = 0;
    int numDigits = 0;
    for (; numDigits < MAX_NUMBER_DIGITS && is_digit(*pText); ++numDigits)
        number = number * 10 + (*pText++ - '0');
    if (numDigits == 0 || *pText != '$') {
        output_err_message(
            "%s: 2625-118 Format error on line %d. Parameter number expected in format.\n",
            anchor.pProgName, lineNumber);
        return -1;
    }
    *ppFormat = pText + 1;
    if (number >= maxParms)
        return refuse_too_many_parms(lineNumber);
    return static_cast<int>(number) - 1;
}

format_entry* parse_format_string(const char* pString, template_file* pFile) {
    format_scan scan;
    scan.pString = pString;
    scan.pNext = pString;
    scan.lineNumber = pFile != nullptr ? pFile->lineNumber : 1;
    scan.mode = numbering::undecided;
    scan.numParms = 0;
    scan.numConvs = 0;
    if (!scan_format(scan))
        return nullptr;

    format_entry* const pEntry = make_entry(scan);
    if (pEntry != nullptr && pFile != nullptr) {
        pEntry->pFile = pFile;
        pEntry->pNext = pFile->pFormats;
        pFile->pFormats = pEntry;
    }
    return pEntry;
}
