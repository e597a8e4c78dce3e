// Reads hostile bytes the way the command reads a trace file, but over a heap
// block of exactly their size and in one thread, so that a sanitizer sees every
// step outside and a run costs microseconds. The fuzz targets, the replay of
// their corpus and the tests of damaged files share it.
//
// What must hold whatever the bytes are is checked on the way; what does not
// hold ends the process with a message.
#pragma once

#include "kelvo.h"
#include "trace_load.h"

#include <functional>
#include <string>

/// Puts the process into the state that runs begin with: POSIX locale, UTC,
/// the templates of fuzz/templates. To be called once.
void set_up_hostile_runs();

/// Ends the process with a message unless `bHolds`. `pWhat` says what should
/// have held.
void hostile_check(bool bHolds, const char* pWhat);

/// Sends standard output and standard error to descriptors of its own while it
/// lives. Reports of the checks and of the sanitizers still come through.
class redirected_output {
public:
    /// Standard output goes to `fdOut`; -1: it is dropped. Standard error is
    /// always dropped.
    explicit redirected_output(int fdOut = -1);
    ~redirected_output();
    redirected_output(const redirected_output&) = delete;
    redirected_output& operator=(const redirected_output&) = delete;

private:
    int m_fdOut;
    int m_fdErr;
};

/// Bits of hostile_options::uForms: how each record is written.
enum : uint8_t {
    FORM_TEMPLATE = 0x01,
    FORM_RAW = 0x02,
    FORM_BRIEF = 0x04,
    FORM_ALL = 0x07,
};

struct hostile_options {
    int32_t startOptions = START_NONE;
    int32_t startSeconds = 0;
    int32_t startNanoSeconds = 0;
    int32_t startRecords = 0;
    uint8_t uForms = FORM_ALL;
    std::string sLetters = "dticfso"; ///< at most 7
    bool bManyFiles = false;          ///< the prefix shows the file's index
    bool bEveryKind = false; ///< also the kinds that no reader hands on, but that can be written

    /// Called with each record once it is written, if set.
    std::function<void(const trace_queue_element&)> onWritten{};
};

/// How the reading of a file ended.
enum class hostile_end {
    TOO_SMALL, ///< for a header
    CORRUPT,   ///< the file was given up
    NO_MORE,   ///< the newest record was reached, or the ring is inconsistent
};

struct hostile_result {
    bool bAccepted = false; ///< as a trace file that can be read here
    hostile_end end = hostile_end::TOO_SMALL;
    uint32_t uWritten = 0; ///< records that were written
};

/// Opens, walks and writes the file. One that is not accepted is walked all the
/// same: a file may be replaced between its opening and its reading, which does
/// not look at the header again.
///
/// Checks that the walk ends, that queued records lie inside the file, that
/// nothing but the reader's two words was written to it, and that the output
/// stands between records after each record.
hostile_result read_hostile_file(trace_bytes bytes, const hostile_options& options = {});

/// Checks what the formatter takes for granted about a compiled format.
void check_format(const format_entry& entry);
