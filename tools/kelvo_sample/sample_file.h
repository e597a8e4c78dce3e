// One trace file of a run: its writer, its clock, and the count of its records.
#pragma once

#include "options.h"
#include "trace_writer.h"

#include <memory>
#include <string>
#include <string_view>
#include <vector>

/// Small, fast and the same everywhere, unlike the library's distributions.
class random_numbers {
public:
    explicit random_numbers(uint64_t uSeed) : uState(uSeed) {}

    uint64_t next() {
        uint64_t u = uState += 0x9E3779B97F4A7C15;
        u = (u ^ (u >> 30)) * 0xBF58476D1CE4E5B9;
        u = (u ^ (u >> 27)) * 0x94D049BB133111EB;
        return u ^ (u >> 31);
    }

    /// A number from 0 to uBound - 1.
    uint32_t below(uint32_t uBound) {
        return static_cast<uint32_t>((next() >> 32) * uBound >> 32);
    }

private:
    uint64_t uState;
};

/// What a file is about. The texts must live as long as the file is open.
struct sample_program {
    std::string_view path; ///< of the traced program
    std::string_view name; ///< its base name
    uint32_t uPid = 0;
    uint16_t uNode = 1;
};

class sample_file {
public:
    /// Makes the file `name` in the options' directory, `uSize` bytes long.
    /// Raw time stamps are wall time moved by `base`; `headerBase` stands in
    /// the header. Returns false when the message is printed.
    bool open(const sample_options& options, const std::string& name, const sample_program& program,
              uint64_t uSize, const cu_timeinfo& base, const cu_timeinfo& headerBase);

    /// Closes the file; false, with a message, when one of its records could
    /// not be written.
    bool close();

    /// Origin of a record that is written at `uWallTime`.
    trace_origin origin(std::string_view compId, uint32_t uThread, uint64_t uWallTime) const {
        return {compId, uThread, uWallTime - base.timeinfo1 + base.timeinfo2};
    }

    /// Takes note of what became of a record. False when it was refused.
    bool note(trace_writer_status status) {
        if (status >= 0)
            ++uGiven;
        else if (failure == TRACE_WRITER_OK)
            failure = status;
        return status >= 0;
    }

    std::string name;
    trace_writer writer;
    cu_timeinfo base{};
    uint64_t uGiven = 0; ///< records handed to the writer, dropped ones included
    trace_writer_status failure = TRACE_WRITER_OK; ///< of the first record refused
    trace_writer_counts counts;                    ///< as they were at the close
};

/// The files of a run, open or closed.
using sample_files = std::vector<std::unique_ptr<sample_file>>;
