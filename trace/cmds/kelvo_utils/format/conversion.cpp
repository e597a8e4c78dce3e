#include "conversion.h"

#include "digits.h"

#include <array>
#include <charconv>

namespace {

/// Numbers in a conversion text stop growing here, far above any int.
constexpr int64_t MAX_NUMBER = 1'000'000'000'000;

/// CONVERSION_* bit of a flag; 0 for other characters and for the flags that
/// are accepted but mean nothing.
constexpr uint8_t flag_bit(char ch) {
    switch (ch) {
    case '-':
        return CONVERSION_LEFT;
    case '+':
        return CONVERSION_PLUS;
    case ' ':
        return CONVERSION_SPACE;
    case '#':
        return CONVERSION_ALTERN;
    case '0':
        return CONVERSION_ZERO;
    case '\'':
        return CONVERSION_GROUP;
    default:
        return 0;
    }
}

constexpr bool is_dropped_flag(char ch) {
    return ch == 'B' || ch == 'N' || ch == 'J';
}

int decimal_length(int32_t iValue) {
    char digits[12];
    return static_cast<int>(std::to_chars(digits, std::end(digits), iValue).ptr - digits);
}

/// Walks over the text of one conversion and fills in what it finds. The
/// compiler has checked the syntax; past the end there are NULs.
class conversion_parser {
public:
    conversion_parser(std::string_view conversionText, bool bNumberedString, conversion* pResult)
        : text(conversionText), bNumbered(bNumberedString), pConversion(pResult) {}

    void skip_number() {
        if (!bNumbered)
            return;
        while (is_digit(peek()))
            uPosition++;
        if (peek() == '$')
            uPosition++;
    }

    void take_flags() {
        for (;; uPosition++) {
            if (const uint8_t uBit = flag_bit(peek())) {
                pConversion->uFlags |= uBit;
                pConversion->iRebuiltLength++;
            } else if (!is_dropped_flag(peek())) {
                return;
            }
        }
    }

    void take_width(int32_t iStarWidth) {
        if (!take('*')) {
            pConversion->iWidth = take_digits();
            return;
        }
        skip_number();
        pConversion->iRebuiltLength += decimal_length(iStarWidth);
        pConversion->iWidth = iStarWidth;
        if (iStarWidth < 0) {
            pConversion->iWidth = -pConversion->iWidth;
            pConversion->uFlags |= CONVERSION_LEFT;
        }
    }

    void take_precision(int32_t iStarPrecision) {
        if (!take('.'))
            return;
        if (!take('*')) {
            pConversion->iRebuiltLength++;
            pConversion->iPrecision = take_digits();
            return;
        }
        skip_number();
        if (iStarPrecision < 0)
            return;
        pConversion->iRebuiltLength += 1 + decimal_length(iStarPrecision);
        pConversion->iPrecision = iStarPrecision;
    }

    void take_modifier() {
        if (std::string_view("diouxX").find(text.back()) == text.npos)
            return;
        for (; peek() == 'h' || peek() == 'l'; uPosition++) {
            pConversion->uBits = peek() == 'h' ? 16 : 64;
            pConversion->iRebuiltLength++;
        }
    }

private:
    char peek() const {
        return uPosition < text.size() ? text[uPosition] : '\0';
    }

    bool take(char ch) {
        if (peek() != ch)
            return false;
        uPosition++;
        return true;
    }

    int64_t take_digits() {
        int64_t iNumber = 0;
        for (; is_digit(peek()); uPosition++) {
            pConversion->iRebuiltLength++;
            if (iNumber < MAX_NUMBER)
                iNumber = iNumber * 10 + (peek() - '0');
        }
        return iNumber;
    }

    std::string_view text;
    size_t uPosition = 1; // the '%'
    bool bNumbered;
    conversion* pConversion;
};

/// What kind of argument printf reads for a letter.
enum argument_class : uint8_t {
    ARGUMENT_NONE = 0,
    ARGUMENT_INTEGER = 0x01,
    ARGUMENT_CHARACTER = 0x02,
    ARGUMENT_POINTER = 0x04,
    ARGUMENT_REAL = 0x08,
    ARGUMENT_STRING = 0x10,
};

constexpr std::array<uint8_t, 128> make_classes_of_letters() {
    constexpr struct {
        std::string_view letters;
        argument_class argument;
    } classes[] = {
        {"diouxX", ARGUMENT_INTEGER}, {"cC", ARGUMENT_CHARACTER}, {"p", ARGUMENT_POINTER},
        {"eEfgG", ARGUMENT_REAL},     {"sS", ARGUMENT_STRING},
    };
    std::array<uint8_t, 128> table{};
    for (const auto& row : classes)
        for (const char letter : row.letters)
            table[static_cast<unsigned char>(letter)] = row.argument;
    return table;
}
constexpr auto classesOfLetters = make_classes_of_letters();

/// The classes as which a parameter can be passed, by base type. Characters and
/// short integers are passed as int, which "%c" and "%d" both read.
constexpr uint8_t classesOfType[PARM_BASE_MASK + 1] = {
    ARGUMENT_NONE,                         // 0
    ARGUMENT_INTEGER | ARGUMENT_CHARACTER, // PARM_CHAR
    ARGUMENT_INTEGER | ARGUMENT_CHARACTER, // PARM_SHORT
    ARGUMENT_INTEGER | ARGUMENT_CHARACTER, // PARM_INT
    ARGUMENT_INTEGER | ARGUMENT_POINTER,   // PARM_LONG
    ARGUMENT_INTEGER | ARGUMENT_POINTER,   // PARM_LONGLONG
    ARGUMENT_REAL,                         // PARM_DOUBLE
    ARGUMENT_REAL,                         // PARM_LONGDOUBLE
    ARGUMENT_STRING,                       // PARM_STRING
    ARGUMENT_NONE,                         // PARM_RESOURCE_HANDLE
    ARGUMENT_REAL,                         // PARM_FLOAT
};

} // namespace

conversion parse_conversion(std::string_view text, bool bNumbered, int32_t iStarWidth,
                            int32_t iStarPrecision) {
    conversion result;
    if (text.size() < 2)
        return result;
    const char letter = text.back();
    result.letter = letter == 'C' ? 'c' : letter == 'S' ? 's' : letter;
    if (text.size() == 2)
        return result;
    conversion_parser parser(text, bNumbered, &result);
    parser.skip_number();
    parser.take_flags();
    parser.take_width(iStarWidth);
    parser.take_precision(iStarPrecision);
    parser.take_modifier();
    return result;
}

bool conversion_fits(char letter, parm_type_t type) {
    const auto uLetter = static_cast<unsigned char>(letter);
    return uLetter < classesOfLetters.size() &&
           (classesOfLetters[uLetter] & classesOfType[type & PARM_BASE_MASK]) != 0;
}
