// Live mode: signals, the pace of the records, and the care for readers while
// nothing is written.
#pragma once

#include "sample_file.h"

#include <chrono>
#include <vector>

/// From its construction on SIGINT and SIGTERM end the run in good order; there
/// is one at a time. Used by one thread.
class live_pace {
public:
    /// `announcement` is printed when the files are there, with the first record.
    live_pace(const sample_options& options, std::string announcement);

    /// The files to be polled; they must outlive the pace's use.
    void add(sample_file* pFile) {
        files.push_back(pFile);
    }

    /// Waits until the next record is due, polling the writers meanwhile, and
    /// stores the time of day, later than any before. False when the run is to
    /// end.
    bool next(uint64_t* pWallTime);

private:
    using clock = std::chrono::steady_clock;

    bool is_over(clock::time_point now) const;

    std::vector<sample_file*> files;
    uint64_t uRate; ///< of all files together, records per second; 0: no pause
    clock::time_point started;
    clock::time_point ends;    ///< time_point::max(): not by itself
    std::string sAnnouncement; ///< until it is printed
    uint64_t uDone = 0;
    uint64_t uLastTime = 0;
};

/// The present time of day, nanoseconds since the epoch.
uint64_t time_of_day();

/// Prints a line for each file: written and dropped.
void report_live(const sample_files& files);
