#pragma once

#include "paired_runs.h"

#include <cstdint>
#include <string>
#include <vector>

/// What becomes of kelvo's costs with the number of files.
struct sweep_settings {
    std::string parts;             ///< names of SWEEP_PARTS, comma-separated; empty: all
    std::vector<unsigned> files;   ///< numbers of files; empty: some for each part
    uint64_t uRecords = 1'000'000; ///< of all interleaved files together
    unsigned uRestSeconds = 5;     ///< how long files at rest are watched
};

/// Whether such parts exist.
bool sweep_parts_exist(const std::string& sParts);

/// Measures and prints a table for each part. A run that fails is said in its
/// row; returns false when there was one.
bool measure_sweep(const run_settings& settings, const sweep_settings& sweep);
