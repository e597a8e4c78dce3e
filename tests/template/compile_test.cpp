#include "compile.h"

#include "template_support.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <random>

namespace {

constexpr const char* NUMBER_EXPECTED =
    "2625-118 Format error on line 7. Parameter number expected in format.";
constexpr const char* TOO_MANY = "2625-119 Format error on line 7. Too many parameters.";
constexpr const char* UNREPRESENTABLE =
    "2625-121 Format error on line 7. Format string cannot be represented.";

std::string bad_letter(char letter) {
    return std::string("2625-120 Format error on line 7. Invalid data type ") + letter +
           " specified.";
}

std::string repeated(int count, const std::string& text) {
    std::string all;
    while (count-- > 0)
        all += text;
    return all;
}

/// Compiles for a template on line 7: the dump of the entry, the message of a
/// refusal, or "refused" when nothing was said.
std::string compiled(const std::string& format) {
    template_file file{};
    file.lineNumber = 7;
    format_entry* pEntry = nullptr;
    const std::string messages =
        joined_messages_of([&] { pEntry = parse_format_string(format.c_str(), &file); });
    EXPECT_EQ(file.pFormats, pEntry) << format;
    if (pEntry == nullptr)
        return messages.empty() ? "refused" : messages;
    EXPECT_EQ(messages, "");
    EXPECT_EQ(pEntry->pFile, &file);
    EXPECT_STREQ(pEntry->pString, format.c_str());
    std::string dump = dump_format(*pEntry);
    std::free(pEntry);
    return dump;
}

struct compile_case {
    std::string format;
    std::string expected;
};

void expect_compiled(const std::vector<compile_case>& cases) {
    for (const compile_case& test : cases)
        EXPECT_EQ(compiled(test.format), test.expected) << test.format.substr(0, 80);
}

class Compile : public testing::Test {
protected:
    void SetUp() override {
        anchor.pProgName = "kelvo";
    }
};

TEST_F(Compile, SequentialParametersComeInOrderValueBeforeWidthAndPrecision) {
    expect_compiled({
        {"", "seq []"},
        {"plain 100%% text", "seq []"},
        {"%d", "seq [INT] 0+2:0"},
        {"%*.*f", "seq [DOUBLE INT INT] 0+5:0 w1:1 p3:2"},
        {"a%-'+ #0BNJ5.3ldb%.*s", "seq [LONG STRING INT] 1+15:0 17+4:1 p2:2"},
        {"%%%d%%1$d", "seq [INT] 2+2:0"}, // "%%" does not decide the mode
        {"%5.d%.d%1d", "seq [INT INT INT] 0+4:0 4+3:1 7+3:2"},
        {repeated(128, "%d").c_str(), "seq [" + repeated(127, "INT ") + "INT]" +
                                          [] {
                                              std::string all;
                                              for (int i = 0; i < 128; ++i)
                                                  all += " " + std::to_string(2 * i) +
                                                         "+2:" + std::to_string(i);
                                              return all;
                                          }()},
    });
}

TEST_F(Compile, LetterAndLengthGiveTheType) {
    expect_compiled({
        {"%d%i%o%u%x%X", "seq [INT INT UINT UINT UINT UINT] 0+2:0 2+2:1 4+2:2 6+2:3 8+2:4 10+2:5"},
        {"%hd%ld%lld%Ld", "seq [SHORT LONG LLONG INT] 0+3:0 3+3:1 6+4:2 10+3:3"},
        {"%hx%lo%llu%LX", "seq [USHORT ULONG ULLONG UINT] 0+3:0 3+3:1 6+4:2 10+3:3"},
        {"%e%E%f%g%G", "seq [DOUBLE DOUBLE DOUBLE DOUBLE DOUBLE] 0+2:0 2+2:1 4+2:2 6+2:3 8+2:4"},
        {"%hf%lf%llf%Lf", "seq [FLOAT DOUBLE DOUBLE LDOUBLE] 0+3:0 3+3:1 6+4:2 10+3:3"},
        {"%c%C%s%S%hs", "seq [UCHAR UCHAR STRING STRING STRING] 0+2:0 2+2:1 4+2:2 6+2:3 8+3:4"},
        {"%p%r%z%T", "seq [ULONG HANDLE REST TRACEID] 0+2:0 2+2:1 4+2:2 6+2:3"},
    });
    for (const char letter : std::string("naAFtkq$\xE9\x01"))
        EXPECT_EQ(compiled(std::string("%") + letter), bad_letter(letter));
    EXPECT_EQ(compiled("%hhd"), bad_letter('h'));
    EXPECT_EQ(compiled("%llld"), bad_letter('l'));
    EXPECT_EQ(compiled("%-%"), bad_letter('%'));
    for (const char* format : {"%", "x%5", "%-", "%.", "%*", "%l", "%.*"})
        EXPECT_EQ(compiled(format), bad_letter('\0')) << format;
}

TEST_F(Compile, NumberedParametersAreNamedAndAllUsed) {
    expect_compiled({
        {"%2$s %1$d", "num [INT STRING] 0+4:1 5+4:0"},
        {"%1$s%1$d", "num [INT] 0+4:0 4+4:0"}, // the last use gives the type
        {"%1$s%2$*1$d", "num [INT INT] 0+4:0 4+7:1 w3:0"},
        {"%1$*1$s", "num [STRING] 0+7:0 w3:0"},
        {"%3$-*1$.*2$f", "num [INT INT DOUBLE] 0+12:2 w4:0 p8:1"},
        {"%01$d", "num [INT] 0+5:0"},
        {"%000000000000001$d", "num [INT] 0+18:0"},
        {"%0000000000000001$d", NUMBER_EXPECTED}, // 16 digits
        {"%1$d%d", NUMBER_EXPECTED},
        {"%1$d%5d", NUMBER_EXPECTED},
        {"%1$d%", NUMBER_EXPECTED},
        {"%1$*d", NUMBER_EXPECTED},
        {"%1$.*2d", NUMBER_EXPECTED},
        {"%1$", bad_letter('\0')},
        {"%d%1$d", bad_letter('$')},
        {"%0$d", "refused"},
        {"%1$*0$d", "refused"},
        {"%128$d", TOO_MANY},
        {"%999999999999999$d", TOO_MANY},
        {"%2$d", "2625-122 Format error on line 7. Argument 1 is not referenced in format string."},
        {"%1$d%4$d%3$d",
         "2625-122 Format error on line 7. Argument 2 is not referenced in format string."},
        {"%127$d", "2625-122 Format error on line 7. Argument 1 is not referenced in format "
                   "string."},
    });
}

TEST_F(Compile, LimitsAreRefused) {
    const std::string most = repeated(127, "%d");
    const std::string flags(252, '-');
    expect_compiled({
        {most + "%*d", TOO_MANY},
        {most + "%.*d", TOO_MANY},
        {most + "%d%d", TOO_MANY},
        {repeated(129, "%1$d"), UNREPRESENTABLE},
        {"%" + flags + "-d", "seq [INT] 0+255:0"},
        {"%" + flags + "--d", UNREPRESENTABLE},
        {"%" + flags + "-----*d", UNREPRESENTABLE},
        {std::string(65535, ' ') + "%d", "seq [INT] 65535+2:0"},
        {std::string(65536, ' ') + "%d", UNREPRESENTABLE},
        {std::string(65536, ' ') + "%q", bad_letter('q')},
        {std::string(1048575, '%'), bad_letter('\0')},
    });
    EXPECT_TRUE(compiled(repeated(128, "%1$d")).starts_with("num [INT] 0+4:0 4+4:0"));
}

TEST_F(Compile, EntryIsOneBlockInOrder) {
    template_file file{};
    format_entry* const pFirst = parse_format_string("%d %c%*d", &file);
    format_entry* const pSecond = parse_format_string("x", &file);
    ASSERT_TRUE(pFirst && pSecond);
    EXPECT_EQ(file.pFormats, pSecond);
    EXPECT_EQ(pSecond->pNext, pFirst);
    const char* const pBlock = reinterpret_cast<char*>(pFirst);
    EXPECT_EQ(reinterpret_cast<char*>(pFirst->pConvSpecs), pBlock + sizeof(format_entry));
    EXPECT_EQ(reinterpret_cast<char*>(pFirst->pParmTypes), pBlock + sizeof(format_entry) + 3 * 8);
    EXPECT_EQ(pFirst->pString, pBlock + sizeof(format_entry) + 3 * 8 + 4);
    std::free(pFirst);
    std::free(pSecond);
}

TEST_F(Compile, WithoutTemplateErrorsAreOnLineOne) {
    EXPECT_EQ(joined_messages_of([] { EXPECT_EQ(parse_format_string("%q", nullptr), nullptr); }),
              "2625-120 Format error on line 1. Invalid data type q specified.");
}

TEST_F(Compile, MemoryExhaustionIsSilentAndLeavesTheTemplate) {
    template_file file{};
    EXPECT_EQ(joined_messages_of([&] {
                  const allocation_limit none(0);
                  EXPECT_EQ(parse_format_string("%d", &file), nullptr);
              }),
              "");
    EXPECT_EQ(file.pFormats, nullptr);
}

} // namespace
