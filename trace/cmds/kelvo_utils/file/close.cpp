#include "mapping.h"
#include "open.h"
#include "shared_words.h"
#include "thread_state.h"
#include "twins.h"

#include <cstdlib>
#include <fcntl.h>
#include <sys/stat.h>

namespace {

/// Access time now, modification time that of the newest record printed, in
/// whole microseconds. By the descriptor: the path may name another file now.
/// A file of another owner keeps its times.
void set_file_times(const trace_file* pTraceFile) {
    timespec times[2] = {{0, UTIME_NOW}, pTraceFile->modTime};
    times[1].tv_nsec -= times[1].tv_nsec % 1000;
    futimens(pTraceFile->fd, times);
}

} // namespace

void close_alone(trace_file* pTraceFile) {
    const bool bMayStore = pTraceFile->pMapEnd != nullptr && !pTraceFile->bReadOnly;
    if (bMayStore && pTraceFile->bAccepted) {
        store_tail_request(pTraceFile->pHeader, 0);
        store_seq_lock(pTraceFile->pHeader, TRC_SEQ_NO_READER);
    }
    unmap_trace_file(pTraceFile);
    if (bMayStore && pTraceFile->timeStampIsValid)
        set_file_times(pTraceFile);
    close_descriptor(pTraceFile);
}

void close_trace_file(trace_file* pTraceFile) {
    if (pTraceFile->pTwins != nullptr)
        close_among_twins(pTraceFile);
    else
        close_alone(pTraceFile);
    free_thread_info(pTraceFile);
}

void release_trace_file(trace_file* pTraceFile) {
    if (pTraceFile == nullptr)
        return;
    part_from_twins(pTraceFile);
    free(pTraceFile);
}
