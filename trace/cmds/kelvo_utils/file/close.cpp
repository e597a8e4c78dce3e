#include "mapping.h"
#include "open.h"
#include "shared_words.h"
#include "thread_state.h"

#include <cstdlib>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

/// A fault may leave the reader's thread running when another thread closes.
void end_reader_thread(trace_file* pTraceFile) {
    const pthread_t reader = pTraceFile->threadId;
    if (reader == pthread_t{} || pthread_equal(reader, pthread_self()))
        return;
    pthread_cancel(reader);
    pTraceFile->threadId = pthread_t{};
}

void free_queued_elements(trace_file* pTraceFile) {
    while (trace_queue_element* const pElement = pTraceFile->pFirstElement) {
        pTraceFile->pFirstElement = pElement->pNext;
        if (pTraceFile->pFirstElement != nullptr)
            pTraceFile->pFirstElement->pPrev = nullptr;
        free(pElement);
    }
    pTraceFile->pLastElement = nullptr;
}

/// Access time now, modification time that of the newest record printed, in
/// whole microseconds. By the descriptor: the path may name another file now.
/// A file of another owner keeps its times.
void set_file_times(const trace_file* pTraceFile) {
    timespec times[2] = {{0, UTIME_NOW}, pTraceFile->modTime};
    times[1].tv_nsec -= times[1].tv_nsec % 1000;
    futimens(pTraceFile->fd, times);
}

void close_mapping(trace_file* pTraceFile, int bSigActive) {
    if (pTraceFile->bAccepted) {
        store_tail_request(pTraceFile->pHeader, 0);
        store_seq_lock(pTraceFile->pHeader, TRC_SEQ_NO_READER);
    }
    if (bSigActive)
        return;
    unmap_trace_file(pTraceFile);
    if (pTraceFile->timeStampIsValid)
        set_file_times(pTraceFile);
}

} // namespace

void close_trace_file(trace_file* pTraceFile, int bSigActive) {
    end_reader_thread(pTraceFile);
    if (!bSigActive)
        free_queued_elements(pTraceFile);
    if (pTraceFile->pMapEnd != nullptr) {
        close_mapping(pTraceFile, bSigActive);
    } else if (!bSigActive) {
        free(pTraceFile->pHeader); // parked
        pTraceFile->pHeader = nullptr;
    }
    if (pTraceFile->fd >= 0)
        close(pTraceFile->fd);
    pTraceFile->fd = -1;
    if (!bSigActive)
        free_thread_info(pTraceFile);
}

void release_trace_file(trace_file* pTraceFile) {
    if (pTraceFile == nullptr)
        return;
    if (pTraceFile->pMapEnd == nullptr) // else a mapping, which goes with the process
        free(pTraceFile->pHeader);
    pthread_mutex_destroy(&pTraceFile->queueMutex);
    free(pTraceFile);
}
