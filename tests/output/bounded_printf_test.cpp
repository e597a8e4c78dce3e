#include "bounded_printf.h"

#include <gtest/gtest.h>

#include <climits>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <string>

namespace {

// One call of bounded_snprintf.
struct outcome {
    int length;
    std::string kept;
};

// Formats go through a volatile pointer: the compiler would warn of them.
template <class... Args> outcome bounded(const char* pText, Args... args) {
    const char* volatile pFormat = pText;
    char buffer[BOUNDED_PRINTF_SIZE] = "";
    const int length = bounded_snprintf(buffer, sizeof buffer, pFormat, args...);
    return {length, length < 0 ? "" : buffer};
}

// The same call of the C library is the measure, at widths it can afford.
template <class... Args> void expect_like_printf(const char* pText, Args... args) {
    const char* volatile pFormat = pText;
    char buffer[BOUNDED_PRINTF_SIZE];
    const int length = std::snprintf(buffer, sizeof buffer, pFormat, args...);
    const outcome result = bounded(pText, args...);
    EXPECT_EQ(result.length, length) << pText;
    EXPECT_EQ(result.kept, std::string(buffer)) << pText;
}

TEST(BoundedPrintf, GivesWhatPrintfGives) {
    for (const int width : {0, 7, -7, 999, 4094, 4096, -5000, 20000, -300000}) {
        for (const int precision : {-1, 0, 3, 4095, 5195, 5196, 5197, 40000, 299998}) {
            expect_like_printf("a%*.*db%+*.*lldc", width, precision, -123, width, precision, 5LL);
            expect_like_printf("%0*.*x|%#*.*lo", width, precision, 0xBEEFU, width, precision, 8L);
            expect_like_printf("<%*.*s>%*c", width, precision, "text", width, 'c');
            expect_like_printf("% 0*.*f|%-#*.*e", width, precision, 1e300 / 3, width, precision,
                               0.1);
            expect_like_printf("%*.*Lg%#*.*g", width, precision, 2.5L, width, precision, 2.5);
            expect_like_printf("%*.*f%0*.*a", width, precision, -INFINITY, width, precision, 0.1);
        }
    }
    expect_like_printf("%d %5.2f%% %s", 4, 2.5, "plain");
    expect_like_printf("%05000d|%.5000s|%hhd%hd%zu%jd%td%%%p", 1, "s", 300, 70000, size_t{1},
                       intmax_t{-2}, ptrdiff_t{3}, static_cast<void*>(nullptr));
    const std::string longText(9000, 'x');
    expect_like_printf("%*s|", 9001, longText.c_str());
}

TEST(BoundedPrintf, CountsWidthsThatNobodyCouldAfford) {
    EXPECT_EQ(bounded("%2000000000d", 5).length, 2000000000);
    EXPECT_EQ(bounded("%2000000000d", 5).kept, std::string(4095, ' '));
    EXPECT_EQ(bounded("%-*d|", 2000000000, 5).kept, "5" + std::string(4094, ' '));
    EXPECT_EQ(bounded("%.*d", INT_MAX - 1, -5).kept, "-" + std::string(4094, '0'));
    EXPECT_EQ(bounded("%2147483647.2147483645d", -5).kept, " -" + std::string(4093, '0'));
    EXPECT_EQ(bounded("%.2000000000f", 0.5).length, 2000000002);
    EXPECT_EQ(bounded("%2147483647s", "").length, INT_MAX);
    EXPECT_EQ(bounded("%.2147483647s", "short").kept, "short");
}

TEST(BoundedPrintf, RefusesWhatPrintfRefuses) {
    EXPECT_EQ(bounded("%2147483648d", 5).length, -1);
    EXPECT_EQ(bounded("%99999999999999999999d", 5).length, -1);
    EXPECT_EQ(bounded("%*d", INT_MIN, 5).length, -1);
    EXPECT_EQ(bounded("%2000000000d%2000000000d", 5, 5).length, -1);
    int count = 77;
    EXPECT_EQ(bounded("%5000d%n", 5, &count).length, -1);
    EXPECT_EQ(bounded("%5000d%", 5).length, -1);
    EXPECT_EQ(count, 77);
}

} // namespace
