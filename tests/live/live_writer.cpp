// Appends numbered records to trace files as fast as it can: record 1, 2, 3...
// of each file in turn, every one a string of the file's index, the number and
// some letters. Says on standard output when it begins ("ready"), and at its end
// which numbers a reader left no room for ("dropped FILE FIRST LAST", a line for
// each unbroken run of them).
//
//   live_writer [-n COUNT] [-s BYTES] [-u MICROSECONDS] [-r] [-w] FILE...
//
//   -n  records of each file; by default it goes on until SIGTERM. The last one
//       is never dropped.
//   -s  size of each file
//   -u  pause after each record of every file
//   -r  what finds no room is tried again, so nothing is dropped
//   -w  waits until a reader has taken its place in every file
#include "reader_place.h"
#include "trace_writer.h"

#include <algorithm>
#include <array>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <limits>
#include <string>
#include <unistd.h>
#include <vector>

namespace {

constexpr useconds_t RETRY_US = 100;
constexpr useconds_t IDLE_US = 1000;

volatile std::sig_atomic_t bStop = 0;

struct dropped_run {
    uint64_t uFirst;
    uint64_t uLast;
};

struct live_file {
    trace_writer writer;
    std::vector<dropped_run> dropped;

    void add_dropped(uint64_t uNumber) {
        if (!dropped.empty() && dropped.back().uLast + 1 == uNumber)
            dropped.back().uLast = uNumber;
        else
            dropped.push_back({uNumber, uNumber});
    }
};

struct settings {
    uint64_t uCount = std::numeric_limits<uint64_t>::max();
    trace_writer_options options;
    useconds_t uPause = 0;
    bool bRetry = false;
    bool bWaitForReaders = false;
};

uint64_t clock_ns(clockid_t clock) {
    timespec now{};
    clock_gettime(clock, &now);
    return static_cast<uint64_t>(now.tv_sec) * 1'000'000'000 + static_cast<uint64_t>(now.tv_nsec);
}

[[noreturn]] void fail(const char* pWhat) {
    perror(pWhat);
    exit(1);
}

/// Appends record `uNumber`; false when the reader left no room.
bool append(live_file& file, size_t uIndex, uint64_t uNumber) {
    constexpr char LETTERS[] = "abcdefghijklmnopqrstuvwxyzabcdefghijklmnopqrstuvwxyz";
    std::array<char, 96> text;
    snprintf(text.data(), text.size(), "%zu %llu %.*s", uIndex,
             static_cast<unsigned long long>(uNumber), static_cast<int>(uNumber % 47), LETTERS);
    const trace_origin origin{"_LIV", static_cast<uint32_t>(uIndex), clock_ns(CLOCK_MONOTONIC)};
    const trace_writer_status status = file.writer.append_string(origin, text.data());
    if (status < 0)
        fail("append");
    return status == TRACE_WRITER_OK;
}

void append_or_retry(live_file& file, size_t uIndex, uint64_t uNumber, const settings& chosen) {
    const bool bMustBeTaken = chosen.bRetry || uNumber == chosen.uCount;
    while (!append(file, uIndex, uNumber)) {
        if (!bMustBeTaken || bStop) {
            file.add_dropped(uNumber);
            return;
        }
        usleep(RETRY_US);
    }
}

void wait_for_readers(std::vector<live_file>& files) {
    const auto is_read = [](live_file& file) { return reader_has_its_place(file.writer); };
    while (std::count_if(files.begin(), files.end(), is_read) != std::ssize(files) && !bStop)
        usleep(IDLE_US);
}

settings read_options(int argc, char** argv) {
    settings chosen;
    int option;
    while ((option = getopt(argc, argv, "n:s:u:rw")) != -1) {
        if (option == 'n')
            chosen.uCount = strtoull(optarg, nullptr, 10);
        else if (option == 's')
            chosen.options.uFileSize = static_cast<uint32_t>(strtoul(optarg, nullptr, 10));
        else if (option == 'u')
            chosen.uPause = static_cast<useconds_t>(strtoul(optarg, nullptr, 10));
        else if (option == 'r')
            chosen.bRetry = true;
        else if (option == 'w')
            chosen.bWaitForReaders = true;
        else
            exit(2);
    }
    chosen.options.timeInfo = {clock_ns(CLOCK_REALTIME), clock_ns(CLOCK_MONOTONIC)};
    return chosen;
}

} // namespace

int main(int argc, char** argv) {
    const settings chosen = read_options(argc, argv);
    signal(SIGTERM, [](int) { bStop = 1; });
    std::vector<live_file> files(static_cast<size_t>(argc - optind));
    for (size_t i = 0; i < files.size(); ++i)
        if (files[i].writer.create(argv[static_cast<size_t>(optind) + i], chosen.options) != 0)
            fail("create");
    puts("ready");
    fflush(stdout);
    if (chosen.bWaitForReaders)
        wait_for_readers(files);
    for (uint64_t uNumber = 1; uNumber <= chosen.uCount && !bStop; ++uNumber) {
        for (size_t i = 0; i < files.size(); ++i)
            append_or_retry(files[i], i, uNumber, chosen);
        if (chosen.uPause != 0)
            usleep(chosen.uPause);
    }
    for (size_t i = 0; i < files.size(); ++i) {
        files[i].writer.close();
        for (const dropped_run& run : files[i].dropped)
            printf("dropped %zu %llu %llu\n", i, static_cast<unsigned long long>(run.uFirst),
                   static_cast<unsigned long long>(run.uLast));
    }
    return 0;
}
