// Raw time stamps to seconds and nanoseconds. The exact sum needs 66 bits, so
// it is made in 128; a division of that width costs more than all the rest,
// and real times never need it.

#include "kv_cu.h"

static constexpr uint32_t NS_PER_SECOND = 1'000'000'000;

/// Times before the epoch and from the year 2554 on.
[[gnu::cold, gnu::noinline]] static void split_wide(cu_nanoseconds time, timespec* pResult) {
    cu_nanoseconds seconds = time / NS_PER_SECOND;
    cu_nanoseconds rest = time % NS_PER_SECOND;
    if (rest < 0) { // division rounds towards zero, the split downwards
        rest += NS_PER_SECOND;
        seconds--;
    }
    pResult->tv_sec = static_cast<time_t>(seconds);
    pResult->tv_nsec = static_cast<long>(rest);
}

int cu_cvt_time_platform_1(uint64_t timeStamp, const cu_timeinfo* pTimeInfo, timespec* pResult,
                           unsigned int) {
    const cu_nanoseconds time = cu_time_ns(timeStamp, *pTimeInfo);
    const auto uTime = static_cast<uint64_t>(time);
    if (time != static_cast<cu_nanoseconds>(uTime)) {
        split_wide(time, pResult);
        return 0;
    }
    pResult->tv_sec = static_cast<time_t>(uTime / NS_PER_SECOND);
    pResult->tv_nsec = static_cast<long>(uTime % NS_PER_SECOND);
    return 0;
}
