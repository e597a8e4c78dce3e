// Runs kelvo and the floor in turn over traces made for the purpose, and prints
// what both cost and how they compare. See --help.
#include "child.h"
#include "follow.h"
#include "live_load.h"
#include "paired_runs.h"
#include "sweep.h"
#include "temp_directory.h"

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <exception>
#include <getopt.h>
#include <sstream>
#include <string>
#include <string_view>
#include <vector>

namespace {

constexpr char HELP[] = R"(Usage: kelvo_throughput [option...]
Compares kelvo with a plain loop over the same mapped files that writes the same
bytes (kelvo_floor), after a check that the bytes are the same.

  --records=N    records of the large inputs (default 5000000)
  --repeat=N     runs of each program; medians are printed (default 5)
  --only=TEXT    only the inputs whose name contains TEXT
  --output=WHERE what the measured programs write to: null (/dev/null, the
                 default), pipe (a pipe that is read as fast as it comes) or
                 file (in the temporary directory)
  --linearity    also the table over 0.5 to 20 million records
  --follow[=S]   also the cost of following 8 idle files for S seconds
                 (default 30), and how soon a record then comes out
  --all          both
  --sweep[=LIST] also what becomes of the costs with the number of files; of
                 the parts interleaved, row and rest only those in LIST
  --files=LIST   the numbers of files there, instead of a few for each part
  --live[=F,R,S,M] also kelvo -f on F files that get R records a second each, for
                 S seconds, and hold those of M milliseconds (default
                 300,3000,5,1000; numbers at the end may be left out)
  --none         none of the comparisons: with one of these options
  --quick        a hundredth of the records, one run each, follows for 2 seconds
  --kelvo=FILE   measure this program (default: the one built beside)
  --temp=DIR     where inputs are made (default $TMPDIR or /tmp); they need up
                 to 0.4 GB at a time, 1.4 GB with --linearity
)";

struct settings : run_settings {
    uint64_t uRecords = 5'000'000;
    std::string only;
    std::string sTarget = "/dev/null";
    bool bComparisons = true;
    bool bLinearity = false;
    bool bFollow = false;
    bool bSweep = false;
    bool bLive = false;
    bool bQuick = false;
    unsigned uFollowSeconds = 30;
    sweep_settings sweep;
    live_load live;
};

/// An input of the comparison.
struct input {
    const char* pName;
    const char* pProfile; ///< of kelvo_sample; "values": records of 64 bytes
    unsigned uFiles;
    unsigned uShare; ///< one in so many of the records asked for
    bool bSequential;
    bool bRaw;
};
constexpr input INPUTS[] = {
    {"one file", "values", 1, 1, false, false},
    {"8 files interleaved", "values", 8, 1, false, false},
    {"64 files interleaved", "values", 64, 1, false, false},
    {"300 files in a row", "values", 300, 1, true, false},
    {"three numbers, a string", "numbers", 1, 1, false, false},
    {"two strings, 128 bytes", "strings", 1, 2, false, false},
    {"raw values", "values", 1, 5, false, true},
    {"raw data blocks", "numbers", 1, 10, false, true},
};

/// Makes the traces of an input, `uRecords` in all as far as the files divide
/// them. Returns how many there are.
uint64_t make_input(const input& in, uint64_t uRecords, const std::string& sDirectory) {
    const uint64_t uPerFile = std::max<uint64_t>(uRecords / in.uFiles, 1);
    const std::string sTimes = in.bSequential ? "sequential" : "interleave";
    if (std::string_view(in.pProfile) == "values")
        make_values(sDirectory, in.uFiles, uPerFile, sTimes);
    else
        run_quietly({SAMPLE_PROGRAM, "--directory=" + sDirectory,
                     std::string("--profile=") + in.pProfile,
                     "--files=" + std::to_string(in.uFiles),
                     "--records=" + std::to_string(uPerFile), "--times=" + sTimes});
    return uPerFile * in.uFiles;
}

void print_heading(const settings& options) {
    printf("Output to %s, medians of %u run%s, programs in turn.\n\n", options.sTarget.c_str(),
           options.uRepeat, options.uRepeat == 1 ? "" : "s");
    printf("%-24s %-6s %8s %8s %8s %9s %9s %9s %7s %7s\n", "input", "", "Mrec", "wall s", "CPU s",
           "Mrec/s", "resident", "private", "wall", "CPU");
    printf("%-24s %-6s %8s %8s %8s %9s %9s %9s %7s %7s\n", "", "", "", "", "", "", "MiB", "MiB",
           "ratio", "ratio");
}

void compare(const settings& options, const input& in) {
    const temp_directory directory(options.temp);
    const uint64_t uRecords = make_input(in, options.uRecords / in.uShare, directory.path());
    const program_pair programs(options.kelvo, directory.path(), in.bRaw);
    const comparison same = compare_outputs(programs.words[0], programs.words[1]);

    const paired_runs runs(options, programs, directory.path());
    const auto millions = static_cast<double>(uRecords) / 1e6;
    for (size_t i = 0; i < 2; ++i) {
        const double wall = runs.median(i, &run_cost::wall);
        printf("%-24s %-6s %8.3f %8.3f %8.3f %9.3f %9.1f %9.1f", i == 0 ? in.pName : "",
               i == 0 ? "kelvo" : "floor", millions, wall, runs.median(i, &run_cost::cpu),
               millions / wall, runs.median(i, &run_cost::maxResident) / MIB,
               static_cast<double>(same.uPrivate[i]) / MIB);
        if (i == 0)
            printf(" %7.2f %7.2f", runs.median_ratio(&run_cost::wall),
                   runs.median_ratio(&run_cost::cpu));
        printf("\n");
    }
    fflush(stdout);
}

void measure_linearity(const settings& options) {
    printf("\nOne file of 64-byte records, output to %s, medians of %u:\n\n"
           "%8s %8s %8s %11s %10s %9s %9s\n",
           options.sTarget.c_str(), options.uRepeat, "Mrec", "wall s", "CPU s", "wall ns/rec",
           "CPU ns/rec", "resident", "CPU ratio");
    for (const uint64_t uThousands : {500U, 1000U, 2000U, 5000U, 10'000U, 20'000U}) {
        const temp_directory directory(options.temp);
        const uint64_t uRecords =
            make_input(INPUTS[0], uThousands * (options.bQuick ? 10 : 1000), directory.path());
        const program_pair programs(options.kelvo, directory.path());
        const paired_runs runs(options, programs, directory.path());
        const double wall = runs.median(0, &run_cost::wall);
        const double cpu = runs.median(0, &run_cost::cpu);
        const auto records = static_cast<double>(uRecords);
        printf("%8.3f %8.3f %8.3f %11.1f %10.1f %9.1f %9.2f\n", records / 1e6, wall, cpu,
               wall * 1e9 / records, cpu * 1e9 / records,
               runs.median(0, &run_cost::maxResident) / MIB, runs.median_ratio(&run_cost::cpu));
        fflush(stdout);
    }
}

// ----------------------------------------------------------------- options

bool read_target(std::string_view text, settings* pOptions) {
    pOptions->target = text == "pipe"   ? output_target::PIPE
                       : text == "file" ? output_target::REGULAR_FILE
                                        : output_target::NULL_DEVICE;
    pOptions->sTarget = text == "pipe" ? "a pipe" : text == "file" ? "a file" : "/dev/null";
    return text == "pipe" || text == "file" || text == "null";
}

std::vector<unsigned> numbers_of(const std::string& sList) {
    std::vector<unsigned> numbers;
    std::istringstream list(sList);
    for (std::string sNumber; std::getline(list, sNumber, ',');)
        numbers.push_back(static_cast<unsigned>(strtoul(sNumber.c_str(), nullptr, 10)));
    return numbers;
}

bool read_load(const std::string& sValue, live_load* pLoad) {
    const std::vector<unsigned> numbers = numbers_of(sValue);
    unsigned* const fields[] = {&pLoad->uFiles, &pLoad->uRate, &pLoad->uSeconds, &pLoad->uRoomMs};
    if (numbers.size() > std::size(fields) || std::ranges::count(numbers, 0U) != 0)
        return false;
    for (size_t i = 0; i < numbers.size(); ++i)
        *fields[i] = numbers[i];
    return true;
}

bool read_option(char letter, const std::string& sValue, settings* pOptions) {
    switch (letter) {
    case 'n':
        pOptions->uRecords = strtoull(sValue.c_str(), nullptr, 10);
        return pOptions->uRecords != 0;
    case 'c':
        pOptions->uRepeat = static_cast<unsigned>(strtoul(sValue.c_str(), nullptr, 10));
        return pOptions->uRepeat != 0;
    case 'w':
        pOptions->only = sValue;
        return true;
    case 'o':
        return read_target(sValue, pOptions);
    case 'l':
        return pOptions->bLinearity = true;
    case 'f':
        if (!sValue.empty())
            pOptions->uFollowSeconds = static_cast<unsigned>(strtoul(sValue.c_str(), nullptr, 10));
        return pOptions->bFollow = pOptions->uFollowSeconds != 0;
    case 'a':
        return pOptions->bLinearity = pOptions->bFollow = true;
    case 's':
        pOptions->sweep.parts = sValue;
        return pOptions->bSweep = sweep_parts_exist(sValue);
    case 'i':
        pOptions->sweep.files = numbers_of(sValue);
        return std::ranges::count(pOptions->sweep.files, 0U) == 0;
    case 'v':
        return pOptions->bLive = read_load(sValue, &pOptions->live);
    case '0':
        pOptions->bComparisons = false;
        return true;
    case 'q':
        pOptions->uRecords = 50'000;
        pOptions->uRepeat = 1;
        pOptions->uFollowSeconds = 2;
        pOptions->sweep.uRestSeconds = 1;
        pOptions->live.uSeconds = 1;
        return pOptions->bQuick = true;
    case 'k':
        pOptions->kelvo = sValue;
        return true;
    case 't':
        pOptions->temp = sValue;
        return true;
    default:
        return false;
    }
}

settings read_options(int argc, char** argv) {
    static constexpr option OPTIONS[] = {
        {"records", required_argument, nullptr, 'n'}, {"repeat", required_argument, nullptr, 'c'},
        {"only", required_argument, nullptr, 'w'},    {"output", required_argument, nullptr, 'o'},
        {"linearity", no_argument, nullptr, 'l'},     {"follow", optional_argument, nullptr, 'f'},
        {"sweep", optional_argument, nullptr, 's'},   {"files", required_argument, nullptr, 'i'},
        {"live", optional_argument, nullptr, 'v'},    {"all", no_argument, nullptr, 'a'},
        {"none", no_argument, nullptr, '0'},          {"quick", no_argument, nullptr, 'q'},
        {"kelvo", required_argument, nullptr, 'k'},   {"temp", required_argument, nullptr, 't'},
        {"help", no_argument, nullptr, 'h'},          {nullptr, 0, nullptr, 0},
    };
    settings options;
    options.kelvo = KELVO_PROGRAM;
    options.temp = temp_parent();
    for (int code; (code = getopt_long(argc, argv, "", OPTIONS, nullptr)) != -1;) {
        const bool bGood =
            read_option(static_cast<char>(code), optarg != nullptr ? optarg : "", &options);
        if (!bGood) {
            fputs(HELP, code == 'h' ? stdout : stderr);
            exit(code == 'h' ? 0 : 1);
        }
    }
    if (optind != argc)
        give_up(std::string("unexpected argument ") + argv[optind]);
    return options;
}

/// False when a run of the sweep failed.
bool run_benchmarks(int argc, char** argv) {
    settings options = read_options(argc, argv);
    setenv("LC_ALL", "C", 1); // the floor writes times as this locale does
    if (options.bComparisons) {
        print_heading(options);
        for (const input& in : INPUTS)
            if (std::string_view(in.pName).find(options.only) != std::string_view::npos)
                compare(options, in);
    }
    if (options.bLinearity)
        measure_linearity(options);
    if (options.bFollow) {
        const temp_directory directory(options.temp);
        measure_follow(options.kelvo, directory.path(), options.uFollowSeconds);
    }
    if (options.bLive) {
        const temp_directory directory(options.temp);
        measure_live_load(options.kelvo, directory.path(), options.target, options.live);
    }
    options.sweep.uRecords = options.uRecords / 5;
    return !options.bSweep || measure_sweep(options, options.sweep);
}

} // namespace

int main(int argc, char** argv) {
    try {
        return run_benchmarks(argc, argv) ? 0 : 1;
    } catch (const std::exception& failure) {
        fflush(stdout);
        fprintf(stderr, "kelvo_throughput: %s\n", failure.what());
        return 1;
    }
}
