// Opening, locking, validating, mapping and closing trace files. The only code
// that calls mmap.
#pragma once

#include "kelvo.h"

/// Opens one file argument: prints its header summary, applies the first file's
/// time zone and start argument, and hands the new record out. Outside follow
/// mode the file comes back parked: unmapped, unlocked, closed, with a private
/// copy of its header in pHeader. Main thread.
///
/// `pElem` receives the header of the first record of the record area and the
/// converted time of the oldest record (bOldestKnown, oldestTime); its other
/// fields are the caller's. `total_files` is the number of file arguments, `fileIndex` this one's
/// position. With `bPrBaseProgName` only the base program name is printed.
/// Returns 0, or -1 after a message (with -B perhaps without one); then nothing
/// is handed out and nothing stays open.
int open_trace_file(const char* pName, trace_file** ppTraceFile, TrcPreProcHdrElem* pElem,
                    int bPrBaseProgName, unsigned int total_files, unsigned int fileIndex);

/// Opens, locks (unless -z) and maps the file: fd, uSize, pHeader, pMapEnd and
/// pWrap. Returns 0, or -1 after a message; the descriptor then stays in fd for
/// close_trace_file. Any thread.
int open_lock_map_trace_file(trace_file* pTraceFile);

/// Releases mapping, descriptor, lock and per-file lists; lowers uTailReq, ends
/// uSeqLock and sets the file's times. The record itself stays. With
/// `bSigActive` memory is left alone.
void close_trace_file(trace_file* pTraceFile, int bSigActive);

/// Sets TZ from anchor.tz_offset.
void set_tz();
