// Programs that are run and measured. Every failure ends the benchmark with a
// message, by an exception that main catches: a figure that is not sure is none.
#pragma once

#include <cstdint>
#include <string>
#include <sys/types.h>
#include <vector>

using command_words = std::vector<std::string>;

/// Where the measured programs write.
enum class output_target { NULL_DEVICE, PIPE, REGULAR_FILE };

/// What one run cost. Seconds; bytes.
struct run_cost {
    double wall = 0;
    double cpu = 0;         ///< user and system, all threads
    double maxResident = 0; ///< mapped files included
    double waits = 0;       ///< times that a thread gave its processor up by itself
};

[[noreturn]] void give_up(const std::string& sWhy);

/// A child whose standard output comes through a pipe, or goes to `sFile`.
class piped_child {
public:
    explicit piped_child(const command_words& words, const std::string& sFile = "");
    piped_child(const piped_child&) = delete;
    piped_child& operator=(const piped_child&) = delete;
    ~piped_child();

    /// Fills the buffer, less at the end of the output only. Looks at the child
    /// before.
    size_t read(char* pBuffer, size_t uSize);
    /// Notes the memory and the threads in use.
    void look();
    /// Waits for the end, which must be good.
    void finish();
    void terminate();

    /// Nanoseconds that the child has run on all processors so far.
    uint64_t cpu_time() const;
    int descriptor() const {
        return fd;
    }
    /// Most memory seen that no file stands behind, bytes.
    uint64_t private_memory() const {
        return uPrivate;
    }
    /// Most threads seen.
    uint64_t threads() const {
        return uThreads;
    }
    /// How often its threads gave their processors up by themselves so far, those
    /// that have ended left out.
    uint64_t waits() const;

private:
    pid_t pid = -1;
    int fd = -1;
    uint64_t uPrivate = 0;
    uint64_t uThreads = 0;
};

/// Runs a program to its good end. For output_target::REGULAR_FILE, `sFile` is written.
run_cost run_measured(const command_words& words, output_target target, const std::string& sFile);

/// Runs a program that is not measured; its output is thrown away.
void run_quietly(const command_words& words);

/// What the comparison of two outputs saw.
struct comparison {
    uint64_t uBytes = 0;
    uint64_t uPrivate[2] = {}; ///< see piped_child
    uint64_t uThreads[2] = {};
};

/// Runs both programs and compares what they write; ends the benchmark when
/// that differs.
comparison compare_outputs(const command_words& first, const command_words& second);
