#include "profiles.h"

#include "record_source.h"

#include <algorithm>
#include <cstdio>

namespace {

constexpr uint64_t LIVE_FILE_SIZE = 1 << 20;
constexpr uint64_t LIVE_RECORDS_THAT_FIT = 64;
constexpr uint64_t HOUR_NS = 3'600'000'000'000;
constexpr uint32_t FIRST_PID = 4000;

constexpr sample_program PROGRAM{"/usr/bin/sample", "sample", 0, 1};

const char* name_of(sample_profile profile) {
    switch (profile) {
    case sample_profile::NUMBERS:
        return "numbers";
    case sample_profile::STRINGS:
        return "strings";
    case sample_profile::DATA:
        return "data";
    case sample_profile::MIXED:
        return "mixed";
    default:
        return "plain";
    }
}

/// Numbered with leading zeros, so that the shell lists the files in order.
std::string file_name(const sample_options& options, uint32_t uIndex) {
    const std::string sLast = std::to_string(options.uFiles - 1);
    std::string sIndex = std::to_string(uIndex);
    sIndex.insert(0, sLast.size() - sIndex.size(), '0');
    return std::string(name_of(options.profile)) + "-" + sIndex + ".trc";
}

uint64_t file_size(const sample_options& options, uint64_t uRecords) {
    if (options.uFileSize != 0)
        return options.uFileSize;
    if (!options.bLive)
        return profile_file_size(options, uRecords);
    return std::max(LIVE_FILE_SIZE, profile_file_size(options, LIVE_RECORDS_THAT_FIT));
}

/// Where the raw time stamps of a file begin.
cu_timeinfo time_base(const sample_options& options, uint32_t uIndex, uint64_t uStart) {
    if (!options.bDistinctBases)
        return {0, 0};
    // Every machine has been up for another while.
    return {uStart, (uIndex % 64 * 37 % 64 + 1) * HOUR_NS + uIndex};
}

struct profile_run {
    const sample_options& options;
    uint64_t uRecords; ///< per file
    uint64_t uStart;

    /// Time of record `uNumber` of file `uIndex` when it is not live.
    uint64_t time_of(uint32_t uIndex, uint64_t uNumber) const {
        const uint64_t uPlace =
            options.bSequential ? uIndex * uRecords + uNumber : uNumber * options.uFiles + uIndex;
        return uStart + uPlace * options.uStep;
    }

    bool times_fit() const {
        const uint64_t uLongest = (UINT64_MAX - uStart) / options.uFiles;
        return options.uStep == 0 || uRecords <= uLongest / options.uStep;
    }

    bool open(sample_files* pFiles, uint32_t uIndex) const {
        const uint64_t uSize = file_size(options, uRecords);
        if (uSize > UINT32_MAX) {
            fprintf(stderr,
                    "kelvo_sample: %llu records need more than the 4 GiB of a trace file; choose a"
                    " --file-size, so that the ring wraps\n",
                    static_cast<unsigned long long>(uRecords));
            return false;
        }
        sample_program program = PROGRAM;
        program.uPid = FIRST_PID + uIndex;
        const cu_timeinfo base = time_base(options, uIndex, uStart);
        pFiles->push_back(std::make_unique<sample_file>());
        return pFiles->back()->open(options, file_name(options, uIndex), program, uSize, base,
                                    base);
    }
};

/// One file after the other.
bool make_files(const profile_run& run, sample_files* pFiles) {
    for (uint32_t i = 0; i < run.options.uFiles; ++i) {
        if (!run.open(pFiles, i))
            return false;
        sample_file& file = *pFiles->back();
        record_source source(run.options, i);
        for (uint64_t u = 0; u < run.uRecords && source.append(file, u, run.time_of(i, u)); ++u)
            ;
        if (!file.close())
            return false;
    }
    return true;
}

/// One record to each file in turn.
bool append_live(const profile_run& run, live_pace* pLive, sample_files* pFiles) {
    std::vector<record_source> sources;
    for (uint32_t i = 0; i < run.options.uFiles; ++i) {
        if (!run.open(pFiles, i))
            return false;
        pLive->add(pFiles->back().get());
        sources.emplace_back(run.options, i);
    }
    bool bGoOn = true;
    for (uint64_t u = 0; bGoOn && u < run.uRecords; ++u)
        for (uint32_t i = 0; bGoOn && i < run.options.uFiles; ++i) {
            uint64_t uTime = 0;
            bGoOn = pLive->next(&uTime) && sources[i].append(*(*pFiles)[i], u, uTime);
        }
    bool bGood = true;
    for (const auto& pFile : *pFiles)
        bGood = pFile->close() && bGood;
    return bGood;
}

} // namespace

bool make_profile(const sample_options& options, live_pace* pLive, sample_files* pFiles) {
    const uint64_t uDefault = pLive != nullptr ? UINT64_MAX : PROFILE_RECORDS;
    const profile_run run{options, options.uRecords != 0 ? options.uRecords : uDefault,
                          pLive != nullptr ? time_of_day() : options.uStart};
    if (pLive != nullptr)
        return append_live(run, pLive, pFiles);
    if (!run.times_fit()) {
        fputs("kelvo_sample: the times run beyond the year 2554; choose a smaller --step\n",
              stderr);
        return false;
    }
    return make_files(run, pFiles);
}
