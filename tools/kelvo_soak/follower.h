// kelvo, following the ring, and what it prints.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <sys/types.h>

/// What a process uses.
struct process_use {
    uint64_t uPrivateKiB = 0; ///< resident memory that no file stands behind
    uint64_t uDescriptors = 0;
    uint64_t uThreads = 0;
};

/// Whether the numbers behind "#" in the lines are 1, 2, 3... Lines before the
/// first of them are the summary.
struct number_check {
    void take(std::string_view text);

    uint64_t uPrinted = 0;
    uint64_t uNext = 1;
    uint64_t uMissing = 0;    ///< numbers passed over
    uint64_t uOutOfOrder = 0; ///< numbers at or below one that came before
    uint64_t uOther = 0;      ///< lines that hold no number

private:
    void take_line(std::string_view line);

    std::string m_sRest; ///< of a line
};

class follower {
public:
    follower() = default;
    ~follower();
    follower(const follower&) = delete;
    follower& operator=(const follower&) = delete;

    /// Runs `sKelvo -f` on the file from its first record on. Standard error goes
    /// to the file `sErrors`. False, with a message, when that fails.
    bool start(const std::string& sKelvo, const std::string& sDirectory, const std::string& sPath,
               const std::string& sErrors);

    /// Takes what is printed within `iMilliseconds`. False at the end of the output.
    bool read(int iMilliseconds);

    process_use use() const;

    /// Ends it by SIGINT and reads the rest. Whether it ended with status 0.
    bool end();

    number_check numbers;

private:
    pid_t m_pid = -1;
    int m_fd = -1;
};
