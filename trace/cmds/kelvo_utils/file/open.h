// Opening, validating, closing and releasing trace files; nothing is printed but by
// open_lock_map_trace_file.
//
// A file is made by open_checked_file. One that is accepted is either read at once,
// or parked until its turn comes and brought back by open_lock_map_trace_file. Either
// way close_trace_file ends it, and the record stays until release_trace_file.
#pragma once

#include "kelvo.h"
#include "open_result.h"

#include <memory>

/// Closes a file and releases it.
struct file_closer {
    void operator()(trace_file* pTraceFile) const;
};
using trace_file_ptr = std::unique_ptr<trace_file, file_closer>;

/// Opens, locks and maps a file and judges its header, of which `pHeader` receives a
/// copy: the writer may change the mapped one at any time. The file is handed out
/// when it could be mapped, with OPEN_NO_TRACE_FILE too; nothing is stored in it.
///
/// With `bReadOnly` it is opened for reading only, without a lock, and nothing is
/// stored in it later either: it keeps every byte and its times. Its writer knows of no
/// reader then and may overwrite what is being read. Files that are one and the same
/// are to be opened alike.
/// Main thread.
open_result open_checked_file(const char* pName, bool bReadOnly, trace_file_ptr* ppTraceFile,
                              trace_file_header* pHeader);

/// Accepts the file when its record area can be used: it belongs to the files of the
/// run now, and its two reader words may be stored. `header` is the copy that was
/// judged; `pElem` receives what orders the files (see take_header). Main thread.
open_result accept_trace_file(trace_file* pTraceFile, const trace_file_header& header,
                              TrcPreProcHdrElem* pElem);

/// Gives mapping, descriptor and lock back until the accepted file is read.
void park_trace_file(trace_file* pTraceFile);

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
