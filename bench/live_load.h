#pragma once

#include "child.h"

#include <string>

/// Files that are written at the same time.
struct live_load {
    unsigned uFiles = 300;
    unsigned uRate = 3000; ///< records a second, of each file
    unsigned uSeconds = 5;
    unsigned uRoomMs = 1000; ///< for the records of so long there is room in each
};

/// Measures kelvo -f on such files: what it costs, and how many records its
/// readers left no room for. Prints the figures.
void measure_live_load(const std::string& sKelvo, const std::string& sDirectory,
                       output_target target, const live_load& load);
