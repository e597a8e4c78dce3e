#include "kv_cu.h"

#include <gtest/gtest.h>

#include <vector>

// The split is right when it adds up again and the nanoseconds are in range:
// no other pair does both.
TEST(cvt_time, splits_every_sum_exactly_and_downwards) {
    std::vector<uint64_t> words;
    for (const uint64_t uBase : {uint64_t{0}, uint64_t{2'000'000'000},
                                 uint64_t{1'700'000'000'123'456'789}, uint64_t{1} << 63})
        for (const int64_t iStep : {-1'000'000'001, -1'000'000'000, -999'999'999, -1, 0, 1})
            words.push_back(uBase + static_cast<uint64_t>(iStep));

    for (const uint64_t uTime : words) {
        for (const uint64_t uNow : words) {
            for (const uint64_t uThen : words) {
                const cu_timeinfo base{.timeinfo1 = uNow, .timeinfo2 = uThen};
                timespec result;
                ASSERT_EQ(cu_cvt_time_platform_1(uTime, &base, &result, 2), 0);
                ASSERT_TRUE(result.tv_nsec >= 0 && result.tv_nsec < 1'000'000'000);
                const auto sum =
                    static_cast<cu_nanoseconds>(result.tv_sec) * 1'000'000'000 + result.tv_nsec;
                const auto expected =
                    static_cast<cu_nanoseconds>(uNow) + static_cast<cu_nanoseconds>(uTime) - uThen;
                ASSERT_TRUE(sum == expected) << uTime << ' ' << uNow << ' ' << uThen;
            }
        }
    }
}
