// Opening, locking, validating, mapping and closing trace files. The only code
// that calls mmap.
//
// A file is made by open_trace_file and, outside follow mode, parked at once;
// open_lock_map_trace_file brings it back when its turn to be read comes, and
// close_trace_file ends it. The record stays until release_trace_file.
#pragma once

#include "kelvo.h"

/// Opens one file argument: prints its header summary, applies the first file's
/// time zone and start argument, and hands the new record out. Outside follow
/// mode the file comes back parked: unmapped, unlocked and closed. Main thread.
///
/// `pElem` receives the header of the first record of the record area and,
/// outside follow mode, the converted time of the oldest record (bOldestKnown,
/// oldestTime); its other fields are the caller's. `total_files` is the number
/// of file arguments, `fileIndex` this one's position. With `bPrBaseProgName`
/// only the base program name is printed, the file is closed again untouched,
/// and the record handed out is null.
/// Returns 0, or -1 after a message (with -B perhaps without one); then nothing
/// is handed out and nothing stays open.
int open_trace_file(const char* pName, trace_file** ppTraceFile, TrcPreProcHdrElem* pElem,
                    int bPrBaseProgName, unsigned int total_files, unsigned int fileIndex);

/// Opens, locks (unless -z) and maps the file: fd, uSize, pHeader, pMapEnd and
/// pWrap, all taken afresh; the header is not validated, so pWrap may lie
/// anywhere. A parked file must be the one that was parked; twins share what the
/// first of them opens. Returns 0, or -1 after a message; then nothing stays open.
/// Never waits, whatever kind of file the path names, but for the holder of a lease
/// on it. Any thread.
int open_lock_map_trace_file(trace_file* pTraceFile);

/// Releases mapping, descriptor, lock and per-file lists; lowers uTailReq and ends
/// uSeqLock in a file that was accepted, and sets the file's times when modTime
/// holds one: of twins the last that closes does that. The record itself stays. May
/// be called again. Any thread; nobody else may be using the record.
void close_trace_file(trace_file* pTraceFile);

/// Releases a closed or parked record that is in no list. Null is allowed. Main
/// thread.
void release_trace_file(trace_file* pTraceFile);

/// Sets TZ from anchor.tz_offset, for all later local-time conversions of the
/// process. Main thread, while no other thread converts times.
void set_tz();
