#include "trace_clock.h"

#include <ctime>
#include <pthread.h>
#include <unistd.h>

namespace {

uint64_t read_clock(clockid_t clock) {
    timespec now{};
    clock_gettime(clock, &now);
    return static_cast<uint64_t>(now.tv_sec) * 1'000'000'000 + static_cast<uint64_t>(now.tv_nsec);
}

thread_local uint32_t uThreadId = 0; ///< 0: not yet asked for

} // namespace

uint64_t trace_now() {
    return read_clock(CLOCK_BOOTTIME);
}

cu_timeinfo trace_time_base() {
    // The closest pair of a few: anything may happen between two readings.
    cu_timeinfo base{};
    uint64_t uClosest = UINT64_MAX;
    for (int i = 0; i < 5; ++i) {
        const uint64_t uBefore = trace_now();
        const uint64_t uTimeOfDay = read_clock(CLOCK_REALTIME);
        const uint64_t uTaken = trace_now() - uBefore;
        if (uTaken < uClosest) {
            uClosest = uTaken;
            base = {uTimeOfDay, uBefore + uTaken / 2};
        }
    }
    return base;
}

uint32_t trace_thread_id() {
    // The child of a fork has one thread, with another id.
    static const int registered = pthread_atfork(nullptr, nullptr, [] { uThreadId = 0; });
    (void)registered;
    if (uThreadId == 0)
        uThreadId = static_cast<uint32_t>(gettid());
    return uThreadId;
}
