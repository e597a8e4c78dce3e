// The reader task of a trace file, in steps.
//
// A reader makes the handshake with the writer, walks the ring from the oldest
// record on, copies each record that is to be output out of the mapping and pushes
// the copies, some hundred at a time. It occupies a thread only while it has
// something to do: a step ends at the file's end, where the reader must hold back
// (exchange.h), and where it has to wait: for the writer's acknowledgement, for new
// records in follow mode, for the number of a record that is just being written.
#pragma once

#include "pool.h"

/// One step of the reader task; `pTask` is the merge_file.
task_wish thread_main(void* pTask);

/// Called at the end of each file outside follow mode, with priorityQmutex held; may
/// be null. Set before any file is started.
extern void (*file_was_read)();
