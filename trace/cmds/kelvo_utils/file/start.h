// Where output begins: the -s argument, its conversion for one file, and the
// test that each record passes until the start is reached.
//
// Start times are kept in signed 32-bit seconds. A time that does not fit is
// kept as the nearest that does: a start after January 2038 begins there, one
// before December 1901 begins with the first record. Record numbers are kept
// the same way.
#pragma once

#include "kelvo.h"

/// Parses the -s argument (null counts as empty) into anchor's start settings,
/// in the process's locale and time zone. Returns 0, or -1 after a message.
/// Main thread, before any reader runs.
int parse_start(const char* pText);

/// Sets the file's own start state from anchor; pCurRec stands on the file's
/// first record. Returns 0, or -1 when the search for the newest record found
/// the file corrupt (the warning is written).
int set_file_start(trace_file* pTraceFile);

/// Whether the record (of a kind for output) is output. Changes the file's
/// start state.
bool start_is_reached(trace_file* pTraceFile, const trace_record_header& header);
