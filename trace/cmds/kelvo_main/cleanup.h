#pragma once

#include <atomic>

/// Set when the run ends while pool threads may still run reader tasks: after a
/// terminating signal, or when endThrdPool gave up waiting. What readers use
/// then stays until the process has ended.
extern std::atomic<bool> bReadersMayRun;

/// Releases the run's memory: file records and the pre-processing list (unless
/// bReadersMayRun), then options, templates and buffers. With `bSigActive`, from
/// a signal handler, everything is left to the end of the process. Main thread.
void cleanup(int bSigActive);
