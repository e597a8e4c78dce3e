// Parameters of formats: where they are found, what they print, and that every
// number and string prints as printf would print it.

#include "format_text.h"

#include "compile.h"
#include "data_block.h"
#include "raw_trace.h"
#include "sink.h"
#include "stdout_stream.h"

#include <gtest/gtest.h>

#include <climits>
#include <clocale>
#include <cmath>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <memory>
#include <random>
#include <string>
#include <vector>

using testing::internal::CaptureStdout;
using testing::internal::GetCapturedStdout;
using namespace std::string_view_literals;

namespace {

using byte_vector = std::vector<std::byte>;

using entry_ptr = std::unique_ptr<format_entry, void (*)(void*)>;

entry_ptr compile(const std::string& format) {
    entry_ptr pEntry(parse_format_string(format.c_str(), nullptr), std::free);
    EXPECT_TRUE(pEntry) << format;
    return pEntry;
}

/// What `writes` sends to standard output.
std::string output_of(const std::function<void()>& writes) {
    CaptureStdout();
    writes();
    stdout_flush();
    return GetCapturedStdout();
}

/// What format_packed_parms does in one go in two steps, the second of which data
/// records share.
void write_listed(const format_entry* pEntry, trace_bytes* pRun, int bAddr64) {
    parm_list list;
    bld_parm_list_packed(pEntry, pRun, bAddr64, &list);
    format_parms(pEntry, &list, bAddr64);
}

using write_way = void (*)(const format_entry* pEntry, trace_bytes* pRun, int bAddr64);
constexpr write_way WAYS[] = {format_packed_parms, write_listed};

/// A format over a packed run, and the line that it writes.
struct packed_case {
    std::string format;
    byte_vector bytes;
    std::string text;
    size_t uLeft = 0; ///< bytes that no parameter takes
    int bAddr64 = 1;
};

/// Stops at the first fault: there may be thousands of cases.
void expect_written(const std::vector<packed_case>& cases) {
    for (const packed_case& row : cases) {
        const entry_ptr pEntry = compile(row.format);
        for (const write_way pWrite : WAYS) {
            trace_bytes run = row.bytes;
            ASSERT_EQ(output_of([&] { pWrite(pEntry.get(), &run, row.bAddr64); }), row.text + "\n")
                << row.format;
            ASSERT_EQ(run.size(), row.uLeft) << row.format;
        }
    }
}

/// Every text a printf call keeps.
constexpr size_t KEPT = 4095;

} // namespace

TEST(parms, packed_parameters_print_in_their_places) {
    const int32_t i = 7;
    expect_written({
        {"%d %s", raw_bytes(i), "7 %s"},
        {"%c%d", raw_bytes('x', 'y', 'y', 'y', i), "x7"},
        {"%ld", raw_bytes(-1), "-1", 0, 0},
        {"%lu", raw_bytes(-1), "4294967295", 0, 0},
        {"%c%ld", raw_bytes(int64_t{'x'}, INT64_MIN, 'r'), "x-9223372036854775808", 1},
        {"%ld", raw_bytes(-1), "%ld", 4},
        {"%c%hd%c%lx|%p", raw_bytes("a_"sv, short{-2}, 'b', "___"sv, 5, 16), "a-2b5|0x10", 0, 0},
        {"a%sb", raw_bytes("no end"sv), "a%sb", 6},
        {"%s%d%s", raw_bytes("ab\0_"sv, i, "c"sv), "ab7%s", 1},
        {"%*d", raw_bytes(5, 4), "   5"},
        {"%*d|%.*d|%.*d", raw_bytes(5, -4, 5, -1, 5, 3), "5   |5|005"},
        {"%*d %d", raw_bytes(5), "%*d %d", 0},
        {"%hf %f %Lf %lle", raw_bytes(1.5F, 0, 1.5, 2.5, 1e100),
         "1.500000 1.500000 2.500000 1.000000e+100"},
        {"%2$s-%1$d-%2$s\n", raw_bytes(i, "z\0"sv), "z-7-z"},
        {"%2$*1$d", raw_bytes(3, 7), "  7"},
        {"%3$-*1$.*2$f|%000000000000001$d", raw_bytes(8, 2, 1.5), "1.50    |8"},
        {"%d%z|", raw_bytes(i, "the rest"sv), "7|"},
        {"%d%d%z|", raw_bytes(i), "7%d|"},
        {"%c%r", raw_bytes("c___", uint16_t{1}, uint16_t{0xABCD}, 2, 3, 4, -1),
         "c0x0001 0xabcd 0x00000002 0x00000003 0x00000004 0xffffffff"},
        {"100%%%d%%1$d\n", raw_bytes(i), "100%7%1$d"},
        {"%5.d|%.d|%1d", raw_bytes(i, 0, i), "    7||7"},
        {"\n\n", {}, "\n"},
        {"", raw_bytes(i), "", 4},
        {"%C%S|%lc%ls|%hs", raw_bytes("cs\0dt\0u\0"sv), "cs|dt|u"},
        {"%BNJ'05d", raw_bytes(i), "00007"},
        {"[%T]", raw_bytes(i), "[]"}, // of no template
        // A parameter that is used twice has the type of its last use.
        {"%1$s|%1$d", raw_bytes(i), "%1$s|7"},
        {"%1$d=%1$c", raw_bytes('A'), "65=A"},
        {"%1$f %1$p %1$r %1$T %1$z %1$d", raw_bytes(i), "%1$f %1$p %1$r %1$T %1$z 7"},
        {"%2$*1$z|%1$d", raw_bytes(i), "|7"}, // the rest is nothing, at any width
        {"%1$d %1$f", raw_bytes(0.5), "%1$d 0.500000"},
        // It is printed as wide as each place asks for, whatever it holds.
        {"%1$hd %1$d", raw_bytes(70'000), "4464 70000"},
        {"%1$d %1$hx %1$Ld %1$lld", raw_bytes(-0x6789ABCDEFLL),
         "1985229329 3211 1985229329 -444691369455"},
        {"%1$llx %1$o %1$ld %1$hd", raw_bytes(int16_t{-2}), "fffffffffffffffe 37777777776 -2 -2"},
        {"%1$lx %1$d %1$u", raw_bytes(-1), "ffffffff -1 4294967295", 0, 0},
        {"%2$*1$d %1$s", raw_bytes("\5\0\0\0"sv, i), "    7 \5"},
        // 39 characters of a rebuilt text are the most.
        {"%" + std::string(37, '0') + "d", raw_bytes(i), "7"},
        {"%" + std::string(38, '0') + "d", raw_bytes(i), "%" + std::string(38, '0') + "d"},
        {"%" + std::string(200, 'B') + "s", raw_bytes("ab\0"sv), "ab"},
        {"%" + std::string(35, '-') + "*d|", raw_bytes(i, 12), "7           |"},
        {"%" + std::string(35, '-') + "*d|", raw_bytes(i, 123), "%" + std::string(35, '-') + "*d|"},
        {"%" + std::string(37, '-') + ".*d|", raw_bytes(i, -1), "7|"},
    });
}

TEST(parms, leading_numbers_print_the_same_however_a_body_begins_and_a_run_ends) {
    std::string many;
    for (int i = 0; i < 40; i++)
        many += "a text of more than some bytes %032d";
    byte_vector bytes = raw_bytes('<', '<', '\n', 'x');
    for (uint32_t i = 0; i < 50; i++)
        add_bytes(&bytes, raw_bytes(0x3C0A3C3CU - 0x20000001U * i));
    for (const char* pFormat : {many.c_str(),
                                "%d",
                                "n %u, %d",
                                "<%d",
                                ">>%d %d",
                                "<<%d\n%x\n",
                                "%c%d",
                                "%c%c%d",
                                "%d%c%d\n",
                                "\n%d",
                                "%d\n\n%d",
                                "%s%d",
                                "%hd%hu%lx%ld%08lx",
                                "%lld %5x %-5d",
                                "%d%z",
                                "%d %z",
                                "%d%z%d",
                                "%d%T%d",
                                "%%%d%%",
                                "<%d %s"}) {
        const entry_ptr pEntry = compile(pFormat);
        for (const int bAddr64 : {0, 1}) {
            for (size_t uSize = 0; uSize <= bytes.size(); uSize += uSize < 24 ? 1 : 13) {
                std::string texts[2];
                for (size_t uWay = 0; uWay < 2; uWay++) {
                    trace_bytes run(bytes.data(), uSize);
                    texts[uWay] = output_of([&] {
                        anchor.outputFlags = OUTPUT_START_PENDING;
                        anchor.headerIndent = 5;
                        WAYS[uWay](pEntry.get(), &run, bAddr64);
                        // What is left, on a line of its own.
                        WAYS[uWay](pEntry.get(), &run, bAddr64);
                        output_abandon_rec();
                    });
                    texts[uWay] += std::to_string(run.size());
                }
                ASSERT_EQ(texts[0], texts[1]) << pFormat << " over " << uSize << " bytes";
            }
        }
    }
}

TEST(parms, unpacked_parameters_take_a_block_each) {
    const std::string seven = block("\7\0\0\0"sv);
    // After 20 widened integers a short block is read as four bytes.
    std::string many, manyBlocks, manyText;
    for (int i = 0; i < 22; i++) {
        many += "%d ";
        manyBlocks += block("\xFF");
        manyText += i < 20 ? "-1 " : "255 ";
    }
    const struct {
        std::string format;
        byte_vector blocks;
        uint32_t uBlocks;
        std::string text;
        size_t uLeft = 0;
    } cases[] = {
        {"%d", raw_bytes(block("\xFF")), 1, "-1\n"},
        {"%u %d %u", raw_bytes(block("\xFF"), block("\xFF\xFF"), block("\xFF\xFF")), 3,
         "255 -1 65535\n"},
        {many, raw_bytes(manyBlocks), 22, manyText + "\n"},
        {"%d", raw_bytes(seven, seven), 2, "7\n", 8},
        {"%d %d", raw_bytes(seven, seven), 1, "7 %d\n", 8},
        {"%d %d", raw_bytes(seven), 2, "7 %d\n"},
        {"%s|%s|", raw_bytes(block("abcde"), block("f\0g"sv)), UINT32_MAX, "abcde|f|\n"},
        {"%s|%d|", raw_bytes(3, "abcdefgh", seven), 2, "abc|4|\n"},
        {"%s|%d|", raw_bytes(INT_MAX, "abcdefgh", seven), 2, "abcdefgh\4|%d|\n"},
        {"%s|%d|", raw_bytes(INT_MIN, "abc"), 2, "abc|%d|\n"},
        {"%d|%lld|%hd", raw_bytes(block("\1\2\3"), seven, block("\xFD\xFF")), 3,
         "197121|8589934599|-3\n"},
        {"%d %d", byte_vector(6), 2, "0 %d\n", 2},
        {"%d", byte_vector(3), 1, "%d\n", 3},
    };
    for (const auto& row : cases) {
        parm_list list;
        trace_bytes blocks = row.blocks;
        const entry_ptr pEntry = compile(row.format);
        const auto write = [&] {
            bld_parm_list_unpacked(pEntry.get(), &blocks, row.uBlocks, &list);
            format_parms(pEntry.get(), &list, 1);
        };
        EXPECT_EQ(output_of(write), row.text) << row.format;
        EXPECT_EQ(blocks.size(), row.uLeft) << row.format;
    }
}

TEST(parms, huge_widths_and_precisions_keep_what_is_shown) {
    const std::string blanks(KEPT, ' ');
    const std::string zeros(KEPT, '0');
    const std::string replacement = "kelvo error in output_vprintf()";
    const std::string longText(10'000, 'x');
    expect_written({
        {"%s|%-s", raw_bytes(longText, '\0', longText, '\0'),
         longText + "|" + longText.substr(0, KEPT)},
        {"%2000000000d", raw_bytes(5), blanks},
        {"%02000000000d", raw_bytes(-5), ("-" + zeros).substr(0, KEPT)},
        {"%-2000000000s|", raw_bytes("ab\0"sv), "ab" + blanks.substr(2) + "|"},
        {"%.2147483647x", raw_bytes(5), zeros},
        {"%+.2147483647d", raw_bytes(5), replacement},
        {"%.2147483647f", raw_bytes(0.5), replacement},
        {"%.2000000000f", raw_bytes(0.5), "0.5" + zeros.substr(3)},
        {"%2000000000.1999999990f", raw_bytes(0.5), "        0.5" + zeros.substr(11)},
        {"%.2147483647s", raw_bytes("ab\0"sv), "ab"},
        {"%2000000000p", raw_bytes(int64_t{16}), blanks},
        {"%.2147483645p", raw_bytes(int64_t{16}), "0x" + zeros.substr(2)},
        {"%.2147483646p", raw_bytes(int64_t{16}), replacement},
        {"%.2147483647p|%.2147483646p", raw_bytes(int64_t{0}, int64_t{0}), "(nil)|(nil)"},
        {"%2147483648d", raw_bytes(5), replacement},
        {"%99999999999999999999f", raw_bytes(0.5), replacement},
        {"%.2147483648g", raw_bytes(0.5), replacement},
        {"%.2147483648s", raw_bytes("ab\0"sv), replacement},
        {"%*d", raw_bytes(5, INT_MIN), replacement},
        {"%*f", raw_bytes(0.5, INT_MIN), replacement},
        {"%*.*f|", raw_bytes(0.5, -INT_MAX, INT_MIN), "0.500000" + blanks.substr(8) + "|"},
        {"%*.*d|", raw_bytes(5, INT_MAX, INT_MIN), blanks + "|"},
    });
}

namespace {

template <class T> T one_of(std::mt19937_64& random, std::initializer_list<T> values) {
    return values.begin()[random() % values.size()];
}

/// A random conversion, and what printf makes of it.
packed_case make_conversion(std::mt19937_64& random) {
    std::string flags;
    for (int i = one_of(random, {0, 0, 1, 1, 2, 3}); i > 0; i--)
        flags += one_of(random, {'-', '+', ' ', '#', '0', '\'', 'B'});
    const int iWidth =
        one_of(random, {0, 0, 1, 5, 12, 30, 4090, 4095, 4096, 5000, 10000, -7, -5000});
    const int iPrecision = one_of(random, {-1, -1, -1, 0, 1, 5, 20, 300, 4000, 4096, 5197, 6000});
    const std::string modifier = one_of(random, {"", "h", "l", "ll", "L"});
    const std::string_view letters = "ddiuxXocsfeEgGp";
    const char letter = letters[random() % letters.size()];
    const bool bStars = iWidth < 0 || random() % 3 == 0;
    packed_case made;
    made.format = "[%" + flags;
    made.format += bStars ? "*.*" : iWidth > 0 ? std::to_string(iWidth) : "";
    if (!bStars && iPrecision >= 0)
        made.format += "." + std::to_string(iPrecision);
    made.format += modifier + letter + "]";
    std::erase(flags, 'B'); // which means nothing

    const auto expect = [&](const std::string& modifierAndLetter, auto value, byte_vector bytes) {
        const std::string plain = "%" + flags + "*.*" + modifierAndLetter;
        char buffer[KEPT + 1];
        snprintf(buffer, sizeof(buffer), plain.c_str(), iWidth, iPrecision, value);
        made.text = std::string("[") + buffer + "]";
        made.bytes = std::move(bytes);
        if (bStars) { // the value comes before its width and precision
            made.bytes.resize((made.bytes.size() + 3) / 4 * 4);
            add_bytes(&made.bytes, raw_bytes(iWidth, iPrecision));
        }
    };
    const auto iAny = static_cast<int64_t>(random());
    const int64_t iValue = one_of<int64_t>(random, {0, 1, -1, 7, 100, INT_MAX, INT_MIN, INT64_MAX,
                                                    INT64_MIN, iAny, iAny, iAny, iAny, iAny});
    if (letter == 's') {
        const std::string string(random() % 20 ? random() % 30 : 4090 + random() % 6, 's');
        expect("s", string.c_str(), raw_bytes(string, '\0'));
    } else if (letter == 'c') {
        expect("c", 'c', raw_bytes('c'));
    } else if (letter == 'p') {
        expect("p", reinterpret_cast<void*>(iValue), raw_bytes(iValue));
    } else if (std::string_view("feEgG").find(letter) != std::string_view::npos) {
        const auto real =
            one_of<double>(random, {0.0, -0.0, 1.5, -1e30, 5e-324, 123456.789, HUGE_VAL, -HUGE_VAL,
                                    NAN, static_cast<double>(iValue)});
        const auto single = static_cast<float>(real);
        if (modifier == "h")
            expect({letter}, static_cast<double>(single), raw_bytes(single));
        else
            expect({letter}, real, raw_bytes(real));
    } else if (modifier == "h") {
        expect(modifier + letter, static_cast<int>(iValue),
               raw_bytes(static_cast<int16_t>(iValue)));
    } else if (modifier == "l" || modifier == "ll") {
        expect(modifier + letter, iValue, raw_bytes(iValue));
    } else {
        expect({letter}, static_cast<int>(iValue), raw_bytes(static_cast<int32_t>(iValue)));
    }
    return made;
}

} // namespace

TEST(parms, every_value_prints_as_printf_prints_it) {
    setlocale(LC_ALL, "C");
    std::mt19937_64 random(20240229);
    std::vector<packed_case> cases;
    for (int i = 0; i < 10'000; i++)
        cases.push_back(make_conversion(random));
    expect_written(cases);
}
