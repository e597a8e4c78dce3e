// Message texts: arguments by their own types, hostile texts and arguments, and
// catalogues made with gencat.

#include "kv_cu.h"
#include "temp_dir.h"

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstdlib>
#include <fstream>
#include <string>
#include <sys/stat.h>
#include <unistd.h>
#include <vector>

namespace {

cu_error_arg_t integer(int64_t iValue, int32_t iType = CU_ERROR_ARG_INT) {
    if (iType == CU_ERROR_ARG_INT)
        return {iType, 0, {.cu_arg_int = static_cast<int32_t>(iValue)}};
    return {iType, 0, {.cu_arg_long_long = iValue}};
}

cu_error_arg_t real(double value) {
    return {CU_ERROR_ARG_DOUBLE, 0, {.cu_arg_double = value}};
}

cu_error_arg_t string(const char* pString) {
    return {CU_ERROR_ARG_CHAR_STR, 0, {.cu_arg_char_str = pString}};
}

/// The message text of a block, or "(none)".
std::string message_of(const char* pCatalogue, int32_t iSet, int32_t iMessage, const char* pDefault,
                       std::vector<cu_error_arg_t> args = {}) {
    cu_error_t block{};
    block.cu_msg_cat = const_cast<char*>(pCatalogue);
    block.cu_msg_set = iSet;
    block.cu_msg_num = iMessage;
    block.cu_msg_default = const_cast<char*>(pDefault);
    block.cu_arg_cnt = static_cast<uint32_t>(args.size());
    block.cu_args = args.data();
    char* pMessage = nullptr;
    const int iResult = cu_get_errmsg_1(&block, &pMessage);
    EXPECT_EQ(iResult, pMessage ? 0 : -1);
    std::string text = pMessage ? pMessage : "(none)";
    EXPECT_EQ(cu_rel_errmsg_1(pMessage), 0);
    return text;
}

std::string text_of(const std::string& format, std::vector<cu_error_arg_t> args) {
    return message_of(nullptr, 0, 0, format.c_str(), std::move(args));
}

constexpr size_t MOST_TEXT = 65'535;

} // namespace

TEST(errmsg, arguments_go_by_their_own_types) {
    const struct {
        const char* pFormat;
        std::vector<cu_error_arg_t> args;
        const char* pText;
    } cases[] = {
        {"no arguments, 100%%", {}, "no arguments, 100%"},
        {"%s failed with %d", {string("open"), integer(-2)}, "open failed with -2"},
        {"%2$s: %1$d, %2$s", {integer(7), string("x")}, "x: 7, x"},
        {"%d %s", {string("a"), integer(5)}, "a 5"},
        {"%s %x", {integer(1LL << 40, CU_ERROR_ARG_LONG), integer(-1)}, "1099511627776 ffffffff"},
        {"%d|%hhx",
         {integer(INT64_MIN, CU_ERROR_ARG_LONG_LONG), integer(-1, CU_ERROR_ARG_LONG)},
         "-9223372036854775808|ffffffffffffffff"},
        {"%ld|%05s|%-6d|%.2d",
         {integer(3), integer(-3), string("ab"), real(2.345)},
         "3|-0003|ab    |2.35"},
        {"%.2s|%s|%s",
         {string("abc"), real(0.5), integer(0x10, CU_ERROR_ARG_VOID_PTR)},
         "ab|0.500000|0x10"},
        {"%*d|%-*d|%.*f",
         {integer(4), integer(1), integer(-3), integer(2), integer(1), real(0.25)},
         "   1|2  |0.2"},
        {"%2$*1$d|%2$.*1$d", {integer(3), integer(7)}, "  7|007"},
        {"%lc%c%ls", {integer('k'), integer(0), string("v")}, "kv"},
        // Without an argument, or without one that has a text, it stays.
        {"%d and %5s", {integer(1)}, "1 and %5s"},
        {"%3$d %0$d %99999999999999999999$d", {integer(1)}, "%3$d %0$d %99999999999999999999$d"},
        {"%d %d", {integer(9, CU_ERROR_ARG_RESERVED), integer(2)}, "%d 2"},
        {"%s %s", {integer(9, 77), integer(9, INT_MIN)}, "%s %s"},
        {"%*d %d", {string("w"), integer(1), integer(2)}, "%*d 2"},
        {"%*d", {integer(1)}, "%*d"},
        // No conversions at all.
        {"%n%hn%5$n %y 5% %", {integer(1), integer(2)}, "%n%hn%5$n %y 5% %"},
        {"%-%d%", {integer(1)}, "%-1%"},
        {"[%s|%3s|%.0s]", {string(nullptr), string(nullptr), string("x")}, "[|   |]"},
    };
    for (const auto& row : cases)
        EXPECT_EQ(text_of(row.pFormat, row.args), row.pText) << row.pFormat;
}

TEST(errmsg, texts_are_bounded_whatever_is_asked_for) {
    const std::string longText(100'000, 'x');
    std::string many;
    for (int i = 0; i < 50'000; i++)
        many += "%1$s";
    EXPECT_EQ(text_of(many, {string(longText.c_str())}), longText.substr(0, MOST_TEXT));
    EXPECT_EQ(text_of(longText, {}), longText.substr(0, MOST_TEXT));
    EXPECT_EQ(text_of("ab%.2147483647s", {string(longText.c_str())}).size(), MOST_TEXT);
    for (const char* pFormat : {"%2147483647d", "%99999999999999d", "%-2147483648s",
                                "%.2000000000f", "%2000000000.2000000000e", "%*d%*d"})
        EXPECT_EQ(
            text_of(pFormat, {integer(INT_MIN), integer(1), integer(INT_MAX), integer(2)}).size(),
            MOST_TEXT)
            << pFormat;
    EXPECT_EQ(text_of("%.2147483647f", {real(HUGE_VAL)}), "inf");
    EXPECT_EQ(text_of("%.*d|", {integer(INT_MIN), integer(3)}), "3|");
}

TEST(errmsg, catalogues_are_found_by_name_only) {
    const std::vector<cu_error_arg_t> args = {string("here"), integer(4)};
    EXPECT_EQ(message_of("no_such_catalogue", 1, 1, nullptr, args), "(none)");
    EXPECT_EQ(message_of("no_such_catalogue", 1, 1, "", args), "");

    const temp_dir dir;
    const std::string source = dir.file("texts");
    const std::string first = dir.file("catalogue_0");
    std::ofstream(source) << "$set 1\n3 from %s: %d\n$set 2\n3 second set\n";
    if (std::system(("gencat " + first + " " + source + " 2>/dev/null").c_str()) != 0)
        GTEST_SKIP() << "gencat is not installed";
    ASSERT_EQ(mkfifo(dir.file("fifo").c_str(), 0600), 0);
    setenv("NLSPATH", dir.file("%N").c_str(), 1);

    EXPECT_EQ(message_of("catalogue_0", 1, 3, "default", args), "from here: 4");
    EXPECT_EQ(message_of("catalogue_0", 2, 3, "default", args), "second set");
    const std::pair<int, int> noTexts[] = {{1, 4},       {3, 3}, {0, 3},  {-1, 3},     {INT_MAX, 3},
                                           {INT_MIN, 3}, {1, 0}, {1, -1}, {1, INT_MAX}};
    for (const auto& [iSet, iMessage] : noTexts)
        EXPECT_EQ(message_of("catalogue_0", iSet, iMessage, "default %d", args), "default here")
            << iSet << ' ' << iMessage;

    // A name is no path: not to the catalogue itself, and not to something that
    // would never finish opening.
    const std::string longName(5000, 'n');
    for (const std::string& name : {first, dir.file("fifo"), std::string("../catalogue_0"),
                                    std::string("./catalogue_0"), std::string(), longName})
        EXPECT_EQ(message_of(name.c_str(), 2, 3, "default"), "default") << name;

    // More catalogues than are kept open, each twice.
    const auto name_of = [](int i) { return "catalogue_" + std::to_string(i); };
    for (int i = 1; i < 100; i++)
        ASSERT_EQ(symlink(first.c_str(), dir.file(name_of(i)).c_str()), 0);
    for (int i = 1; i < 199; i++)
        EXPECT_EQ(message_of(name_of(1 + i % 99).c_str(), 2, 3, "default"), "second set");
    unsetenv("NLSPATH");
}
