// Message texts of error blocks.
//
// A message text is a printf format, but who wrote it and who supplies the
// arguments are different parties, and both come from files. So the format is
// never handed to printf: each conversion is taken apart, tied to one argument
// of the block, and printed with a conversion made here for the type that
// this argument has. What cannot be tied to an argument stays in the text as
// written, "%n" included, which is no conversion at all.
//
// A '*' takes its width or precision from an argument of an integer type, in
// order before the value or by number ("%3$*1$d"). When that argument is not
// there or is of another type, the whole conversion stays as written.
//
// A text has at most MAX_MESSAGE_TEXT characters, and a width or precision
// above that counts as that: no text can ask for more memory or time.

#include "catalogue.h"
#include "kv_cu.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <span>
#include <string_view>

namespace {

constexpr size_t MAX_MESSAGE_TEXT = 65'535;

/// The text as it grows.
class message_text {
public:
    void add(std::string_view piece) {
        piece = piece.substr(0, MAX_MESSAGE_TEXT - uLength);
        piece.copy(text + uLength, piece.size());
        uLength += piece.size();
    }

    /// Adds what printf makes of the given conversion, width, precision and value.
    template <class T>
    void add_formatted(const char* pConversion, int iWidth, int iPrecision, T value) {
        const int iLength = snprintf(text + uLength, MAX_MESSAGE_TEXT + 1 - uLength, pConversion,
                                     iWidth, iPrecision, value);
        if (iLength > 0)
            uLength = std::min(uLength + static_cast<size_t>(iLength), MAX_MESSAGE_TEXT);
    }

    bool is_full() const {
        return uLength == MAX_MESSAGE_TEXT;
    }

    /// A copy in a heap block, or null when memory ran out.
    char* copy() {
        text[uLength] = '\0';
        return strdup(text);
    }

private:
    char text[MAX_MESSAGE_TEXT + 1]; ///< not set up: most texts need little of it
    size_t uLength = 0;
};

/// A width or a precision of a conversion.
struct field_size {
    bool bGiven = false;
    bool bStar = false;
    size_t uNumber = 0; ///< the size, or with bStar the argument number; 0: next
};

/// A conversion of a message text, taken apart.
struct message_conversion {
    std::string_view text; ///< from '%' through the letter
    size_t uNumber = 0;    ///< of the argument, from 1; 0: the next one
    char flags[8] = "";    ///< each flag once
    field_size width;
    field_size precision;
    char letter = '\0';
};

/// How an argument type is printed; a row per cu_error_arg_type.
struct argument_form {
    std::string_view letters; ///< letters that print the type; the first is the plain one
    const char* pLength;      ///< its length modifier
};
constexpr argument_form argumentForms[] = {
    {"diouxXc", ""},  // CU_ERROR_ARG_INT
    {"diouxX", "l"},  // CU_ERROR_ARG_LONG
    {"diouxX", "ll"}, // CU_ERROR_ARG_LONG_LONG
    {"feEFgGaA", ""}, // CU_ERROR_ARG_DOUBLE
    {"", ""},         // CU_ERROR_ARG_RESERVED: has no text
    {"s", ""},        // CU_ERROR_ARG_CHAR_STR
    {"p", ""},        // CU_ERROR_ARG_VOID_PTR
};
static_assert(std::size(argumentForms) == CU_ERROR_ARG_VOID_PTR + 1);

bool is_one_of(char ch, std::string_view set) {
    return set.find(ch) != std::string_view::npos;
}

/// Reads text from its front.
class text_reader {
public:
    explicit text_reader(std::string_view whole) : rest(whole) {}

    char peek() const {
        return rest.empty() ? '\0' : rest.front();
    }

    bool take(char ch) {
        if (rest.empty() || rest.front() != ch)
            return false;
        rest.remove_prefix(1);
        return true;
    }

    /// A decimal number, 0 when there is none; large ones stop growing.
    size_t take_number() {
        size_t uNumber = 0;
        for (; peek() >= '0' && peek() <= '9'; rest.remove_prefix(1))
            uNumber = std::min(uNumber * 10 + static_cast<size_t>(peek() - '0'), uLargest);
        return uNumber;
    }

    /// A number and its '$'; 0 and nothing taken when that is not what follows.
    size_t take_argument_number() {
        const std::string_view before = rest;
        const size_t uNumber = take_number();
        if (uNumber != 0 && take('$'))
            return uNumber;
        rest = before;
        return 0;
    }

    field_size take_size() {
        if (take('*'))
            return {.bGiven = true, .bStar = true, .uNumber = take_argument_number()};
        const bool bGiven = peek() >= '0' && peek() <= '9';
        return {.bGiven = bGiven, .bStar = false, .uNumber = take_number()};
    }

    size_t left() const {
        return rest.size();
    }

private:
    static constexpr size_t uLargest = UINT32_MAX;
    std::string_view rest;
};

/// Takes the conversion at the front of `text` apart. Returns false when the
/// '%' there begins none.
bool parse_conversion(std::string_view text, message_conversion* pConversion) {
    text_reader reader(text.substr(1));
    pConversion->uNumber = reader.take_argument_number();
    for (char ch; is_one_of(ch = reader.peek(), "-+ #0'") && reader.take(ch);)
        if (!strchr(pConversion->flags, ch))
            pConversion->flags[strlen(pConversion->flags)] = ch;
    pConversion->width = reader.take_size();
    if (reader.take('.')) {
        pConversion->precision = reader.take_size();
        pConversion->precision.bGiven = true;
    }
    for (char ch; is_one_of(ch = reader.peek(), "hlLqjzt");)
        reader.take(ch);
    pConversion->letter = reader.peek();
    if (!is_one_of(pConversion->letter, "diouxXcCeEfFgGaAsSp") || !reader.take(reader.peek()))
        return false;
    pConversion->text = text.substr(0, text.size() - reader.left());
    return true;
}

/// The arguments of the block, handed out in order or by number.
class argument_list {
public:
    explicit argument_list(const cu_error_t& block)
        : args(block.cu_args, block.cu_args ? block.cu_arg_cnt : 0) {}

    /// Argument `uNumber` counted from 1, the next one in order for 0; null
    /// when there is none.
    const cu_error_arg_t* take(size_t uNumber) {
        const size_t uIndex = uNumber ? uNumber - 1 : uNext++;
        return uIndex < args.size() ? &args[uIndex] : nullptr;
    }

    /// Stores the value of a width or precision. Returns false when its '*' has
    /// no argument of an integer type.
    bool take_size(const field_size& size, int64_t* pValue) {
        *pValue = static_cast<int64_t>(size.uNumber);
        if (!size.bStar)
            return true;
        const cu_error_arg_t* pArg = take(size.uNumber);
        if (!pArg)
            return false;
        const bool bInt = pArg->cu_arg_type == CU_ERROR_ARG_INT;
        *pValue = bInt ? pArg->cu_arg_value.cu_arg_int : pArg->cu_arg_value.cu_arg_long_long;
        return bInt || pArg->cu_arg_type == CU_ERROR_ARG_LONG ||
               pArg->cu_arg_type == CU_ERROR_ARG_LONG_LONG;
    }

private:
    std::span<const cu_error_arg_t> args;
    size_t uNext = 0;
};

/// Fits a width or precision into the limit of the text.
int bounded_size(int64_t iSize) {
    constexpr auto iLimit = static_cast<int64_t>(MAX_MESSAGE_TEXT);
    return static_cast<int>(std::clamp(iSize, -iLimit, iLimit));
}

void add_argument(message_text& text, const message_conversion& conversion, int iWidth,
                  int iPrecision, const cu_error_arg_t& arg) {
    const argument_form& form = argumentForms[arg.cu_arg_type];
    const char letter =
        is_one_of(conversion.letter, form.letters) ? conversion.letter : form.letters.front();
    char plain[24];
    snprintf(plain, sizeof(plain), "%%%s*.*%s%c", conversion.flags,
             letter == 'c' ? "" : form.pLength, letter);

    const auto& value = arg.cu_arg_value;
    switch (arg.cu_arg_type) {
    case CU_ERROR_ARG_INT:
        if (letter == 'c' && static_cast<char>(value.cu_arg_int) == '\0')
            text.add_formatted("%*.*s", iWidth, iPrecision, ""); // a NUL would end the text
        else
            text.add_formatted(plain, iWidth, iPrecision, value.cu_arg_int);
        break;
    case CU_ERROR_ARG_LONG:
        text.add_formatted(plain, iWidth, iPrecision, static_cast<long>(value.cu_arg_long));
        break;
    case CU_ERROR_ARG_LONG_LONG:
        text.add_formatted(plain, iWidth, iPrecision,
                           static_cast<long long>(value.cu_arg_long_long));
        break;
    case CU_ERROR_ARG_DOUBLE:
        text.add_formatted(plain, iWidth, iPrecision, value.cu_arg_double);
        break;
    case CU_ERROR_ARG_CHAR_STR: {
        // The precision keeps printf from walking a string that is cut anyway.
        const char* pString = value.cu_arg_char_str ? value.cu_arg_char_str : "";
        const int iMost = iPrecision >= 0 ? iPrecision : static_cast<int>(MAX_MESSAGE_TEXT);
        text.add_formatted(plain, iWidth, iMost, pString);
        break;
    }
    case CU_ERROR_ARG_VOID_PTR:
        text.add_formatted(plain, iWidth, iPrecision, value.cu_arg_void_ptr);
        break;
    default:
        break;
    }
}

bool has_text(const cu_error_arg_t& arg) {
    return arg.cu_arg_type >= 0 && arg.cu_arg_type <= CU_ERROR_ARG_VOID_PTR &&
           !argumentForms[arg.cu_arg_type].letters.empty();
}

void add_conversion(message_text& text, const message_conversion& conversion,
                    argument_list& arguments) {
    int64_t iWidth;
    int64_t iPrecision;
    // Each part takes its argument even when an earlier one is missing, so that
    // the conversions that follow still meet theirs.
    const bool bWidth = arguments.take_size(conversion.width, &iWidth);
    const bool bPrecision = arguments.take_size(conversion.precision, &iPrecision);
    const cu_error_arg_t* pArg = arguments.take(conversion.uNumber);
    if (!bWidth || !bPrecision || !pArg || !has_text(*pArg)) {
        text.add(conversion.text);
        return;
    }
    if (!conversion.precision.bGiven)
        iPrecision = -1;
    add_argument(text, conversion, bounded_size(iWidth), bounded_size(iPrecision), *pArg);
}

void add_message(message_text& text, std::string_view format, argument_list& arguments) {
    while (!format.empty() && !text.is_full()) {
        const size_t uLiteral = std::min(format.find('%'), format.size());
        text.add(format.substr(0, uLiteral));
        format.remove_prefix(uLiteral);
        if (format.empty())
            return;

        message_conversion conversion;
        if (format.starts_with("%%")) {
            text.add("%");
            format.remove_prefix(2);
        } else if (parse_conversion(format, &conversion)) {
            add_conversion(text, conversion, arguments);
            format.remove_prefix(conversion.text.size());
        } else {
            text.add("%");
            format.remove_prefix(1);
        }
    }
}

} // namespace

int cu_get_errmsg_1(const cu_error_t* errorBlk, char** message) {
    *message = nullptr;
    const heap_text pCatalogueText =
        copy_catalogue_text(errorBlk->cu_msg_cat, errorBlk->cu_msg_set, errorBlk->cu_msg_num);
    const char* pFormat = pCatalogueText ? pCatalogueText.get() : errorBlk->cu_msg_default;
    if (!pFormat)
        return -1;

    message_text text;
    argument_list arguments(*errorBlk);
    add_message(text, pFormat, arguments);
    *message = text.copy();
    return *message ? 0 : -1;
}

int cu_rel_errmsg_1(char* pMessage) {
    free(pMessage);
    return 0;
}
