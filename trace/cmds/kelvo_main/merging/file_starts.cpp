#include "file_starts.h"

#include "exchange.h"
#include "insufficient.h"
#include "messages.h"
#include "open.h"
#include "output_queue.h"
#include "pool.h"

#include <algorithm>
#include <atomic>
#include <memory>
#include <new>
#include <span>

namespace {

TrcFmtngProcCtrl& ctrl = Glbl_TrcFmtngProcCtrl;

/// So many files may run before their time: their handshakes take some ten
/// milliseconds each, in which the main thread prints a short file many times over.
constexpr uint32_t RUNNING_AHEAD = 16;

constexpr uint32_t NO_FILE = UINT32_MAX;

std::unique_ptr<merge_file[]> mergeFiles; ///< in the order in which they are started
uint32_t uStartedFiles = 0;
std::atomic<bool> bStarting{false};

bool its_time_has_come(const TrcPreProcHdrElem& candidate, const record_batch& batch) {
    return batch.uLastStamp >= candidate.header.timeStamp ||
           cu_time_ns(batch.uLastStamp, batch.base) >= candidate.earliestFrom;
}

/// Whether the next file may start whatever its time. In the low-memory mode it may
/// not, but when its predecessor has come to its end; `next` is the place behind that
/// one. (Between them lie only files that could not be started.)
bool may_run_ahead(uint32_t next) {
    if (!memory_is_restricted)
        return running_files() < RUNNING_AHEAD;
    const uint32_t uNext = ctrl.uNextUnOpenFileIdx;
    while (next < uNext && ctrl.pTrcPreProcHdrList[next].pTrcFile->bErrorProcessing)
        ++next;
    return next == uNext;
}

/// Diagnostic line of the low-memory mode.
void say(const char* pWhat, const trace_file* pTraceFile) {
    if (memory_is_restricted)
        output_err_text("%s: %s\n", pWhat, pTraceFile->pName);
}

merge_file& make_merge_file(trace_file* pTraceFile, const TrcPreProcHdrElem* pElem) {
    merge_file& file = mergeFiles[uStartedFiles];
    file.pFile = pTraceFile;
    file.uNumber = uStartedFiles++;
    if (pElem != nullptr && pElem->bOldestKnown) {
        file.bOldestKnown = true;
        file.oldestTime = pElem->oldestTime;
    }
    file.reader.base = pTraceFile->timeInfo;
    return file;
}

} // namespace

bool reserve_merge_files(uint32_t uFiles) {
    mergeFiles.reset(new (std::nothrow) merge_file[uFiles]());
    uStartedFiles = 0;
    return mergeFiles != nullptr && TrcOutput_Q.reserve({mergeFiles.get(), uFiles});
}

void release_merge_files() {
    mergeFiles.reset();
    TrcOutput_Q.reserve({});
}

int cmp_trc_file_hdrs(const void* pFirst, const void* pSecond) {
    const auto time = [](const void* pElem) {
        const auto& elem = *static_cast<const TrcPreProcHdrElem*>(pElem);
        return cu_time_ns(elem.header.timeStamp, elem.pTrcFile->timeInfo);
    };
    const cu_nanoseconds first = time(pFirst);
    const cu_nanoseconds second = time(pSecond);
    return first < second ? -1 : first > second ? 1 : 0;
}

void sort_files() {
    const std::span files{ctrl.pTrcPreProcHdrList, static_cast<size_t>(anchor.iNumberFiles)};
    std::stable_sort(files.begin(), files.end(),
                     [](const TrcPreProcHdrElem& first, const TrcPreProcHdrElem& second) {
                         return cmp_trc_file_hdrs(&first, &second) < 0;
                     });
    cu_nanoseconds earliest = CU_NANOSECONDS_MAX;
    for (size_t uIndex = files.size(); uIndex-- > 0;) {
        TrcPreProcHdrElem& elem = files[uIndex];
        if (elem.bOldestKnown)
            earliest = std::min(earliest, elem.oldestTime);
        elem.earliestFrom = earliest;
        elem.pTrcFile->index2 = static_cast<uint32_t>(uIndex);
    }
}

int start_tracefile_processing(trace_file* pTraceFile, const TrcPreProcHdrElem* pElem) {
    say("Starting", pTraceFile);
    if (anchor.bFollow || open_lock_map_trace_file(pTraceFile) == 0) {
        merge_file& file = make_merge_file(pTraceFile, pElem);
        file_starts_running(file);
        if (poolAddNewTask(&pTraceFile->threadId, &file, &file.account.pTask) == 0) {
            say("Queued", pTraceFile);
            return 0;
        }
        file_stops_running(file);
        warn_insufficient_resources_during_open(pTraceFile->pName, pTraceFile->uSize);
    }
    close_trace_file(pTraceFile);
    return -1;
}

void TrcFileProcessingCtrl(const record_batch* pBatch, uint32_t next) {
    if (anchor.bFollow)
        return;
    const auto uFiles = static_cast<uint32_t>(anchor.iNumberFiles);
    while (ctrl.uNextUnOpenFileIdx < uFiles) {
        TrcPreProcHdrElem& candidate = ctrl.pTrcPreProcHdrList[ctrl.uNextUnOpenFileIdx];
        const bool bItsTurn = pBatch != nullptr && its_time_has_come(candidate, *pBatch);
        if (!bItsTurn && !may_run_ahead(pBatch == nullptr ? next : NO_FILE))
            break;
        bStarting.store(true, std::memory_order_relaxed);
        candidate.isOpenned = 1;
        if (start_tracefile_processing(candidate.pTrcFile, &candidate) != 0) {
            candidate.isOpenned = 0;
            candidate.pTrcFile->bErrorProcessing = 1;
        }
        ++ctrl.uNextUnOpenFileIdx;
    }
    bStarting.store(false, std::memory_order_relaxed);
}

bool files_are_being_started() {
    return bStarting.load(std::memory_order_relaxed);
}
