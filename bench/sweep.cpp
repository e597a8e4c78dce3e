#include "sweep.h"

#include "temp_directory.h"

#include <algorithm>
#include <chrono>
#include <cstdio>
#include <exception>
#include <optional>
#include <poll.h>
#include <sstream>
#include <string_view>
#include <thread>
#include <unistd.h>

namespace {

using clock_type = std::chrono::steady_clock;

constexpr uint64_t RECORDS_IN_A_ROW = 200; // of each file
constexpr uint64_t RECORDS_AT_REST = 10;
constexpr int TAKING_TIME_MS = 60'000; // until all followed files are read

double seconds_since(clock_type::time_point begin) {
    return std::chrono::duration<double>(clock_type::now() - begin).count();
}

class file_sweep {
public:
    file_sweep(const run_settings& settings, const sweep_settings& sweep)
        : m_settings(settings), m_sweep(sweep) {}

    void interleaved(unsigned uFiles) {
        merge_row(uFiles, std::max<uint64_t>(m_sweep.uRecords / uFiles, 1), "groups");
    }
    void in_a_row(unsigned uFiles) {
        merge_row(uFiles, RECORDS_IN_A_ROW, "sequential");
    }
    void at_rest(unsigned uFiles);

private:
    void merge_row(unsigned uFiles, uint64_t uPerFile, const char* pTimes);
    const std::string& one_file(uint64_t uRecords);

    const run_settings& m_settings;
    const sweep_settings& m_sweep;
    std::optional<temp_directory> m_oneFile;
    uint64_t m_uRecordsInOne = 0;
};

/// A directory with all records in one file.
const std::string& file_sweep::one_file(uint64_t uRecords) {
    if (m_uRecordsInOne != uRecords) {
        m_uRecordsInOne = uRecords;
        m_oneFile.emplace(m_settings.temp);
        make_values(m_oneFile->path(), 1, uRecords, "sequential");
    }
    return m_oneFile->path();
}

void file_sweep::merge_row(unsigned uFiles, uint64_t uPerFile, const char* pTimes) {
    const temp_directory directory(m_settings.temp);
    const uint64_t uRecords = make_values(directory.path(), uFiles, uPerFile, pTimes);
    const program_pair programs(m_settings.kelvo, directory.path());
    const program_pair onOneFile(m_settings.kelvo, one_file(uRecords));
    const comparison same = compare_outputs(programs.words[0], programs.words[1]);
    paired_runs runs, ofOneFile;
    for (unsigned u = 0; u < m_settings.uRepeat; ++u) {
        ofOneFile.run_once(m_settings, onOneFile, directory.path());
        runs.run_once(m_settings, programs, directory.path());
    }
    const auto records = static_cast<double>(uRecords);
    double rates[2], shares[2];
    for (size_t i = 0; i < 2; ++i) {
        rates[i] = records / 1e6 / runs.median(i, &run_cost::wall);
        shares[i] = ofOneFile.median(i, &run_cost::wall) / runs.median(i, &run_cost::wall);
    }
    printf(" %8.3f %8.3f %6.2f %8.1f %9.1f %7llu %8.0f %9.3f %6.2f %7.2f %7.2f\n", records / 1e6,
           rates[0], shares[0], runs.median(0, &run_cost::cpu) * 1e9 / records,
           static_cast<double>(same.uPrivate[0]) / MIB,
           static_cast<unsigned long long>(same.uThreads[0]), runs.median(0, &run_cost::waits),
           rates[1], shares[1], runs.median_ratio(&run_cost::wall),
           runs.median_ratio(&run_cost::cpu));
}

/// Reads until each file has brought the record that a following run begins
/// with. Returns the seconds from `begin` on.
double wait_until_taken(const piped_child& kelvo, unsigned uFiles, clock_type::time_point begin) {
    constexpr std::string_view RECORD = " _VAL ";
    std::string text;
    for (unsigned uTaken = 0; uTaken < uFiles;) {
        char buffer[65536];
        pollfd wait{kelvo.descriptor(), POLLIN, 0};
        const ssize_t iRead =
            poll(&wait, 1, TAKING_TIME_MS) > 0 ? read(wait.fd, buffer, sizeof buffer) : 0;
        if (iRead <= 0)
            give_up(std::to_string(uFiles - uTaken) + " files are not read");
        text.append(buffer, static_cast<size_t>(iRead));
        size_t uAt;
        while ((uAt = text.find(RECORD)) != std::string::npos) {
            text.erase(0, uAt + RECORD.size());
            ++uTaken;
        }
    }
    return seconds_since(begin);
}

void file_sweep::at_rest(unsigned uFiles) {
    const temp_directory directory(m_settings.temp);
    make_values(directory.path(), uFiles, RECORDS_AT_REST, "interleave");
    command_words words = program_pair(m_settings.kelvo, directory.path()).words[0];
    words.insert(words.begin() + 1, "-f");
    const auto begin = clock_type::now();
    piped_child kelvo(words);
    const double taken = wait_until_taken(kelvo, uFiles, begin);
    std::this_thread::sleep_for(std::chrono::seconds(1)); // falls idle
    const auto rest = clock_type::now();
    const uint64_t uCpu = kelvo.cpu_time(), uWaits = kelvo.waits();
    std::this_thread::sleep_for(std::chrono::seconds(m_sweep.uRestSeconds));
    const double cpu = static_cast<double>(kelvo.cpu_time() - uCpu) / 1e9;
    const double waits = static_cast<double>(kelvo.waits() - uWaits);
    const double wall = seconds_since(rest);
    kelvo.look();
    printf(" %8.2f %8.3f %9.1f %8.1f %7llu\n", taken, 100 * cpu / wall, waits / wall,
           static_cast<double>(kelvo.private_memory()) / MIB,
           static_cast<unsigned long long>(kelvo.threads()));
    kelvo.terminate();
}

constexpr char MERGE_HEADING[] =
    "   files     Mrec   Mrec/s  share   CPU ns   private threads    waits     floor  share"
    "    wall     CPU\n"
    "                                     /rec       MiB                      Mrec/s       "
    "    ratio   ratio\n";

/// A part of the sweep: a table, a row for each number of files.
struct sweep_part {
    std::string_view name;
    const char* pTitle;
    const char* pHeading;
    std::vector<unsigned> files;
    void (file_sweep::*pMeasure)(unsigned);
};

const std::vector<sweep_part>& all_parts() {
    static const std::vector<sweep_part> PARTS{
        {"interleaved",
         "Files interleaved, as many records in all: up to 16 in a row are in one file",
         MERGE_HEADING,
         {1, 16, 256, 4096},
         &file_sweep::interleaved},
        {"row",
         "Files in a row, 200 records each",
         MERGE_HEADING,
         {1, 100, 1000},
         &file_sweep::in_a_row},
        {"rest",
         "Files followed at rest",
         "   files  taken s    CPU %  waits/s  private threads\n"
         "                                         MiB\n",
         {8, 100, 1000},
         &file_sweep::at_rest},
    };
    return PARTS;
}

std::vector<std::string> words_of(const std::string& sList) {
    std::vector<std::string> words;
    std::istringstream list(sList);
    for (std::string sWord; std::getline(list, sWord, ',');)
        words.push_back(sWord);
    return words;
}

} // namespace

bool sweep_parts_exist(const std::string& sParts) {
    return std::ranges::all_of(words_of(sParts), [](const std::string& sWord) {
        return std::ranges::count(all_parts(), sWord, &sweep_part::name) == 1;
    });
}

bool measure_sweep(const run_settings& settings, const sweep_settings& sweep) {
    file_sweep rows(settings, sweep);
    const std::vector<std::string> chosen = words_of(sweep.parts);
    bool bGood = true;
    for (const sweep_part& part : all_parts()) {
        if (!chosen.empty() && std::ranges::count(chosen, part.name) == 0)
            continue;
        printf("\n%s:\n\n%s", part.pTitle, part.pHeading);
        for (const unsigned uFiles : sweep.files.empty() ? part.files : sweep.files) {
            printf("%8u", uFiles);
            fflush(stdout);
            try {
                (rows.*part.pMeasure)(uFiles);
            } catch (const std::exception& failure) {
                printf(" %s\n", failure.what());
                bGood = false;
            }
        }
    }
    fflush(stdout);
    return bGood;
}
