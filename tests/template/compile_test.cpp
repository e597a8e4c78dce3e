#include "compile.h"

#include "template_support.h"

#include <gtest/gtest.h>

#include <cstdlib>
#include <string>
#include <vector>

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

/// Compiles for a template on line 7: the types of the parameters, the message of a
/// refusal, or "refused" when nothing was said.
std::string compiled(const std::string& format) {
    static constexpr std::string_view TYPES[PARM_BASE_MASK + 1] = {
        "?",       "CHAR",   "SHORT",  "INT",   "LONG", "LLONG",  "DOUBLE",
        "LDOUBLE", "STRING", "HANDLE", "FLOAT", "REST", "TRACEID"};
    template_file file{};
    file.lineNumber = 7;
    format_entry* pEntry = nullptr;
    std::string result = messages_of([&] { pEntry = parse_format_string(format.c_str(), &file); });
    EXPECT_EQ(file.pFormats, pEntry) << format;
    if (pEntry == nullptr)
        return result.empty() ? "refused" : result;
    EXPECT_STREQ(pEntry->pString, format.c_str());
    for (int i = 0; i < pEntry->numParms; ++i) {
        const parm_type_t type = pEntry->pParmTypes[i];
        result += i == 0 ? "" : " ";
        result += type & PARM_UNSIGNED ? "U" : "";
        result += TYPES[type & PARM_BASE_MASK];
    }
    std::free(pEntry);
    return result;
}

/// Formats and what compiled() makes of them.
void expect_compiled(const std::vector<std::pair<std::string, std::string>>& cases) {
    for (const auto& [format, expected] : cases)
        EXPECT_EQ(compiled(format), expected) << format.substr(0, 80);
}

TEST(Compile, LetterAndLengthGiveTheType) {
    expect_compiled({
        {"%d%i%o%u%x%X", "INT INT UINT UINT UINT UINT"},
        {"%hd%ld%lld%Ld", "SHORT LONG LLONG INT"},
        {"%hx%lo%llu%LX", "USHORT ULONG ULLONG UINT"},
        {"%e%E%f%g%G", "DOUBLE DOUBLE DOUBLE DOUBLE DOUBLE"},
        {"%hf%lf%llf%Lf", "FLOAT DOUBLE DOUBLE LDOUBLE"},
        {"%c%C%s%S%hs", "UCHAR UCHAR STRING STRING STRING"},
        {"%p%r%z%T", "ULONG HANDLE REST TRACEID"},
    });
    for (const char letter : std::string("naAFtkq$\xE9\x01"))
        EXPECT_EQ(compiled(std::string("%") + letter), bad_letter(letter));
    EXPECT_EQ(compiled("%hhd"), bad_letter('h'));
    EXPECT_EQ(compiled("%llld"), bad_letter('l'));
    EXPECT_EQ(compiled("%-%"), bad_letter('%'));
    for (const char* format : {"%", "x%5", "%-", "%.", "%*", "%l", "%.*"})
        EXPECT_EQ(compiled(format), bad_letter('\0')) << format;
}

TEST(Compile, NumberedParametersAreNamedAndAllUsed) {
    expect_compiled({
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

TEST(Compile, LimitsAreRefused) {
    const std::string most = repeated(127, "%d");
    const std::string flags(252, '-');
    expect_compiled({
        {most + "%d", repeated(127, "INT ") + "INT"},
        {most + "%*d", TOO_MANY},
        {most + "%.*d", TOO_MANY},
        {most + "%d%d", TOO_MANY},
        {repeated(128, "%1$d"), "INT"},
        {repeated(129, "%1$d"), UNREPRESENTABLE},
        {"%" + flags + "-d", "INT"},
        {"%" + flags + "--d", UNREPRESENTABLE},
        {"%" + flags + "-----*d", UNREPRESENTABLE},
        {std::string(65535, ' ') + "%d", "INT"},
        {std::string(65536, ' ') + "%d", UNREPRESENTABLE},
        {std::string(65536, ' ') + "%q", bad_letter('q')},
        {std::string(1048575, '%'), bad_letter('\0')},
    });
}

} // namespace
