// The mapping of one trace file: opening it with its lock, and closing it again. The
// only code that calls mmap. Private to this folder; open.h is the way in.
#pragma once

#include "kelvo.h"
#include "open_result.h"

/// Opens, locks and maps the file as open_lock_map_trace_file says, whatever else
/// runs. Silent, and on failure nothing stays open. An accepted file must be the
/// same as before; of others the identity is taken. Any thread.
open_result open_alone(trace_file* pTraceFile);

/// Gives mapping, descriptor and lock back. Lowers uTailReq and ends uSeqLock in a
/// file that was accepted, and sets its times when modTime holds one. Harmless when
/// nothing is open.
void close_alone(trace_file* pTraceFile);

/// Gives the mapping back; pHeader, pMapEnd and pWrap become null. Harmless when
/// there is none. The descriptor stays.
void unmap_trace_file(trace_file* pTraceFile);

/// Closes the descriptor, which drops the lock. Harmless when there is none.
void close_descriptor(trace_file* pTraceFile);

/// Lets the file use what `pOther` has open.
void share_open_file(trace_file* pTraceFile, const trace_file* pOther);

/// Leaves what is open to those who share it.
void forget_open_file(trace_file* pTraceFile);
