#include "reader_words.h"

#include "twins.h"

void tell_place_seldom(trace_file* pTraceFile) {
    if (pTraceFile->uStepsToTell != 0)
        --pTraceFile->uStepsToTell;
    else
        tell_place_now(pTraceFile);
}

void tell_place_now(trace_file* pTraceFile) {
    if (pTraceFile->bReadOnly)
        return;
    if (pTraceFile->pTwins != nullptr)
        tell_place_among_twins(pTraceFile);
    else
        store_seq_lock(pTraceFile->pHeader, pTraceFile->uExpectedSeq);
}

void request_tail(trace_file* pTraceFile) {
    if (pTraceFile->bReadOnly)
        return;
    if (pTraceFile->pTwins != nullptr)
        ask_among_twins(pTraceFile, true);
    else
        store_tail_request(pTraceFile->pHeader, TRC_TAIL_REQUESTED);
}

bool tail_is_kept(const trace_file* pTraceFile) {
    return pTraceFile->bReadOnly || tail_request_is_acknowledged(pTraceFile->pHeader);
}

void release_tail(trace_file* pTraceFile) {
    if (pTraceFile->bReadOnly)
        return;
    if (pTraceFile->pTwins != nullptr)
        ask_among_twins(pTraceFile, false);
    else
        store_tail_request(pTraceFile->pHeader, 0);
}
