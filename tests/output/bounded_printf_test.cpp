#include "bounded_printf.h"

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <string>

namespace {

// The length that one call of bounded_snprintf returns, and what it keeps.
using outcome = std::pair<int, std::string>;

// Formats go through a volatile pointer: the compiler would warn of them.
template <class... Args> outcome bounded(const char* pText, Args... args) {
    const char* volatile pFormat = pText;
    char buffer[BOUNDED_PRINTF_SIZE] = "";
    const int length = bounded_snprintf(buffer, sizeof buffer, pFormat, args...);
    return {length, length < 0 ? "refused" : buffer};
}

// The same call of the C library is the measure, at widths it can afford.
template <class... Args> void expect_like_printf(const char* pText, Args... args) {
    const char* volatile pFormat = pText;
    char buffer[BOUNDED_PRINTF_SIZE];
    const int length = std::snprintf(buffer, sizeof buffer, pFormat, args...);
    EXPECT_EQ(bounded(pText, args...), outcome(length, buffer)) << pText;
}

TEST(BoundedPrintf, GivesWhatPrintfGives) {
    for (const int width : {0, 7, -7, 4094, 4096, -5000, 20000, -300000}) {
        for (const int precision : {-1, 0, 3, 4095, 5195, 5196, 5197, 40000, 299998}) {
            expect_like_printf("a%*.*db%+*.*lldc", width, precision, -123, width, precision, 5LL);
            expect_like_printf("%0*.*x|%#*.*lo", width, precision, 0xBEEFU, width, precision, 8L);
            expect_like_printf("<%*.*s>%*c", width, precision, "text", width, 'c');
            expect_like_printf("% 0*.*f%-#*.*e", width, precision, 1e300 / 3, width, precision,
                               0.1);
            expect_like_printf("%*.*Lg%#*.*g", width, precision, 2.5L, width, precision, 2.5);
            expect_like_printf("%*.*f%0*.*a", width, precision, -INFINITY, width, precision, 0.1);
        }
    }
    expect_like_printf("%.5000s|%05000d|%hhd%hd%zu%jd%td%%%p", std::string(9000, 'x').c_str(), 1,
                       300, 70000, size_t{1}, intmax_t{-2}, ptrdiff_t{3},
                       static_cast<void*>(nullptr));
}

TEST(BoundedPrintf, TakesWidthsThatNobodyCouldAfford) {
    EXPECT_EQ(bounded("%2000000000d", 5), outcome(2000000000, std::string(4095, ' ')));
    EXPECT_EQ(bounded("%-*d|", 2000000000, 5), outcome(2000000001, "5" + std::string(4094, ' ')));
    EXPECT_EQ(bounded("%.*d", INT_MAX - 1, -5), outcome(INT_MAX, "-" + std::string(4094, '0')));
    EXPECT_EQ(bounded("%.2000000000f", 0.5), outcome(2000000002, "0.5" + std::string(4092, '0')));
    EXPECT_EQ(bounded("%2147483647s", ""), outcome(INT_MAX, std::string(4095, ' ')));
    EXPECT_EQ(bounded("%.2147483647s", "short"), outcome(5, "short"));
    const outcome refused(-1, "refused");
    EXPECT_EQ(bounded("%2147483648d", 5), refused);
    EXPECT_EQ(bounded("%99999999999999999999d", 5), refused);
    EXPECT_EQ(bounded("%*d", INT_MIN, 5), refused);
    EXPECT_EQ(bounded("%2000000000d%2000000000d", 5, 5), refused);
    int count = 77;
    EXPECT_EQ(bounded("%5000d%n", 5, &count), refused);
    EXPECT_EQ(count, 77);
    EXPECT_EQ(bounded("%5000d%", 5), refused);
}

} // namespace
