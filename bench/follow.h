#pragma once

#include <string>

/// Measures kelvo -f on eight files to which nothing is appended for
/// `uSeconds`, and how long a record then takes from its append until it can
/// be read from kelvo's output. Prints the figures.
void measure_follow(const std::string& sKelvo, const std::string& sDirectory, unsigned uSeconds);
