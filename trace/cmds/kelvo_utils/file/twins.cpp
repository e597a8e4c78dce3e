#include "twins.h"

#include "identity.h"
#include "mapping.h"
#include "mutex.h"
#include "shared_words.h"

#include <algorithm>
#include <cerrno>
#include <new>

struct trace_twins {
    pthread_mutex_t mutex;
    uint32_t uRecords; ///< trace_file records that point here; main thread
    // Under the mutex:
    trace_file* pFirstRunning; ///< linked both ways
    uint32_t uRunning;
    uint32_t uAsking;  ///< those that have uTailReq raised
    bool bLatestValid; ///< one of those that have closed had a time
    timespec latest;   ///< the latest of these
};

const int64_t SIZE_OF_TWINS = sizeof(trace_twins);

namespace {

/// At least so many steps lie between two stores of uSeqLock, and more with many
/// twins: each store looks at all of them.
constexpr uint32_t STEPS_TO_TELL = 64;
constexpr uint32_t STEPS_TO_TELL_PER_TWIN = 4;

void add_running(trace_twins* pTwins, trace_file* pTraceFile) {
    pTraceFile->pPrevTwin = nullptr;
    pTraceFile->pNextTwin = pTwins->pFirstRunning;
    if (pTwins->pFirstRunning != nullptr)
        pTwins->pFirstRunning->pPrevTwin = pTraceFile;
    pTwins->pFirstRunning = pTraceFile;
    ++pTwins->uRunning;
    pTraceFile->bAmongTwins = true;
    pTraceFile->bTold = false;
    pTraceFile->bAsks = false;
    pTraceFile->uStepsToTell = 0;
}

void remove_running(trace_twins* pTwins, trace_file* pTraceFile) {
    if (pTraceFile->pPrevTwin != nullptr)
        pTraceFile->pPrevTwin->pNextTwin = pTraceFile->pNextTwin;
    else
        pTwins->pFirstRunning = pTraceFile->pNextTwin;
    if (pTraceFile->pNextTwin != nullptr)
        pTraceFile->pNextTwin->pPrevTwin = pTraceFile->pPrevTwin;
    --pTwins->uRunning;
    pTraceFile->bAmongTwins = false;
}

/// Stores the number that the slowest waits for. One that has not found its place
/// yet does not count: the oldest record is held for it meanwhile.
void store_slowest(const trace_twins* pTwins) {
    const trace_file* pSlowest = nullptr;
    for (trace_file* p = pTwins->pFirstRunning; p != nullptr; p = p->pNextTwin)
        if (p->bTold &&
            (pSlowest == nullptr || static_cast<int32_t>(p->uToldSeq - pSlowest->uToldSeq) < 0))
            pSlowest = p;
    if (pSlowest != nullptr)
        store_seq_lock(pSlowest->pHeader, pSlowest->uToldSeq);
}

void set_asking(trace_twins* pTwins, trace_file* pTraceFile, bool bAsks) {
    if (bAsks == pTraceFile->bAsks)
        return;
    pTraceFile->bAsks = bAsks;
    if (bAsks)
        ++pTwins->uAsking;
    else
        --pTwins->uAsking;
    store_tail_request(pTraceFile->pHeader, pTwins->uAsking != 0 ? TRC_TAIL_REQUESTED : 0);
}

bool is_earlier(const timespec& a, const timespec& b) {
    return a.tv_sec != b.tv_sec ? a.tv_sec < b.tv_sec : a.tv_nsec < b.tv_nsec;
}

/// The last one to close sets the file's times for all of them.
void collect_time(trace_twins* pTwins, const trace_file* pTraceFile) {
    if (!pTraceFile->timeStampIsValid ||
        (pTwins->bLatestValid && is_earlier(pTraceFile->modTime, pTwins->latest)))
        return;
    pTwins->bLatestValid = true;
    pTwins->latest = pTraceFile->modTime;
}

/// Lets the file go on in the mapping of a twin that runs, when its own path still
/// names that file. Nothing is opened: closing it again would drop the lock.
open_result share_mapping(trace_file* pTraceFile, const trace_file* pTwin) {
    file_status status;
    if (!status_of_path(pTraceFile->pName, &status))
        return {OPEN_REFUSED, errno};
    if (!is_same_file(status.identity, pTraceFile->identity))
        return {OPEN_REPLACED};
    share_open_file(pTraceFile, pTwin);
    return {};
}

} // namespace

bool join_twins(trace_file* pTraceFile) {
    trace_file* const pFirst = find_accepted_file(pTraceFile->identity);
    if (pFirst == nullptr) {
        enter_accepted_file(pTraceFile);
        return true;
    }
    if (pFirst->pTwins == nullptr) {
        pFirst->pTwins = new (std::nothrow) trace_twins{};
        if (pFirst->pTwins == nullptr)
            return false;
        pthread_mutex_init(&pFirst->pTwins->mutex, nullptr);
        pFirst->pTwins->uRecords = 1;
    }
    pTraceFile->pTwins = pFirst->pTwins;
    ++pTraceFile->pTwins->uRecords;
    return true;
}

void part_from_twins(trace_file* pTraceFile) {
    forget_accepted_file(pTraceFile);
    trace_twins* const pTwins = pTraceFile->pTwins;
    pTraceFile->pTwins = nullptr;
    if (pTwins == nullptr || --pTwins->uRecords != 0)
        return;
    pthread_mutex_destroy(&pTwins->mutex);
    delete pTwins;
}

open_result open_among_twins(trace_file* pTraceFile) {
    trace_twins* const pTwins = pTraceFile->pTwins;
    const mutex_guard guard(pTwins->mutex);
    const open_result result = pTwins->pFirstRunning != nullptr
                                   ? share_mapping(pTraceFile, pTwins->pFirstRunning)
                                   : open_alone(pTraceFile);
    if (result.eOutcome == OPEN_OK)
        add_running(pTwins, pTraceFile);
    return result;
}

void close_among_twins(trace_file* pTraceFile) {
    trace_twins* const pTwins = pTraceFile->pTwins;
    const mutex_guard guard(pTwins->mutex);
    if (!pTraceFile->bAmongTwins) {
        close_alone(pTraceFile); // not yet parked, or closed already
        return;
    }
    set_asking(pTwins, pTraceFile, false);
    remove_running(pTwins, pTraceFile);
    collect_time(pTwins, pTraceFile);
    if (pTwins->uRunning != 0) {
        store_slowest(pTwins);
        forget_open_file(pTraceFile);
        return;
    }
    if (pTwins->bLatestValid)
        pTraceFile->modTime = pTwins->latest;
    pTraceFile->timeStampIsValid = pTwins->bLatestValid;
    pTwins->bLatestValid = false;
    close_alone(pTraceFile);
}

void tell_place_among_twins(trace_file* pTraceFile) {
    trace_twins* const pTwins = pTraceFile->pTwins;
    const mutex_guard guard(pTwins->mutex);
    pTraceFile->bTold = true;
    pTraceFile->uToldSeq = pTraceFile->uExpectedSeq;
    store_slowest(pTwins);
    pTraceFile->uStepsToTell = std::max(STEPS_TO_TELL, STEPS_TO_TELL_PER_TWIN * pTwins->uRunning);
}

void ask_among_twins(trace_file* pTraceFile, bool bAsks) {
    const mutex_guard guard(pTraceFile->pTwins->mutex);
    set_asking(pTraceFile->pTwins, pTraceFile, bAsks);
}
