#include "parse.h"

#include "template_file.h"
#include "template_support.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <vector>

namespace {

using namespace std::string_literals;

/// A text, the entries that it gives, oldest first, each as "id:text" or
/// "id/block:text", and what is said about it.
struct parse_case {
    std::string text;
    std::string entries;
    std::string messages;
};

void expect_parsed(const std::vector<parse_case>& cases) {
    for (const parse_case& test : cases) {
        const template_owner pTemplate = make_template("ABCD");
        const file_owner pFile(
            fmemopen(const_cast<char*>(test.text.data()), test.text.size(), "r"));
        int insufficient_resources = -1;
        const std::string messages = messages_of([&] {
            EXPECT_EQ(
                parse_template_file(pTemplate.get(), "f.tpl", pFile.get(), &insufficient_resources),
                0);
        });
        std::string entries;
        for (const format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext) {
            const std::string block =
                pEntry->block_id == -1 ? "" : "/" + std::to_string(pEntry->block_id);
            entries = std::to_string(pEntry->trace_id) + block + ":" + pEntry->pString +
                      (entries.empty() ? "" : " ") + entries;
        }
        EXPECT_EQ(entries, test.entries) << test.text;
        EXPECT_EQ(messages, test.messages) << test.text;
        EXPECT_EQ(insufficient_resources, 0) << test.text;
    }
}

std::string two_ids(int line) {
    return "2625-123 Syntax error on line " + std::to_string(line) +
           " of \"f.tpl\", two trace ids in a row.";
}

std::string unrecognized(char ch, int line) {
    return std::string("2625-124 Unrecognized character ") + ch + " found on line " +
           std::to_string(line) + " of file f.tpl";
}

std::string invalid(const std::string& rest, int line) {
    return "2625-126 Invalid string \"" + rest + "\" found on line " + std::to_string(line) +
           " of file f.tpl.";
}

std::string too_long_id(int line) {
    return "2625-127 Trace id or block id string on line " + std::to_string(line) +
           " of file f.tpl is too long to be parsed.";
}

TEST(Parse, EntriesJoinTheirStrings) {
    expect_parsed({
        {"", "", ""},
        {" \t\v\f\r\n# only a comment\n#and one without an end", "", ""},
        {"1 \"a\"", "1:a", ""},
        {"1 \"a\" # comment \"x\" 2\n\n\"b\"\"c\" 2\n\"d\"\n", "1:abc 2:d", ""},
        {"1 \"a#\nb\" x", "1:a#\nb", unrecognized('x', 1)},
        {"1:0 \"a\"1:7 \"b\"1 \"c\" 1:0 \"d\"", "1/0:a 1/7:b 1:c 1/0:d", ""},
        {"1: \"a\"", "1/0:a", ""},
        {"\"before\" 1 \"a\"", "1:a", ""},
        {"1 \"\" \"a\"", "1:a", ""},
        {"1 \"a\0b\" 2 \"\0\""s, "1:a 2:", ""}, // a NUL ends the compiled text
        {"1 \"a\" x\n\"b\"", "1:ab", unrecognized('x', 0)},
    });
}

TEST(Parse, EscapesAreReplacedOnceAndOthersStay) {
    expect_parsed({
        {R"(1 "\a\b\f\n\r\t\v\?\"\\")", "1:\a\b\f\n\r\t\v?\"\\", ""},
        {R"(1 "\\n\\\n\"")", "1:\\n\\\n\"", ""},
        {"1 \"\\0\\x41\\\n\\q\\'\"", "1:\\0\\x41\\\n\\q\\'", ""},
        {R"(1 "a\\" "n")", "1:a\\n", ""}, // no escape reaches into the next string
    });
}

TEST(Parse, IdsAreNumbersOfAutomaticBase) {
    expect_parsed({
        {"010 \"a\" 0x1F \"b\" 0xaBc \"c\" 0 \"d\"", "8:a 31:b 2748:c 0:d", ""},
        {"0xFFFFFFFE \"a\" 0x100000005 \"b\" 4294967303 \"c\"", "-2:a 5:b 7:c", ""},
        {"0xFFFFFFFF \"a\" 4294967295 \"b\" 0xFFFFFFFFFFFFFFFFF \"c\" 7 \"d\"", "7:d", ""},
        {"9223372036854775807 \"a\" 01777777777777777777770 \"b\" 7 \"d\"", "7:d", ""},
        {"0x7FFFFFFFFFFFFFF0 \"a\" 9223372036854775806 \"b\"", "-16:a -2:b", ""},
        {"1:0xFFFFFFFF \"a\" 1:99999999999999999999 \"b\"", "1:a 1:b", ""},
        {"08 \"a\" 7 \"b\"", "7:b", invalid("8", 0)},
        {"\n0x \"a\" 7 \"b\"", "7:b", invalid("x", 1)},
        {"12a \"a\" 0xx1 \"b\" 0x1x2 \"c\"", "",
         invalid("a", 0) + " | " + invalid("xx1", 0) + " | " + invalid("x2", 0)},
        {"0b1 \"a\"", "", invalid("b1", 0)},
        {"08:5 \"a\"", "5:a", invalid("8", 0)}, // the colon ended the id
        {"3:1x \"a\"", "3:a", invalid("x", 0)},
        {"3:abc \"a\"", "3:a", invalid("abc", 0)},
        {"3:x1\n\"a\"", "3:a", invalid("x1", 0)},
        {"0X1F \"a\"\n5 \"b\"", "5:b", two_ids(0)},
    });
    const std::string zeros(62, '0');
    expect_parsed({
        {zeros + "7 \"a\"", "7:a", ""},
        {"5 \"a\"\n" + zeros + "07 \"b\"\n6 \"c\"", "5:a 6:c", too_long_id(1)},
        {"5:" + zeros + "7 \"a\"", "5/7:a", ""},
        {"5:" + zeros + "07 \"a\"\n\"b\"", "5:b", too_long_id(0)},
    });
}

TEST(Parse, SyntaxErrorsSkipTheRestOfTheLine) {
    expect_parsed({
        {"1 2 \"a\"\n3 \"b\"", "3:b", two_ids(0)},
        {"1 \"\" 2 \"a\"", "", two_ids(0)},
        {"1\n\n", "", two_ids(2)},
        {"1 \"\"", "", two_ids(0)},
        {"1#x\n\"a\"", "1:a", unrecognized('x', 0)},
        {"\n1\"x\"\n\"a\"", "1:a", unrecognized('x', 1)},
        {"1 \"a\"\n$ 2 \"b\"", "1:a", unrecognized('$', 1)},
        {"\xE9\n\x85\n1 \"a\"", "1:a", unrecognized('\xE9', 0) + " | " + unrecognized('\x85', 1)},
        {"\0"s, "", unrecognized('\0', 0)},
        {"1 \"a\" 2 \"b", "1:a",
         "2625-129 End of file \"f.tpl\" encountered before end of string."},
        {"1 \"a\\\"", "", "2625-129 End of file \"f.tpl\" encountered before end of string."},
        {"1 \"a\" 2", "1:a", "2625-130 Trace id was not completed prior to end of file \"f.tpl\"."},
        {"1 \"a\" 2:", "1:a",
         "2625-131 Block id was not completed prior to end of file \"f.tpl\"."},
    });
}

TEST(Parse, FormatStringLimit) {
    const std::string longest(1048575, 'a');
    const std::string tooLong = "2625-125 Format string is too long on line 0 of f.tpl.";
    expect_parsed({
        {"1 \"" + longest + "\" 2 \"b\"", "1:" + longest + " 2:b", ""},
        {"1 \"" + longest + "a\" \"x\"\n2 \"b\"\n3 \"c\"", "3:c", tooLong + " | " + two_ids(1)},
        {"1 \"" + longest + "\" \"aa\n\"b\"\n", "1:b", tooLong},
    });
    EXPECT_EQ(anchor.lenFormatBuffer, 1048576);
}

} // namespace
