// Follows a small ring for as long as is asked and says whether anything was
// lost on the way or grew.
#include "follower.h"
#include "ring.h"

#include <algorithm>
#include <charconv>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <fstream>
#include <iterator>
#include <thread>
#include <unistd.h>

namespace {

using clock_type = std::chrono::steady_clock;
using namespace std::chrono_literals;

constexpr char USAGE[] =
    "usage: kelvo_soak [-s SECONDS | -n RECORDS] [-k KIB] [-g KIB] [-p KELVO] DIRECTORY\n"
    "  -s  how long to write; default 60\n"
    "  -n  how many records to write\n"
    "  -k  size of the ring; default 400, some 7,000 records\n"
    "  -g  how much more memory at the end is no growth; default 4096\n"
    "  -p  the kelvo to run; default " KELVO_PROGRAM "\n"
    "  DIRECTORY, which must exist, gets the ring and its template.\n";

constexpr auto REST_TIMEOUT = 10s;          // for what is written to be printed
constexpr auto SETTLED = 2s;                // then the use at the start is looked at
constexpr uint64_t SETTLED_RECORDS = 50000; // and not before these are printed

struct soak_options {
    uint64_t uSeconds = 60;
    uint64_t uRecords = UINT64_MAX;
    uint64_t uKiB = 400;
    uint64_t uGrowthKiB = 4096; ///< how full ring and queue are varies
    std::string sKelvo = KELVO_PROGRAM;
    std::string sDirectory;
};

bool read_number(const char* pText, uint64_t uMax, uint64_t* pValue) {
    const char* const pEnd = pText + strlen(pText);
    const auto [pRead, error] = std::from_chars(pText, pEnd, *pValue);
    return error == std::errc{} && pRead == pEnd && *pValue >= 1 && *pValue <= uMax;
}

bool read_options(int argc, char** argv, soak_options* pOptions) {
    bool bGood = true;
    for (int letter; (letter = getopt(argc, argv, "s:n:k:g:p:")) != -1;) {
        if (letter == 's') {
            bGood &= read_number(optarg, 1'000'000'000, &pOptions->uSeconds);
        } else if (letter == 'n') {
            bGood &= read_number(optarg, 2'000'000'000, &pOptions->uRecords);
            pOptions->uSeconds = 1'000'000'000;
        } else if (letter == 'k') {
            bGood &= read_number(optarg, 1'000'000, &pOptions->uKiB);
        } else if (letter == 'g') {
            bGood &= read_number(optarg, UINT32_MAX, &pOptions->uGrowthKiB);
        } else if (letter == 'p') {
            pOptions->sKelvo = optarg;
        } else {
            bGood = false;
        }
    }
    if (!bGood || optind + 1 != argc)
        return false;
    pOptions->sDirectory = argv[optind];
    return true;
}

std::atomic<bool> bInterrupted{false};

/// What kelvo used when the run had settled, and later.
struct use_record {
    process_use first{};
    process_use last{};
    uint64_t uMostKiB = 0;
    uint64_t uGrowthKiB; ///< that is none
    bool bFirstTaken = false;

    void look(const follower& kelvo) {
        last = kelvo.use();
        uMostKiB = std::max(uMostKiB, last.uPrivateKiB);
        if (!bFirstTaken)
            first = last;
        bFirstTaken = true;
    }
    bool has_grown() const {
        return last.uPrivateKiB > first.uPrivateKiB + uGrowthKiB ||
               last.uDescriptors > first.uDescriptors || last.uThreads > first.uThreads;
    }
};

/// Reads until everything that was written is printed, or nothing more comes.
void follow(soak_ring& ring, follower& kelvo, use_record* pUse) {
    const auto start = clock_type::now();
    auto nextLook = start + SETTLED;
    auto lastPrinted = start;
    uint64_t uPrinted = 0;
    while (!ring.bDone || kelvo.numbers.uNext <= ring.uWritten) {
        ring.bStop = ring.bStop || bInterrupted;
        const bool bRuns = kelvo.read(1000);
        const auto now = clock_type::now();
        if (kelvo.numbers.uPrinted != uPrinted)
            lastPrinted = now;
        uPrinted = kelvo.numbers.uPrinted;
        if (!bRuns || now - lastPrinted > REST_TIMEOUT) {
            ring.bStop = true;
            return;
        }
        if (now >= nextLook && uPrinted >= SETTLED_RECORDS) {
            pUse->look(kelvo);
            nextLook = now + 1s;
        }
    }
    pUse->look(kelvo);
}

bool report(const soak_ring& ring, const number_check& numbers, const use_record& use,
            double seconds) {
    const auto count = [](uint64_t uCount) { return static_cast<unsigned long long>(uCount); };
    const uint64_t uRest =
        ring.uWritten + 1 > numbers.uNext ? ring.uWritten + 1 - numbers.uNext : 0;
    const uint64_t uMissing = numbers.uMissing + uRest;
    const bool bLost =
        ring.uDropped + uMissing + numbers.uOutOfOrder + numbers.uOther + (ring.uWritten == 0) != 0;
    printf("written  %llu records in %.1f s (%.0f a second), %llu wraps, %llu dropped\n",
           count(ring.uWritten), seconds, static_cast<double>(ring.uWritten) / seconds,
           count(ring.uWraps), count(ring.uDropped));
    printf("printed  %llu records; %llu missing, %llu doubled or out of order, %llu other lines\n",
           count(numbers.uPrinted), count(uMissing), count(numbers.uOutOfOrder),
           count(numbers.uOther));
    printf("memory   %llu KiB when settled, %llu at the end, %llu at most\n",
           count(use.first.uPrivateKiB), count(use.last.uPrivateKiB), count(use.uMostKiB));
    printf("in use   %llu descriptors and %llu threads when settled, %llu and %llu at the end\n",
           count(use.first.uDescriptors), count(use.first.uThreads), count(use.last.uDescriptors),
           count(use.last.uThreads));
    printf("%s, %s.\n", bLost ? "Something was LOST" : "Nothing was lost",
           use.has_grown() ? "something GREW" : "nothing grew");
    return !bLost && !use.has_grown();
}

/// Prints what kelvo had to say. Whether that is nothing.
bool is_silent(const std::string& sErrors) {
    std::ifstream file(sErrors);
    const std::string sText{std::istreambuf_iterator<char>(file), {}};
    if (!sText.empty())
        printf("kelvo says:\n%s", sText.c_str());
    return sText.empty();
}

int soak(const soak_options& options) {
    const std::string sErrors = options.sDirectory + "/errors.txt";
    soak_ring ring;
    follower kelvo;
    if (!ring.make(options.sDirectory, static_cast<uint32_t>(options.uKiB * 1024)) ||
        !kelvo.start(options.sKelvo, options.sDirectory, ring.sPath, sErrors))
        return 1;
    if (!ring.wait_for_reader()) {
        is_silent(sErrors);
        return 1;
    }
    const auto start = clock_type::now();
    std::thread writer(
        [&] { ring.write(options.uRecords, start + std::chrono::seconds(options.uSeconds)); });
    use_record use{.uGrowthKiB = options.uGrowthKiB};
    follow(ring, kelvo, &use);
    writer.join();
    const std::chrono::duration<double> taken = clock_type::now() - start;
    const bool bEndedWell = kelvo.end();
    if (!bEndedWell)
        printf("kelvo did not end with status 0\n");
    const bool bGood = report(ring, kelvo.numbers, use, taken.count());
    return is_silent(sErrors) && bEndedWell && bGood ? 0 : 1;
}

} // namespace

int main(int argc, char** argv) {
    soak_options options;
    if (!read_options(argc, argv, &options)) {
        fputs(USAGE, stderr);
        return 2;
    }
    signal(SIGINT, [](int) { bInterrupted = true; });
    return soak(options);
}
