// The warnings about damaged trace files. Each is one line on standard error,
// written in one piece and flushed. Any thread.
//
// Those that begin "WARNING: Irrecoverable corruption detected" mean that the
// rest of the file is given up; those that begin "Bad trace file," only that no
// record can be read where the reader stands.
#pragma once

#include "kelvo.h"

/// `pRec` is printed, never followed.
[[gnu::cold]] void warn_out_of_bounds(const trace_file* pTraceFile,
                                      const trace_record_header* pRec);

[[gnu::cold]] void warn_record_function(const trace_file* pTraceFile, uint32_t uOffset,
                                        uint16_t uFunction);
[[gnu::cold]] void warn_record_component(const trace_file* pTraceFile, uint32_t uOffset,
                                         const char* pCompId);
[[gnu::cold]] void warn_record_length(const trace_file* pTraceFile, uint32_t uOffset,
                                      uint32_t uLength);

/// The reader stands beyond uActualFileSize.
[[gnu::cold]] void warn_beyond_file_size(uint32_t uOffset);

/// The record at `uOffset` runs over the position where the oldest data begins.
[[gnu::cold]] void warn_runs_over_oldest(uint32_t uOffset, const trace_record_header& header);
