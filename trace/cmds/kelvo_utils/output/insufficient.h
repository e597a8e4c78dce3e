// The one way in which a failed allocation or thread creation is reported.
// Any thread.
#pragma once

#include <cstdint>

/// Warnings written so far; read without a lock at the end of the run.
uint32_t insufficient_resources_warnings();

/// Those of them that were written while opening files or starting tasks.
uint32_t insufficient_resources_warnings_during_open();

/// Writes "WARNING: Insufficient memory (size=%ld) to process: %s\n" to
/// standard error and counts it. A null name does nothing.
void warn_insufficient_resources(const char* pName, int64_t size);

/// The same, while opening files or starting tasks: also writes the marker line
/// "\t[INSUFFICIENT MEMORY TO PROCESS]\n" straight to standard output (on
/// another thread than the main one it is handed over).
void warn_insufficient_resources_during_open(const char* pName, int64_t size);
