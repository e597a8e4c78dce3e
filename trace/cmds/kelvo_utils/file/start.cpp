#include "start.h"

#include "corruption.h"
#include "narrow.h"
#include "ring.h"
#include "shared_words.h"
#include "walk.h"

#include <climits>

namespace {

/// The end of the ring as seen from pCurRec.
struct newest_record {
    trace_record_header header; ///< pCurRec's own when no step was taken
    int32_t iCount = 0;         ///< records from pCurRec on, fillers not counted
};

timespec record_time(const trace_file* pTraceFile, const trace_record_header& header) {
    timespec result{};
    cu_cvt_time_platform_1(header.timeStamp, &pTraceFile->timeInfo, &result, pTraceFile->uPlatform);
    return result;
}

bool out_of_bounds(const trace_file* pTraceFile, uint64_t uOffset) {
    if (ring_holds_header(pTraceFile, uOffset))
        return false;
    warn_out_of_bounds(pTraceFile, ring_position(pTraceFile, uOffset));
    return true;
}

/// Walks from pCurRec to the oldest position, once around at most. Returns
/// false when the file is corrupt (the warning is written).
bool find_newest_record(const trace_file* pTraceFile, newest_record* pNewest) {
    uint64_t uOffset = ring_offset(pTraceFile, pTraceFile->pCurRec);
    if (out_of_bounds(pTraceFile, uOffset))
        return false;
    pNewest->header = read_record_header(pTraceFile->pCurRec);
    for (uint64_t uWalked = 0; uOffset != load_oldest_record_offset(pTraceFile->pHeader);) {
        if (uWalked >= ring_size(pTraceFile)) {
            warn_out_of_bounds(pTraceFile, ring_position(pTraceFile, uOffset));
            return false;
        }
        if (out_of_bounds(pTraceFile, uOffset))
            return false;
        const trace_record_header header = read_record_header(ring_position(pTraceFile, uOffset));
        if (header.length < sizeof(trace_record_header)) {
            warn_record_length(pTraceFile, static_cast<uint32_t>(uOffset), header.length);
            return false;
        }
        pNewest->header = header;
        if (header.function != TRC_FUNC_FILLER)
            ++pNewest->iCount;
        uWalked += header.length;
        uOffset += header.length;
        if (uOffset == ring_end(pTraceFile))
            uOffset = ring_start(pTraceFile);
    }
    return true;
}

int start_at_record(trace_file* pTraceFile, int64_t iRecord) {
    pTraceFile->startOptions = FILE_START_RECORD;
    pTraceFile->startRecords = nearest_int32(iRecord);
    return 0;
}

int start_at_time(trace_file* pTraceFile, int64_t iSeconds, int64_t iNanoSeconds) {
    pTraceFile->startOptions = FILE_START_TIME;
    pTraceFile->startSeconds = nearest_int32(iSeconds);
    pTraceFile->startNanoSeconds = nearest_int32(iNanoSeconds);
    return 0;
}

int start_after_first(trace_file* pTraceFile) {
    if (out_of_bounds(pTraceFile, ring_offset(pTraceFile, pTraceFile->pCurRec)))
        return -1;
    const timespec first = record_time(pTraceFile, read_record_header(pTraceFile->pCurRec));
    return start_at_time(pTraceFile, int64_t{first.tv_sec} + anchor.startSeconds,
                         int64_t{first.tv_nsec} + anchor.startNanoSeconds);
}

int start_before_newest(trace_file* pTraceFile) {
    newest_record newest;
    if (!find_newest_record(pTraceFile, &newest))
        return -1;
    const timespec end = record_time(pTraceFile, newest.header);
    if (anchor.startSeconds > end.tv_sec)
        return start_at_time(pTraceFile, 0, 0);
    const bool bBorrow = anchor.startNanoSeconds > end.tv_nsec;
    return start_at_time(pTraceFile, int64_t{end.tv_sec} - anchor.startSeconds - (bBorrow ? 1 : 0),
                         int64_t{end.tv_nsec} - anchor.startNanoSeconds +
                             (bBorrow ? 1'000'000'000 : 0));
}

int start_at_record_from_end(trace_file* pTraceFile) {
    newest_record newest;
    if (!find_newest_record(pTraceFile, &newest))
        return -1;
    const int64_t iCount = newest.iCount;
    return start_at_record(pTraceFile,
                           iCount > anchor.startRecords ? iCount - anchor.startRecords : iCount);
}

} // namespace

int set_file_start(trace_file* pTraceFile) {
    pTraceFile->recordNumber = 0;
    switch (anchor.startOptions) {
    case START_RECORD_FROM_BEGIN:
        return start_at_record(pTraceFile, anchor.startRecords);
    case START_SECONDS_FROM_BEGIN:
        return start_after_first(pTraceFile);
    case START_RECORDS_FROM_END:
        return start_at_record_from_end(pTraceFile);
    case START_SECONDS_FROM_END:
        return start_before_newest(pTraceFile);
    case START_TIME:
        return start_at_time(pTraceFile, anchor.startSeconds, anchor.startNanoSeconds);
    default:
        pTraceFile->startOptions = FILE_START_ALL;
        return 0;
    }
}

bool start_is_reached(trace_file* pTraceFile, const trace_record_header& header) {
    // Nothing may be stored at every record: the main thread reads this cache line.
    if (pTraceFile->startOptions == FILE_START_ALL) [[likely]]
        return true;
    bool bReached = true;
    if (pTraceFile->startOptions == FILE_START_RECORD) {
        if (pTraceFile->recordNumber < INT_MAX)
            ++pTraceFile->recordNumber;
        bReached = pTraceFile->recordNumber >= pTraceFile->startRecords;
    } else if (pTraceFile->startOptions == FILE_START_TIME) {
        const timespec time = record_time(pTraceFile, header);
        bReached =
            time.tv_sec > pTraceFile->startSeconds || (time.tv_sec == pTraceFile->startSeconds &&
                                                       time.tv_nsec > pTraceFile->startNanoSeconds);
    }
    if (bReached)
        pTraceFile->startOptions = FILE_START_ALL;
    return bReached;
}
