#include "live.h"

#include <algorithm>
#include <csignal>
#include <cstdio>
#include <ctime>
#include <thread>
#include <utility>

namespace {

using namespace std::chrono_literals;

/// A waiting reader is answered this often; it waits 10 milliseconds a time.
constexpr auto POLL_INTERVAL = 2ms;
/// At full speed the clock is asked only now and then whether time is up.
constexpr uint64_t RECORDS_PER_LOOK = 256;

volatile sig_atomic_t bStop = 0;

void stop(int) {
    bStop = 1;
}

} // namespace

uint64_t time_of_day() {
    timespec now{};
    clock_gettime(CLOCK_REALTIME, &now);
    return static_cast<uint64_t>(now.tv_sec) * 1'000'000'000 + static_cast<uint64_t>(now.tv_nsec);
}

live_pace::live_pace(const sample_options& options, std::string announcement)
    : uRate(options.uRate * options.uFiles), started(clock::now()),
      ends(options.uSeconds != 0 ? started + std::chrono::seconds(options.uSeconds)
                                 : clock::time_point::max()),
      sAnnouncement(std::move(announcement)) {
    bStop = 0;
    struct sigaction action {};
    action.sa_handler = stop;
    sigaction(SIGINT, &action, nullptr);
    sigaction(SIGTERM, &action, nullptr);
}

bool live_pace::is_over(clock::time_point now) const {
    return bStop != 0 || now >= ends;
}

bool live_pace::next(uint64_t* pWallTime) {
    if (!sAnnouncement.empty()) {
        fputs(sAnnouncement.c_str(), stdout);
        fflush(stdout);
        sAnnouncement.clear();
    }
    if (bStop != 0)
        return false;
    if (uRate == 0) {
        if (uDone % RECORDS_PER_LOOK == 0 && is_over(clock::now()))
            return false;
    } else {
        const auto uWhole = uDone / uRate;
        const auto uPart = uDone % uRate * 1'000'000'000 / uRate;
        const auto due = started + std::chrono::seconds(uWhole) + std::chrono::nanoseconds(uPart);
        for (auto now = clock::now();; now = clock::now()) {
            if (is_over(now))
                return false;
            if (now >= due)
                break;
            for (sample_file* const pFile : files)
                pFile->writer.poll();
            std::this_thread::sleep_for(std::min<clock::duration>(due - now, POLL_INTERVAL));
        }
    }
    ++uDone;
    *pWallTime = uLastTime = std::max(uLastTime + 1, time_of_day());
    return true;
}

void report_live(const sample_files& files) {
    for (const auto& pFile : files) {
        const trace_writer_counts& counts = pFile->counts;
        printf("%s: %llu records written, %llu dropped\n", pFile->name.c_str(),
               static_cast<unsigned long long>(pFile->uGiven - counts.uDropped),
               static_cast<unsigned long long>(counts.uDropped));
    }
}
