// Parameters of formats: where they are found, what they print, and that every
// number and string prints as printf would print it.

#include "format_text.h"

#include "compile.h"
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

namespace {

using byte_vector = std::vector<std::byte>;

struct free_entry {
    void operator()(format_entry* pEntry) const {
        free(pEntry);
    }
};
using entry_ptr = std::unique_ptr<format_entry, free_entry>;

entry_ptr compile(const std::string& format) {
    entry_ptr pEntry(parse_format_string(format.c_str(), nullptr));
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

/// The way of records: what can be is written while it is found.
void write_as_found(const format_entry* pEntry, trace_bytes* pRun, int bAddr64) {
    format_packed_parms(pEntry, pRun, bAddr64);
}

/// The same text in two steps, the second of which data records share.
void write_listed(const format_entry* pEntry, trace_bytes* pRun, int bAddr64) {
    static parm_list list;
    bld_parm_list_packed(pEntry, pRun, bAddr64, &list);
    format_parms(pEntry, &list, bAddr64);
}

using write_way = void (*)(const format_entry* pEntry, trace_bytes* pRun, int bAddr64);
constexpr write_way WAYS[] = {write_as_found, write_listed};

/// Writes `format` over a packed run and returns how many bytes are left over.
size_t write_packed(const std::string& format, const byte_vector& bytes, int bAddr64 = 1,
                    write_way pWrite = write_as_found) {
    trace_bytes run = bytes;
    const entry_ptr pEntry = compile(format);
    if (!pEntry)
        return SIZE_MAX;
    pWrite(pEntry.get(), &run, bAddr64);
    return run.size();
}

/// A block of a data record.
byte_vector block(const byte_vector& data, int32_t iLength = -1) {
    byte_vector bytes = raw_bytes(iLength < 0 ? static_cast<int32_t>(data.size()) : iLength);
    bytes.insert(bytes.end(), data.begin(), data.end());
    bytes.resize((bytes.size() + 3) / 4 * 4);
    return bytes;
}

byte_vector join(const std::vector<byte_vector>& parts) {
    byte_vector all;
    for (const byte_vector& part : parts)
        all.insert(all.end(), part.begin(), part.end());
    return all;
}

const std::string replacement = "kelvo error in output_vprintf()";

/// Every text a printf call keeps.
constexpr size_t KEPT = 4095;

} // namespace

TEST(parms, packed_parameters_print_in_their_places) {
    using namespace std::string_view_literals;
    const int32_t i = 7;
    const byte_vector minusOne = raw_bytes(UINT32_MAX);
    const byte_vector handle =
        raw_bytes(uint16_t{1}, uint16_t{0xABCD}, uint32_t{2}, uint32_t{3}, uint32_t{4}, UINT32_MAX);
    const struct {
        std::string format;
        byte_vector bytes;
        std::string text;
        size_t uLeft = 0;
        int bAddr64 = 1;
    } cases[] = {
        {"%d %s", raw_bytes(i), "7 %s\n"},
        {"%c%d", raw_bytes('x', 'y', 'y', 'y', i), "x7\n"},
        {"%ld", minusOne, "-1\n", 0, 0},
        {"%lu", minusOne, "4294967295\n", 0, 0},
        {"%c%ld", raw_bytes(int64_t{'x'}, INT64_MIN, 'r'), "x-9223372036854775808\n", 1},
        {"%ld", minusOne, "%ld\n", 4},
        {"%c%hd%c%lx|%p", raw_bytes("a_"sv, short{-2}, 'b', "___"sv, 5, 16), "a-2b5|0x10\n", 0, 0},
        {"a%sb", raw_bytes("no end"sv), "a%sb\n", 6},
        {"%s%d%s", raw_bytes("ab\0_"sv, i, "c"sv), "ab7%s\n", 1},
        {"%*d", raw_bytes(5, 4), "   5\n"},
        {"%*d|%.*d|%.*d", raw_bytes(5, -4, 5, -1, 5, 3), "5   |5|005\n"},
        {"%*d %d", raw_bytes(5), "%*d %d\n", 0},
        {"%hf %f %Lf %lle", raw_bytes(1.5F, 0, 1.5, 2.5, 1e100),
         "1.500000 1.500000 2.500000 1.000000e+100\n"},
        {"%2$s-%1$d-%2$s\n", raw_bytes(i, "z\0"sv), "z-7-z\n"},
        {"%2$*1$d", raw_bytes(3, 7), "  7\n"},
        {"%d%z|", raw_bytes(i, "the rest"sv), "7|\n"},
        {"%d%d%z|", raw_bytes(i), "7%d|\n"},
        {"%c%r", join({raw_bytes("c___"sv), handle}),
         "c0x0001 0xabcd 0x00000002 0x00000003 0x00000004 0xffffffff\n"},
        {"100%% of 50%%%d%%\n", raw_bytes(i), "100% of 50%7%\n"},
        {"\n\n", {}, "\n\n"},
        {"", raw_bytes(i), "\n", 4},
        {"%C%S|%lc%ls|%hs", raw_bytes("cs\0dt\0u\0"sv), "cs|dt|u\n"},
        {"%BNJ'05d", raw_bytes(i), "00007\n"},
        {"%Ld %Lx", raw_bytes(-1, -1), "-1 ffffffff\n"},
        // A parameter that is used twice has the type of its last use.
        {"%1$s|%1$d", raw_bytes(i), "%1$s|7\n"},
        {"%1$c=%1$d", raw_bytes('A' + 0), "A=65\n"},
        {"%1$d=%1$c", raw_bytes('A'), "65=A\n"},
        {"%1$f %1$p %1$r %1$T %1$z %1$d", raw_bytes(i), "%1$f %1$p %1$r %1$T %1$z 7\n"},
        {"%2$*1$z|%1$d", raw_bytes(i), "|7\n"}, // the rest is nothing, at any width
        {"%1$d %1$f", raw_bytes(0.5), "%1$d 0.500000\n"},
        {"%1$d %1$hx %1$lld", raw_bytes(INT64_MIN),
         "-9223372036854775808 8000000000000000 -9223372036854775808\n"},
        {"%2$*1$d %1$s", raw_bytes("\5\0\0\0"sv, i), "    7 \5\n"},
        // 39 characters of a rebuilt text are the most.
        {"%" + std::string(37, '0') + "d", raw_bytes(i), "7\n"},
        {"%" + std::string(38, '0') + "d", raw_bytes(i), "%" + std::string(38, '0') + "d\n"},
        {"%" + std::string(200, 'B') + "s", raw_bytes("ab\0"sv), "ab\n"},
        {"%" + std::string(35, '-') + "*d|", raw_bytes(i, 12), "7           |\n"},
        {"%" + std::string(35, '-') + "*d|", raw_bytes(i, 123),
         "%" + std::string(35, '-') + "*d|\n"},
        {"%" + std::string(37, '-') + ".*d|", raw_bytes(i, -1), "7|\n"},
    };
    for (const write_way pWrite : WAYS) {
        for (const auto& row : cases) {
            size_t uLeft = 0;
            EXPECT_EQ(output_of([&] {
                          uLeft = write_packed(row.format, row.bytes, row.bAddr64, pWrite);
                      }),
                      row.text)
                << row.format;
            EXPECT_EQ(uLeft, row.uLeft) << row.format;
        }
    }
}

TEST(parms, leading_numbers_print_the_same_however_a_body_begins_and_a_run_ends) {
    std::string many;
    for (int i = 0; i < 40; i++)
        many += "a text of more than some bytes %032d";
    const std::string formats[] = {
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
        many,
        "%d%z",
        "%d %z",
        "%d%z%d",
        "%d%T%d",
        "%%%d%%",
        "<%d %s",
    };
    byte_vector bytes = raw_bytes('<', '<', '\n', 'x');
    for (uint32_t i = 0; i < 50; i++)
        bytes = join({bytes, raw_bytes(0x3C0A3C3CU - 0x20000001U * i)});
    for (const std::string& format : formats) {
        const entry_ptr pEntry = compile(format);
        for (const int bAddr64 : {0, 1}) {
            for (size_t uSize = 0; uSize <= bytes.size(); uSize += uSize < 24 ? 1 : 13) {
                std::string texts[2];
                for (size_t uWay = 0; uWay < 2; uWay++) {
                    trace_bytes run(bytes.data(), uSize);
                    texts[uWay] = output_of([&] {
                        anchor.outputFlags = OUTPUT_START_PENDING;
                        anchor.headerIndent = 5;
                        WAYS[uWay](pEntry.get(), &run, bAddr64);
                        WAYS[uWay](pEntry.get(), &run,
                                   bAddr64); // what is left, on a line of its own
                        output_abandon_rec();
                    });
                    texts[uWay] += std::to_string(run.size());
                }
                ASSERT_EQ(texts[0], texts[1]) << format << " over " << uSize << " bytes";
            }
        }
    }
}

TEST(parms, unpacked_parameters_take_a_block_each) {
    using namespace std::string_view_literals;
    const byte_vector ff(1, std::byte{0xFF});
    const byte_vector ffff(2, std::byte{0xFF});
    const byte_vector seven = block(raw_bytes(7));
    const struct {
        std::string format;
        byte_vector blocks;
        uint32_t uBlocks;
        std::string text;
        size_t uLeft = 0;
    } cases[] = {
        {"%d", block(ff), 1, "-1\n"},
        {"%u %d %u", join({block(ff), block(ffff), block(ffff)}), 3, "255 -1 65535\n"},
        {"%d", join({seven, seven}), 2, "7\n", 8},
        {"%d %d", join({seven, seven}), 1, "7 %d\n", 8},
        {"%d %d", seven, 2, "7 %d\n"},
        {"%s|%s|", join({block(raw_bytes("abcde"sv)), block(raw_bytes("f\0g"sv))}), UINT32_MAX,
         "abcde|f|\n"},
        {"%s|%d|", join({block(raw_bytes("abcdefgh"sv), 3), seven}), 2, "abc|4|\n"},
        {"%s|%d|", join({block(raw_bytes("abcdefgh"sv), INT_MAX), seven}), 2, "abcdefgh\4|%d|\n"},
        {"%s|%d|", block(raw_bytes("abc"sv), INT_MIN), 2, "abc|%d|\n"},
        {"%d|%lld|%hd", join({block(raw_bytes("\1\2\3"sv)), seven, block(raw_bytes(short{-3}))}), 3,
         "197121|8589934599|-3\n"},
        {"%d %d", byte_vector(6), 2, "0 %d\n", 2},
        {"%d", byte_vector(3), 1, "%d\n", 3},
    };
    for (const auto& row : cases) {
        static parm_list list;
        trace_bytes blocks = row.blocks;
        const entry_ptr pEntry = compile(row.format);
        const auto write = [&] {
            bld_parm_list_unpacked(pEntry.get(), &blocks, row.uBlocks, &list);
            format_parms(pEntry.get(), &list, 1);
        };
        EXPECT_EQ(output_of(write), row.text) << row.format;
        EXPECT_EQ(blocks.size(), row.uLeft) << row.format;
    }

    // After 20 widened integers a short block is read as four bytes.
    std::string format;
    std::vector<byte_vector> parts;
    std::string expected;
    for (int i = 0; i < 22; i++) {
        format += "%d ";
        parts.push_back(block(ff));
        expected += i < 20 ? "-1 " : "255 ";
    }
    const byte_vector bytes = join(parts);
    const entry_ptr pEntry = compile(format);
    trace_bytes blocks = bytes;
    static parm_list list;
    bld_parm_list_unpacked(pEntry.get(), &blocks, 22, &list);
    EXPECT_EQ(output_of([&] { format_parms(pEntry.get(), &list, 1); }), expected + "\n");
}

TEST(parms, a_trace_id_prints_the_format_it_names) {
    template_file file{};
    const entry_ptr pNamed(parse_format_string("named %d 100%%\n", &file));
    const entry_ptr pNaming(parse_format_string("[%T]", &file));
    pNamed->trace_id = 0x10;
    pNaming->trace_id = -5;
    static parm_list list;
    for (const auto& [iTraceId, text] : std::vector<std::pair<int32_t, std::string>>{
             {0x10, "[named %d 100%%\n]\n"}, {-5, "[[%T]]\n"}, {0x11, "[]\n"}}) {
        const byte_vector bytes = raw_bytes(iTraceId);
        trace_bytes run = bytes;
        bld_parm_list_packed(pNaming.get(), &run, 1, &list);
        EXPECT_EQ(output_of([&] { format_parms(pNaming.get(), &list, 1); }), text);
    }
    EXPECT_EQ(output_of([] { write_packed("[%T]", raw_bytes(0x10)); }), "[]\n");
}

TEST(parms, huge_widths_and_precisions_keep_what_is_shown) {
    using namespace std::string_view_literals;
    const std::string blanks(KEPT, ' ');
    const std::string zeros(KEPT, '0');
    const struct {
        std::string format;
        byte_vector bytes;
        std::string text;
    } cases[] = {
        {"%2000000000d", raw_bytes(5), blanks},
        {"%02000000000d", raw_bytes(-5), ("-" + zeros).substr(0, KEPT)},
        {"%-2000000000s|", raw_bytes("ab\0"sv), "ab" + blanks.substr(2) + "|"},
        {"%.2147483647x", raw_bytes(5), zeros},
        {"%+.2147483647d", raw_bytes(5), replacement},
        {"%#.2147483640o", raw_bytes(5), zeros},
        {"%2147483647c", raw_bytes('a'), blanks},
        {"%.2147483647f", raw_bytes(0.5), replacement},
        {"%.2000000000f", raw_bytes(0.5), "0.5" + zeros.substr(3)},
        {"%2000000000.1999999990f", raw_bytes(0.5), "        0.5" + zeros.substr(11)},
        {"%.2000000000e", raw_bytes(0.5), "5." + zeros.substr(2)},
        {"%#.2000000000g", raw_bytes(0.5), "0.5" + zeros.substr(3)},
        {"%.2000000000g", raw_bytes(0.5), "0.5"},
        {"%.2147483647s", raw_bytes("ab\0"sv), "ab"},
        {"%2000000000p", raw_bytes(int64_t{16}), blanks},
        {"%2147483648d", raw_bytes(5), replacement},
        {"%99999999999999999999f", raw_bytes(0.5), replacement},
        {"%.2147483648s", raw_bytes("ab\0"sv), replacement},
        {"%*d", raw_bytes(5, INT_MIN), replacement},
        {"%*f", raw_bytes(0.5, INT_MIN), replacement},
        {"%*.*f|", raw_bytes(0.5, -INT_MAX, INT_MIN), "0.500000" + blanks.substr(8) + "|"},
        {"%*.*d|", raw_bytes(5, INT_MAX, INT_MIN), blanks + "|"},
    };
    for (const auto& row : cases)
        EXPECT_EQ(output_of([&] { write_packed(row.format, row.bytes); }), row.text + "\n")
            << row.format;
    const std::string longText(10'000, 'x');
    EXPECT_EQ(output_of([&] { write_packed("%s|%-s", raw_bytes(longText, '\0', longText, '\0')); }),
              longText + "|" + longText.substr(0, KEPT) + "\n");
}

namespace {

/// One random conversion: the text for the format, and what printf makes of it.
struct random_conversion {
    std::string text;
    byte_vector bytes;
    std::string expected;
};

class conversion_maker {
public:
    random_conversion make() {
        std::string flags;
        for (int i = pick({0, 0, 1, 1, 2, 3}); i > 0; i--)
            flags += "-+ #0'B"[below(7)];
        const int iWidth = pick({0, 0, 1, 5, 12, 30, 4090, 4095, 4096, 5000, -7, -5000});
        const int iPrecision = pick({-1, -1, -1, 0, 1, 5, 20, 300, 4000, 4096, 5000});
        const std::string letters = "ddiuxXocsfeEgGp";
        const char letter = letters[below(letters.size())];
        const std::string modifiers[] = {"", "h", "l", "ll", "L"};
        return build(flags, iWidth, iPrecision, modifiers[below(5)], letter);
    }

private:
    size_t below(size_t uLimit) {
        return std::uniform_int_distribution<size_t>(0, uLimit - 1)(engine);
    }
    int pick(std::vector<int> values) {
        return values[below(values.size())];
    }
    int64_t value() {
        const int64_t values[] = {0, 1, -1, 7, 100, INT_MAX, INT_MIN, INT64_MAX, INT64_MIN};
        return below(2) ? values[below(std::size(values))] : static_cast<int64_t>(engine());
    }

    template <class T>
    random_conversion finish(const std::string& text, const std::string& printfText, int iWidth,
                             int iPrecision, const T& passed, byte_vector bytes) {
        char buffer[KEPT + 1];
        snprintf(buffer, sizeof(buffer), printfText.c_str(), iWidth, iPrecision, passed);
        if (text.find('*') != text.npos) { // the value comes before its width and precision
            bytes.resize((bytes.size() + 3) / 4 * 4);
            bytes = join({bytes, raw_bytes(iWidth, iPrecision)});
        }
        return {text, bytes, buffer};
    }

    random_conversion build(const std::string& flags, int iWidth, int iPrecision,
                            const std::string& modifier, char letter) {
        std::string text = "%" + flags;
        if (iWidth < 0 || below(3) == 0)
            text += "*.*";
        else
            text += (iWidth ? std::to_string(iWidth) : "") +
                    (iPrecision < 0 ? "" : "." + std::to_string(iPrecision));
        text += modifier + letter;

        std::string plain = "%";
        for (const char flag : flags)
            if (flag != 'B')
                plain += flag;
        plain += "*.*";
        const auto with = [&](const std::string& end) { return plain + end; };
        const int64_t iValue = value();
        if (letter == 's') {
            const std::string string(below(20) ? below(30) : 4090 + below(6), 's');
            return finish(text, with("s"), iWidth, iPrecision, string.c_str(),
                          raw_bytes(string, '\0'));
        }
        if (letter == 'c')
            return finish(text, with("c"), iWidth, iPrecision, 'c', raw_bytes('c'));
        if (letter == 'p')
            return finish(text, with("p"), iWidth, iPrecision, reinterpret_cast<void*>(iValue),
                          raw_bytes(iValue));
        if (std::string_view("feEgG").find(letter) != std::string_view::npos) {
            const double reals[] = {
                0.0,        -0.0,     1.5,       -1e300, 5e-324,
                123456.789, HUGE_VAL, -HUGE_VAL, NAN,    static_cast<double>(iValue)};
            const double real = reals[below(std::size(reals))];
            const auto single =
                static_cast<float>(std::isfinite(real) ? std::fmod(real, 1e30) : real);
            if (modifier == "h")
                return finish(text, with({letter}), iWidth, iPrecision, static_cast<double>(single),
                              raw_bytes(single));
            return finish(text, with({letter}), iWidth, iPrecision, real, raw_bytes(real));
        }
        if (modifier == "h")
            return finish(text, with(std::string("h") + letter), iWidth, iPrecision,
                          static_cast<int>(iValue), raw_bytes(static_cast<int16_t>(iValue)));
        if (modifier == "l" || modifier == "ll")
            return finish(text, with(modifier + letter), iWidth, iPrecision, iValue,
                          raw_bytes(iValue));
        return finish(text, with({letter}), iWidth, iPrecision, static_cast<int>(iValue),
                      raw_bytes(static_cast<int32_t>(iValue)));
    }

    std::mt19937_64 engine{20240229};
};

} // namespace

TEST(parms, every_value_prints_as_printf_prints_it) {
    setlocale(LC_ALL, "C");
    conversion_maker maker;
    std::vector<random_conversion> conversions;
    for (int i = 0; i < 20'000; i++)
        conversions.push_back(maker.make());
    const std::string output = output_of([&] {
        for (const random_conversion& conversion : conversions)
            write_packed("[" + conversion.text + "]", conversion.bytes);
    });
    std::string_view rest = output;
    for (const random_conversion& conversion : conversions) {
        const std::string line = "[" + conversion.expected + "]\n";
        ASSERT_EQ(rest.substr(0, line.size()), line) << conversion.text;
        rest.remove_prefix(line.size());
    }
    EXPECT_EQ(rest, "");
}
