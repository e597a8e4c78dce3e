// The two words of the file header that a reader stores: uSeqLock, which says what
// it has passed, and uTailReq, by which it asks for the oldest record.
//
// One mapping, one reader: the words are stored as the reader moves. Of twins, which
// read one mapping, uSeqLock is that of the slowest, stored now and then, since
// storing it late only holds the writer back; and uTailReq stays raised while any of
// them asks (see twins.h). A file that is only read has no words stored.
#pragma once

#include "kelvo.h"
#include "shared_words.h"

/// For a file with bTellsSeldom.
[[gnu::cold]] void tell_place_seldom(trace_file* pTraceFile);

/// At every step. The word is stored whole: whatever somebody else stored in it is
/// gone with the next step.
inline void tell_place(trace_file* pTraceFile) {
    if (!pTraceFile->bTellsSeldom) [[likely]]
        store_seq_lock(pTraceFile->pHeader, pTraceFile->uExpectedSeq);
    else
        tell_place_seldom(pTraceFile);
}

/// The same at once, for twins too: when the reader is going to rest.
void tell_place_now(trace_file* pTraceFile);

// The reader's handshake with the writer. While uTailReq is raised the writer leaves
// the oldest record where it is, so that the reader can take its place there. The
// reader waits for the writer's acknowledgement only for a short time: a file whose
// writer has ended is read without one.

/// Raises uTailReq: asks the writer to leave the oldest record where it is.
void request_tail(trace_file* pTraceFile);

/// Whether the writer has acknowledged it. Of a file that is only read always true:
/// there is nothing to wait for.
bool tail_is_kept(const trace_file* pTraceFile);

/// Lowers uTailReq: the writer may give up old records again.
void release_tail(trace_file* pTraceFile);
