// The output states of the traced threads of a file. The list at pThreadInfo
// holds them, newest first; a search tree that the entries carry with them
// finds one among millions as fast as among a few.
#pragma once

#include "kelvo.h"

/// The file's state of the thread, made with level 0 and no flags when there is
/// none yet. Null when memory ran out. Main thread.
thread_info* get_thread_info(trace_file* pTraceFile, uint64_t threadId);

/// Releases every thread_info of the file: its nesting ends. On the main thread
/// anchor.pCurThread is cleared when it is one of them; a reader task that
/// closes its file leaves `anchor` alone (no record of the file is open then).
void free_thread_info(trace_file* pTraceFile);
