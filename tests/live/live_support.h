// What the tests of following runs share: the process that writes, and the
// records that a command prints of it.
#pragma once

#include "run_command.h"

#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

/// live_writer with these arguments, which see live_writer.cpp.
command_setup live_writer_setup();

/// Numbers from uFirst to uLast.
struct number_range {
    uint64_t uFirst;
    uint64_t uLast;
    friend bool operator==(const number_range&, const number_range&) = default;
};
void PrintTo(const number_range& range, std::ostream* pOut);

/// Per file the numbers that are not there, in order.
using missing_numbers = std::map<unsigned int, std::vector<number_range>>;

/// The "dropped" lines of a live_writer that has ended.
missing_numbers dropped_by(const command_result& writer);

/// A record of a live_writer as it was printed with -o s.
struct live_record {
    unsigned int uFile = 0;
    uint64_t uNumber = 0;
    uint32_t uSeqNumber = 0;
};

/// The records that a command prints, one after the other. Fails the test when
/// anything but whole records follows the file summaries.
class record_stream {
public:
    explicit record_stream(live_command& command) : m_command(command) {}

    /// The next record; none at the end of the output.
    std::optional<live_record> next();

    /// Everything up to the end of the output.
    void drain() {
        while (next()) {
        }
    }

    /// Records so far.
    uint64_t count() const {
        return m_uCount;
    }

    /// The last number of a file; 0: none yet.
    uint64_t last(unsigned int uFile) const {
        const auto found = m_last.find(uFile);
        return found == m_last.end() ? 0 : found->second;
    }

    /// The gaps between the records of each file: the first record of a file
    /// begins the count.
    const missing_numbers& missing() const {
        return m_missing;
    }

private:
    std::optional<std::string_view> next_line();
    void check_order(const live_record& record);

    live_command& m_command;
    std::string m_sText;
    size_t m_uAt = 0; ///< what lies before is done with
    uint64_t m_uCount = 0;
    std::map<unsigned int, uint64_t> m_last;
    std::set<unsigned int> m_lacksNumber; ///< files whose last record has no sequence number
    missing_numbers m_missing;
};
