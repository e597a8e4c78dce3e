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

void raise_tail_request(trace_file* pTraceFile) {
    if (pTraceFile->bReadOnly)
        return;
    if (pTraceFile->pTwins != nullptr)
        ask_among_twins(pTraceFile, true);
    else
        store_tail_request(pTraceFile->pHeader, TRC_TAIL_REQUESTED);
}

void lower_tail_request(trace_file* pTraceFile) {
    if (pTraceFile->bReadOnly)
        return;
    if (pTraceFile->pTwins != nullptr)
        ask_among_twins(pTraceFile, false);
    else
        store_tail_request(pTraceFile->pHeader, 0);
}
