#include "follow.h"

#include "child.h"
#include "trace_writer.h"

#include <algorithm>
#include <array>
#include <chrono>
#include <cstdio>
#include <poll.h>
#include <thread>
#include <unistd.h>
#include <vector>

namespace {

using clock_type = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr size_t FILES = 8;
constexpr int LATENCIES = 40;
constexpr auto BETWEEN_RECORDS = 300ms; // long enough for kelvo to fall idle again
constexpr auto ANSWER_INTERVAL = 2ms;   // the writers answer a reader that comes
constexpr auto START_TIME = 2s;

struct followed_files {
    std::array<trace_writer, FILES> writers;
    std::vector<std::string> paths;
    uint32_t uRecords = 0;

    void make(const std::string& sDirectory) {
        FILE* const pFile = fopen((sDirectory + "/_FLW.tpl").c_str(), "w");
        if (pFile == nullptr || fputs("1 \"record %u\"\n", pFile) < 0 || fclose(pFile) != 0)
            give_up("cannot make a template in " + sDirectory);
        for (trace_writer& writer : writers) {
            paths.push_back(sDirectory + "/follow-" + std::to_string(paths.size()) + ".trc");
            if (writer.create(paths.back().c_str()) != TRACE_WRITER_OK)
                give_up("cannot make " + paths.back());
            append(writer);
        }
    }

    void append(trace_writer& writer) {
        timespec now{};
        clock_gettime(CLOCK_REALTIME, &now);
        const uint64_t uTime =
            static_cast<uint64_t>(now.tv_sec) * 1'000'000'000 + static_cast<uint64_t>(now.tv_nsec);
        if (writer.append_uint32({"_FLW", 1, uTime}, 1, uRecords++) != TRACE_WRITER_OK)
            give_up("cannot append a record");
    }

    void answer_readers(std::chrono::milliseconds time) {
        const auto end = clock_type::now() + time;
        while (clock_type::now() < end) {
            for (trace_writer& writer : writers)
                writer.poll();
            std::this_thread::sleep_for(ANSWER_INTERVAL);
        }
    }
};

/// Whether output comes within `iMilliseconds`; takes what is there.
bool take_output(const piped_child& kelvo, int iMilliseconds) {
    pollfd wait{kelvo.descriptor(), POLLIN, 0};
    if (poll(&wait, 1, iMilliseconds) <= 0)
        return false;
    char buffer[65536];
    return read(kelvo.descriptor(), buffer, sizeof buffer) > 0;
}

void take_all_output(const piped_child& kelvo) {
    while (take_output(kelvo, 0))
        ;
}

/// Milliseconds from an append to kelvo's output, sorted.
std::vector<double> measure_latencies(followed_files& files, const piped_child& kelvo) {
    std::vector<double> result;
    for (int i = 0; i < LATENCIES; ++i) {
        // Uneven, so that no rhythm of kelvo's is met again and again.
        std::this_thread::sleep_for(BETWEEN_RECORDS + i % 7 * 13ms);
        take_all_output(kelvo);
        const auto begin = clock_type::now();
        files.append(files.writers[static_cast<size_t>(i) % FILES]);
        if (!take_output(kelvo, 5000))
            give_up("a followed record did not come within 5 seconds");
        const std::chrono::duration<double, std::milli> taken = clock_type::now() - begin;
        result.push_back(taken.count());
    }
    std::sort(result.begin(), result.end());
    return result;
}

} // namespace

void measure_follow(const std::string& sKelvo, const std::string& sDirectory, unsigned uSeconds) {
    followed_files files;
    files.make(sDirectory);
    command_words words{sKelvo, "-f", "-t", sDirectory};
    words.insert(words.end(), files.paths.begin(), files.paths.end());
    piped_child kelvo(words);
    files.answer_readers(START_TIME);
    take_all_output(kelvo);

    const auto begin = clock_type::now();
    const uint64_t uBefore = kelvo.cpu_time();
    std::this_thread::sleep_for(std::chrono::seconds(uSeconds));
    const auto cpu = static_cast<double>(kelvo.cpu_time() - uBefore) / 1e9;
    const std::chrono::duration<double> wall = clock_type::now() - begin;
    printf("\nFollowing %zu idle files for %.1f s: %.3f %% of a processor (%.1f ms)\n", FILES,
           wall.count(), 100 * cpu / wall.count(), 1000 * cpu);

    const std::vector<double> latencies = measure_latencies(files, kelvo);
    printf("A record after at least %d ms of silence, from append to output, %d times: "
           "median %.2f ms, longest %.2f ms\n",
           static_cast<int>(BETWEEN_RECORDS.count()), LATENCIES, latencies[LATENCIES / 2],
           latencies.back());
    kelvo.terminate();
}
