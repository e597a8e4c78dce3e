// kelvo and the floor over the same traces, run in turn.
#pragma once

#include "child.h"

#include <cstdint>
#include <string>
#include <vector>

inline constexpr double MIB = 1024.0 * 1024;

/// How the programs are run.
struct run_settings {
    std::string kelvo; ///< the program that is measured
    std::string temp;  ///< where inputs are made
    unsigned uRepeat = 5;
    output_target target = output_target::NULL_DEVICE;
};

/// kelvo (0) and the floor (1) with their arguments.
struct program_pair {
    command_words words[2];

    /// Over all traces of the directory, with the templates there.
    program_pair(const std::string& sKelvo, const std::string& sDirectory, bool bRaw = false);
};

/// What the runs of the two cost.
struct paired_runs {
    std::vector<run_cost> runs[2];

    paired_runs() = default;
    /// Runs each `uRepeat` times, in turn.
    paired_runs(const run_settings& settings, const program_pair& programs,
                const std::string& sDirectory);

    /// Runs both once more. Output to a file goes into `sDirectory`.
    void run_once(const run_settings& settings, const program_pair& programs,
                  const std::string& sDirectory);

    /// Median of a figure of one program.
    double median(size_t uProgram, double run_cost::*pFigure) const;
    /// Median of the ratios of runs that followed each other: on a busy machine
    /// they suffer alike.
    double median_ratio(double run_cost::*pFigure) const;
};

/// Makes traces of records of 64 bytes, `uPerFile` each; the other arguments are
/// those of kelvo_make_values. Returns how many records there are.
uint64_t make_values(const std::string& sDirectory, uint64_t uFiles, uint64_t uPerFile,
                     const std::string& sTimes);
