// The parser of template files: a machine of five states that takes the file
// one character at a time, with one function per state. An error never ends the
// parse: the rest of the line is skipped and the machine goes on. Only a format
// string that does not compile, or exhausted memory, does.
//
// The characters of an id and those of a format string are counted by the same
// index. It is set back when an id ends, and left alone when a string ends:
// that is what joins the strings of one entry.
#include "parse.h"

#include "compile.h"
#include "digits.h"
#include "messages.h"

#include <cstdlib>
#include <limits>
#include <string_view>

namespace {

constexpr int32_t NO_TRACE_ID = -1; // so a trace id of 0xFFFFFFFF cannot be defined
constexpr int32_t NO_BLOCK_ID = -1;
constexpr size_t ID_TEXT_SIZE = 64;
constexpr size_t FIRST_FORMAT_BUFFER = 4096;
constexpr size_t MAX_FORMAT_BUFFER = 1048576;
constexpr std::string_view WHITE_SPACE = " \t\n\v\f\r"; // in every locale
constexpr std::string_view ID_CHARACTERS = "0123456789xabcdefABCDEF";
constexpr std::string_view ESCAPE_LETTERS = "abfnrtv?\"\\";
constexpr std::string_view ESCAPED_CHARACTERS = "\a\b\f\n\r\t\v?\"\\";
static_assert(ESCAPE_LETTERS.size() == ESCAPED_CHARACTERS.size());

enum class parse_state { between, skip_line, string, trace_id, block_id };

enum class parse_result { go_on, failed };

struct template_parser {
    template_file* pTemplate;
    const char* pFileName;
    int* p_insufficient_resources;
    parse_state state = parse_state::between;
    int32_t pendingTraceId = NO_TRACE_ID;
    int32_t pendingBlockId = 0;
    size_t uCollected = 0;   ///< characters in idText or in anchor.pFormatBuffer
    bool bBackslash = false; ///< the last character of the string may begin an escape
    char idText[ID_TEXT_SIZE];
};

constexpr bool contains(std::string_view set, char ch) {
    return set.find(ch) != std::string_view::npos;
}

size_t format_buffer_size() {
    return anchor.pFormatBuffer == nullptr ? 0 : static_cast<size_t>(anchor.lenFormatBuffer);
}

// ---------------------------------------------------------------------- ids

constexpr int digit_value(char ch) {
    if (is_digit(ch))
        return ch - '0';
    if (ch >= 'a' && ch <= 'f')
        return ch - 'a' + 10;
    if (ch >= 'A' && ch <= 'F')
        return ch - 'A' + 10;
    return std::numeric_limits<int>::max();
}

/// Converts the number at the start of `text`: hexadecimal after "0x" and a
/// digit, octal after "0", else decimal; too large a number becomes the largest.
/// Returns the text behind it; no text at all is the number 0. (strtoll would
/// also take "0b" for a prefix where the C library follows newer standards.)
constexpr std::string_view convert_id(std::string_view text, int64_t* pValue) {
    int64_t base = 10;
    if (text.size() > 2 && text.starts_with("0x") && digit_value(text[2]) < 16) {
        base = 16;
        text.remove_prefix(2);
    } else if (text.starts_with('0')) {
        base = 8;
    }
    constexpr int64_t LARGEST = std::numeric_limits<int64_t>::max();
    int64_t value = 0;
    while (!text.empty() && digit_value(text.front()) < base) {
        const int64_t digit = digit_value(text.front());
        value = value > (LARGEST - digit) / base ? LARGEST : value * base + digit;
        text.remove_prefix(1);
    }
    *pValue = value;
    return text;
}

/// Appends `ch` to the id text, which must not fill its buffer: the last byte is
/// for the NUL of the messages.
void collect_id_character(template_parser& parser, char ch) {
    if (parser.uCollected == ID_TEXT_SIZE - 1) {
        output_err_message("%s: 2625-127 Trace id or block id string on line %d of file %s is too "
                           "long to be parsed.\n",
                           anchor.pProgName, parser.pTemplate->lineNumber, parser.pFileName);
        parser.uCollected = 0;
        parser.state = parse_state::skip_line;
        return;
    }
    parser.idText[parser.uCollected++] = ch;
}

/// Ends the id text and converts it. False, after a message, when it is not
/// wholly a number.
bool finish_id(template_parser& parser, int32_t* pId) {
    parser.idText[parser.uCollected] = '\0';
    int64_t value = 0;
    const std::string_view rest = convert_id({parser.idText, parser.uCollected}, &value);
    parser.uCollected = 0;
    if (!rest.empty()) {
        output_err_message("%s: 2625-126 Invalid string \"%s\" found on line %d of file %s.\n",
                           anchor.pProgName, rest.data(), parser.pTemplate->lineNumber,
                           parser.pFileName);
        return false;
    }
    *pId = static_cast<int32_t>(static_cast<uint32_t>(value));
    return true;
}

// ------------------------------------------------------------------ strings

/// Makes room for one more character of the format string.
parse_result grow_format_buffer(template_parser& parser) {
    const size_t uSize = format_buffer_size();
    const size_t uNewSize = uSize == 0 ? FIRST_FORMAT_BUFFER : 2 * uSize;
    if (uNewSize > MAX_FORMAT_BUFFER) {
        output_err_message("%s: 2625-125 Format string is too long on line %d of %s.\n",
                           anchor.pProgName, parser.pTemplate->lineNumber, parser.pFileName);
        parser.uCollected = 0;
        parser.state = parse_state::skip_line;
        return parse_result::go_on;
    }
    auto* const pBuffer = static_cast<char*>(std::realloc(anchor.pFormatBuffer, uNewSize));
    if (pBuffer == nullptr) {
        *parser.p_insufficient_resources = 1;
        return parse_result::failed;
    }
    anchor.pFormatBuffer = pBuffer;
    anchor.lenFormatBuffer = static_cast<int32_t>(uNewSize);
    return parse_result::go_on;
}

/// Compiles the strings collected for the pending trace id.
parse_result compile_entry(template_parser& parser) {
    format_entry* const pEntry = parse_format_string(anchor.pFormatBuffer, parser.pTemplate);
    if (pEntry == nullptr)
        return parse_result::failed;
    pEntry->trace_id = parser.pendingTraceId;
    pEntry->block_id = parser.pendingBlockId;
    anchor.pFormatBuffer[0] = '\0';
    return parse_result::go_on;
}

void report_missing_string(const template_parser& parser) {
    output_err_message("%s: 2625-123 Syntax error on line %d of \"%s\", two trace ids in a row.\n",
                       anchor.pProgName, parser.pTemplate->lineNumber, parser.pFileName);
}

// ------------------------------------------------------------------- states

/// A digit between tokens: completes the pending entry and begins a trace id.
parse_result begin_trace_id(template_parser& parser, char digit) {
    const bool bPending = parser.pendingTraceId != NO_TRACE_ID;
    const bool bNoString = parser.uCollected == 0;
    if (bPending && !bNoString && compile_entry(parser) == parse_result::failed)
        return parse_result::failed;
    parser.pendingTraceId = NO_TRACE_ID;
    parser.pendingBlockId = NO_BLOCK_ID;
    if (bPending && bNoString) {
        report_missing_string(parser);
        parser.state = parse_state::skip_line;
        return parse_result::go_on;
    }
    parser.idText[0] = digit;
    parser.uCollected = 1;
    parser.state = parse_state::trace_id;
    return parse_result::go_on;
}

parse_result take_between(template_parser& parser, char ch) {
    if (is_digit(ch))
        return begin_trace_id(parser, ch);
    if (contains(WHITE_SPACE, ch))
        return parse_result::go_on;
    if (ch == '"') {
        parser.bBackslash = false;
        parser.state = parse_state::string;
        return parse_result::go_on;
    }
    if (ch != '#')
        output_err_message("%s: 2625-124 Unrecognized character %c found on line %d of file %s\n",
                           anchor.pProgName, ch, parser.pTemplate->lineNumber, parser.pFileName);
    parser.state = parse_state::skip_line;
    return parse_result::go_on;
}

/// A character that follows a stored backslash replaces it when the pair is an
/// escape; otherwise both stay.
void take_escaped(template_parser& parser, char ch) {
    parser.bBackslash = false;
    const size_t uEscape = ESCAPE_LETTERS.find(ch);
    if (uEscape != std::string_view::npos)
        anchor.pFormatBuffer[parser.uCollected - 1] = ESCAPED_CHARACTERS[uEscape];
    else
        anchor.pFormatBuffer[parser.uCollected++] = ch;
}

parse_result take_string(template_parser& parser, char ch) {
    if (parser.uCollected >= format_buffer_size()) {
        const parse_result result = grow_format_buffer(parser);
        if (result == parse_result::failed || parser.state != parse_state::string)
            return result;
    }
    if (parser.bBackslash) {
        take_escaped(parser, ch);
    } else if (ch == '"') {
        anchor.pFormatBuffer[parser.uCollected] = '\0';
        parser.state = parse_state::between;
    } else {
        anchor.pFormatBuffer[parser.uCollected++] = ch;
        parser.bBackslash = ch == '\\';
    }
    return parse_result::go_on;
}

void take_trace_id(template_parser& parser, char ch) {
    if (contains(ID_CHARACTERS, ch)) {
        collect_id_character(parser, ch);
        return;
    }
    parser.state = parse_state::between;
    if (finish_id(parser, &parser.pendingTraceId) && ch == ':')
        parser.state = parse_state::block_id;
}

void take_block_id(template_parser& parser, char ch) {
    if (contains(ID_CHARACTERS, ch)) {
        collect_id_character(parser, ch);
        return;
    }
    parser.state = parse_state::between;
    finish_id(parser, &parser.pendingBlockId);
}

parse_result take_character(template_parser& parser, char ch) {
    switch (parser.state) {
    case parse_state::between:
        return take_between(parser, ch);
    case parse_state::skip_line:
        if (ch == '\n')
            parser.state = parse_state::between;
        return parse_result::go_on;
    case parse_state::string:
        return take_string(parser, ch);
    case parse_state::trace_id:
        take_trace_id(parser, ch);
        return parse_result::go_on;
    case parse_state::block_id:
        take_block_id(parser, ch);
        return parse_result::go_on;
    }
    output_err_message("%s: 2625-128 Internal error encountered on line %d of file %s.\n",
                       anchor.pProgName, parser.pTemplate->lineNumber, parser.pFileName);
    parser.state = parse_state::skip_line;
    return parse_result::go_on;
}

parse_result take_end_of_file(template_parser& parser) {
    switch (parser.state) {
    case parse_state::trace_id:
        output_err_message("%s: 2625-130 Trace id was not completed prior to end of file \"%s\".\n",
                           anchor.pProgName, parser.pFileName);
        return parse_result::go_on;
    case parse_state::block_id:
        output_err_message("%s: 2625-131 Block id was not completed prior to end of file \"%s\".\n",
                           anchor.pProgName, parser.pFileName);
        return parse_result::go_on;
    case parse_state::string:
        output_err_message("%s: 2625-129 End of file \"%s\" encountered before end of string.\n",
                           anchor.pProgName, parser.pFileName);
        return parse_result::go_on;
    default:
        break;
    }
    if (parser.pendingTraceId == NO_TRACE_ID)
        return parse_result::go_on;
    if (parser.uCollected != 0)
        return compile_entry(parser);
    report_missing_string(parser);
    return parse_result::go_on;
}

} // namespace

int parse_template_file(template_file* pTemplateFile, const char* pFileName, FILE* pFile,
                        int* p_insufficient_resources) {
    template_parser parser;
    parser.pTemplate = pTemplateFile;
    parser.pFileName = pFileName;
    parser.p_insufficient_resources = p_insufficient_resources;
    *p_insufficient_resources = 0;
    int32_t& lineNumber = pTemplateFile->lineNumber;
    lineNumber = 0;
    for (int ch = getc_unlocked(pFile); ch != EOF; ch = getc_unlocked(pFile)) {
        if (take_character(parser, static_cast<char>(ch)) == parse_result::failed)
            return 1;
        if (ch == '\n' && lineNumber < std::numeric_limits<int32_t>::max())
            ++lineNumber;
    }
    return take_end_of_file(parser) == parse_result::failed ? 1 : 0;
}
