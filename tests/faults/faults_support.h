// A run of two small trace files with templates, in which something may fail,
// and what must hold of it whatever fails.
#pragma once

#include "raw_trace.h"
#include "run_command.h"
#include "temp_dir.h"

#include <cstddef>
#include <functional>
#include <string>
#include <vector>

/// Whether the command is built with a sanitizer.
#ifdef KELVO_SANITIZED
inline constexpr bool SANITIZED = true;
#else
inline constexpr bool SANITIZED = false;
#endif

/// The command with the calls of failing_calls.cpp, of which those fail that
/// the variables say.
command_setup failing_setup(const std::vector<std::string>& variables);

/// What failing_calls.cpp says on standard error; removed from it.
bool take_failure_note(command_result* pResult);

/// Fails the test when the run crashed, or a sanitizer has something to say.
void expect_sound_end(const command_result& result);

/// How often `sText` occurs.
size_t count_of(const std::string& sText, const std::string& sIn);

/// Fails the test when a trace file differs in more than the reader's two words
/// from what it was.
void expect_only_reader_words(const std::vector<std::byte>& before,
                              const std::vector<std::byte>& after);

/// The two files, the directory of their templates, and what stands in them.
/// The first file is read first; the second one's time comes halfway through
/// it, so that its reader is started by the other reader.
struct fault_sample {
    fault_sample();

    /// `options`, then the templates' directory, then both files.
    std::vector<std::string> arguments(const std::vector<std::string>& options = {}) const;

    /// Whether all records of the file stand in the text, by a template or without.
    bool is_whole(size_t uIndex, const std::string& sOut) const;

    /// What holds of every run over the two files: it ends soundly; no record
    /// is missing unless the file is named in a warning, a numbered message was
    /// given or the status is 1; the totals count the warnings and markers; the
    /// trace files are as they were.
    void expect_honest(const command_result& result) const;

    temp_dir dir;
    std::string files[2];
    std::string sTemplates; ///< the file
    std::vector<std::byte> before[2];
};

struct fault_run {
    std::vector<std::string> arguments;
    command_setup setup;
};

/// Makes and checks the runs from number 0 on, up to but not including `uEnd`, or
/// until a check fails or returns false. Each has a sample of its own, and some go
/// on at the same time: most of their time they wait.
void sweep_faults(size_t uEnd, const std::function<fault_run(size_t, const fault_sample&)>& make,
                  const std::function<bool(size_t, const fault_sample&, command_result&)>& check);

/// Runs kelvo_sample with these options into `directory`. Returns the paths of
/// the trace files, in order.
std::vector<std::string> make_samples(const std::string& directory,
                                      const std::vector<std::string>& options);
