// What the merge keeps of one file beside its trace_file: the state of its reader
// between two steps, its account with the output queue, and its place in the order.
// The three lie in cache lines apart, since different threads write them.
#pragma once

#include "kelvo.h"
#include "record_batch.h"
#include "walk.h"

struct thrd_task;

/// What the next step of a reader begins with.
enum class reader_phase : uint8_t {
    BEGINS,  ///< the handshake
    SHAKES,  ///< the look for the writer's acknowledgement
    LOOKS,   ///< a look whether a record can be read
    READS,   ///< the record that was found readable
    DRAINED, ///< closing the file: none of its records is queued any more
};

/// Between two steps of its reader; only the thread that runs the step touches it.
struct reader_state {
    reader_phase phase;
    int iWaits;                 ///< of the handshake, or for a number
    bool bPassed;               ///< the record has passed the start test already
    trace_record_header header; ///< the judged copy of the record to be read
    cu_timeinfo base;           ///< in force for it, when all before it will be formatted
};

/// The file's account with the output queue; under priorityQmutex. Beside it
/// trace_file::numRecPushed.
struct queue_account {
    thrd_task* pTask;      ///< the reader, while it runs
    uint64_t uBytes;       ///< taken by the records that numRecPushed counts
    uint32_t uRoomAt;      ///< held back: it goes on at this numRecPushed
    bool bHeldBack;        ///< the reader is suspended until there is room
    bool bDrains;          ///< the reader is suspended until its records are formatted
    bool bReads;           ///< more records may come
    bool bInNews;          ///< listed there
    bool bInHeldBack;      ///< listed there, which it may be for some time longer than held back
    merge_file* pNextNews; ///< of the files that began or ended since the last exchange
    merge_file* pNextHeld; ///< of those held back
    merge_file* pNextTask; ///< of those whose task is about to be resumed
};

/// The file's queued records as the order sees them. Main thread only.
struct file_run {
    batch_list inOrder;       ///< each record not earlier (raw) than the one before
    uint64_t uLastStamp;      ///< raw, of the last record of inOrder
    record_batch* pLate;      ///< batches that begin earlier than the run went: a heap
    record_batch* pOwnBase;   ///< a start record, compared by its own base
    batch_list behind;        ///< behind a record that will change the time base
    record_batch* pHeadBatch; ///< the one with the file's earliest record; null: none to compare
    uint32_t uRecords;        ///< in all of these
    bool bBaseQueued;         ///< a record that changes the base is queued, and not yet formatted
    bool bReads;              ///< more records may come
    bool bEnded;              ///< and none ever will again
    bool bHadRecords;         ///< some were pushed
};

struct merge_file {
    trace_file* pFile;
    uint32_t uNumber;          ///< its index among all of the run
    bool bOldestKnown;         ///< oldestTime is known
    cu_nanoseconds oldestTime; ///< converted, of its oldest record
    alignas(CACHE_LINE) reader_state reader;
    alignas(CACHE_LINE) queue_account account;
    alignas(CACHE_LINE) file_run run;
};
