// What readers and the main thread hand each other, and the accounts that go with
// it: batches one way, the room that their records have left the other way. All of
// it is under priorityQmutex, which each side takes once per handful of batches and
// not per record.
//
// A reader holds back only while the queue is full, never before: a live writer must
// not lose records because of other files or a slow output. Even then it goes on
// until it has its floor of records queued, so that a merge moves in runs. Once held
// back it goes on when half of what it has queued is printed, or when the queue is no
// longer full, some 500 microseconds later at the latest.
#pragma once

#include "merge_file.h"
#include "record_batch.h"

#include <cstdint>

/// The queue is full with so many records, or bytes of memory in them.
inline constexpr uint32_t MAX_QUEUED = 40'000;
inline constexpr uint64_t MAX_QUEUED_BYTES = 256ULL << 20;

/// Most records that a reader reads before it asks again.
inline constexpr uint32_t MAX_BATCH = 128;

/// It asks sooner when those take so much memory: large records fill the queue too.
inline constexpr uint64_t MAX_BATCH_BYTES = 256ULL << 10;

/// Pushes batches of the file, each after the readers of those files were started
/// whose time it brings. Any thread.
void push_batches(merge_file& file, batch_list batches);

/// push_batches, and how many records the file's reader may push next. 0: none, the
/// reader is held back, and its step must end at once with the wish SUSPENDED.
uint32_t push_and_ask(merge_file& file, batch_list batches);

/// Counts the file as running and tells the main thread, which waits for its records
/// from now on. priorityQmutex held.
void file_starts_running(merge_file& file);

/// No more records will come from the file. Returns whether all are formatted;
/// otherwise its reader is resumed when they are, and its step must end at once with
/// the wish SUSPENDED. priorityQmutex held.
bool stop_pushing(merge_file& file);

/// The counterpart of file_starts_running. priorityQmutex held.
void file_stops_running(merge_file& file);

/// Files whose reader was started and has not finished. priorityQmutex held.
uint32_t running_files();

/// Main thread: settles for `uTaken` records that were taken and formatted, moves
/// what was pushed since the last time into the output queue, releases the batches
/// that are finished and resumes the readers that have room again.
void exchange_with_readers(uint32_t uTaken);

/// Whether there is something that exchange_with_readers would fetch. Main thread;
/// no lock.
bool something_was_pushed();
