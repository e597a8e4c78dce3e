// When the reader of each file starts.
//
// Outside follow mode the readers are started in the order of the pre-processing
// list: before one that runs pushes a record that is not earlier than the first
// record of the next file's area (raw), or not earlier than the oldest record of any
// file not yet started (converted), and when a file is finished at the latest. So a
// file is mapped only while the merge has reached its time range, and no record is
// printed before an earlier one.
//
// As long as few files are running the next one is started without waiting for its
// time, so that the handshakes of files that follow each other overlap with reading.
// The main thread waits for such a file only when its time has come: the oldest time
// that was found when it was opened is known to the output queue.
#pragma once

#include "merge_file.h"

#include <cstdint>

/// Makes room for all files of the run. Returns false when memory ran out. Main
/// thread, before any file is started.
bool reserve_merge_files(uint32_t uFiles);

/// Releases it. When no reader runs.
void release_merge_files();

/// Sort comparison of two TrcPreProcHdrElem by the time of their `header`.
int cmp_trc_file_hdrs(const void* pFirst, const void* pSecond);

/// Sorts the pre-processing list, tells each file its position (index2) and
/// fills earliestFrom. Before any reader runs.
void sort_files();

/// Hands the file's reader task to the pool; outside follow mode opens, locks
/// and maps the file again first. `pElem`, null in follow mode, tells what is known
/// of its oldest record. Returns 0, or -1 when that failed (reported); the file is
/// then closed. Counts the file as running on success. priorityQmutex held.
int start_tracefile_processing(trace_file* pTraceFile, const TrcPreProcHdrElem* pElem);

/// Starts the readers of the next files in the order of the list: with a batch, which
/// is about to be pushed, all those whose time it brings; with null, at the end of a
/// reader, the list element `next`; and as many as may run before their time.
/// priorityQmutex held.
void TrcFileProcessingCtrl(const record_batch* pBatch, uint32_t next);

/// Whether a thread is in the middle of that. Any thread, no lock.
bool files_are_being_started();

/// The first of these, when there is any file left to start.
inline void start_files_before(const record_batch& batch) {
    const TrcFmtngProcCtrl& ctrl = Glbl_TrcFmtngProcCtrl;
    if (ctrl.uNextUnOpenFileIdx < static_cast<uint32_t>(anchor.iNumberFiles))
        TrcFileProcessingCtrl(&batch, 0);
}
