// Twins: arguments that name one and the same file, by a link or in another spelling.
// Each is read by itself and completely, outside follow mode only.
//
// The merge has twins open at the same time, but of some things there is only one:
// the lock, which belongs to the process and is dropped when any descriptor of the
// file is closed, and the two words that the reader stores. So the running twins
// share one descriptor, lock and mapping. The first opens it, the last closes it.
//
// Twins are found while the arguments are opened, before any of them runs. Then they
// run on threads of their own; what they share has a mutex, taken last of all.
#pragma once

#include "kelvo.h"
#include "open_result.h"

/// Makes the accepted file known; when an earlier one is the same, the two are
/// twins. Returns false when memory ran out. Main thread, before any reader runs
/// or in follow mode, where a file must be new.
bool join_twins(trace_file* pTraceFile);

/// Undoes join_twins, if it was done: before the record is released. Main thread.
void part_from_twins(trace_file* pTraceFile);

/// What open_alone and close_alone do, among twins.
open_result open_among_twins(trace_file* pTraceFile);
void close_among_twins(trace_file* pTraceFile);

/// Notes where the reader stands and stores uSeqLock for all.
void tell_place_among_twins(trace_file* pTraceFile);

/// Notes whether the reader asks for the oldest record and stores uTailReq for all.
void ask_among_twins(trace_file* pTraceFile, bool bAsks);

/// Bytes that there was no memory for when join_twins returned false.
extern const int64_t SIZE_OF_TWINS;
