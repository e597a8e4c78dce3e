// What the tests of following runs share: who writes two files as fast as it
// can, and the records that a command prints of them.
#pragma once

#include "run_command.h"
#include "trace_writer.h"

#include <array>
#include <cstdint>
#include <set>
#include <string>
#include <utility>

/// Waits until a reader of the file has found its first record; answers it.
void wait_for_reader(trace_writer& writer);

/// Numbers of records, each with the index of its file.
using record_numbers = std::set<std::pair<unsigned int, uint64_t>>;

/// Two files that are filled with records 1, 2, 3... by turns, every one a string
/// of the file's index, the number and some letters.
class live_files {
public:
    live_files(const std::string& sFirst, const std::string& sSecond, uint32_t uFileSize);

    /// Appends `uCount` records to each file. Where a reader leaves no room, a
    /// record is dropped, or with `bRetry` tried again; so is the last one always.
    void write(uint64_t uCount, bool bRetry);

    std::array<trace_writer, 2> writers;
    uint64_t uWritten = 0;
    record_numbers dropped;
};

/// A process that goes on writing such files until it is killed.
class live_writer {
public:
    live_writer(const std::string& sFirst, const std::string& sSecond);
    ~live_writer() {
        kill();
    }
    live_writer(const live_writer&) = delete;
    live_writer& operator=(const live_writer&) = delete;

    void kill();

private:
    pid_t m_pid = -1;
};

/// The records that a command prints of such files with -o s, one after the
/// other. Fails the test when anything but whole records follows the summaries.
class record_stream {
public:
    explicit record_stream(live_command& command) : m_command(command) {}

    /// Takes the next record; false at the end of the output.
    bool next();

    /// Takes records up to number `uEnd` of all.
    void read(uint64_t uEnd) {
        while (uCount < uEnd && next()) {
        }
    }

    /// Takes all that is left, and expects the command to end well and in silence.
    void finish();

    uint64_t uCount = 0;            ///< records so far
    std::array<uint64_t, 2> last{}; ///< the last number of each file; 0: none yet
    /// What is left out between the records of each file: the first record of a
    /// file begins the count.
    record_numbers missing;

private:
    live_command& m_command;
    std::array<bool, 2> m_lacksNumber{}; ///< the last record has no sequence number
};
