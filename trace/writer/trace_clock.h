// Where and when, for writers of trace files: raw time stamps of the running
// moment, the time base that goes with them, and the id of the calling thread.
// Any thread may call these at any time; none fails.
#pragma once

#include "kv_cu.h"

/// Raw time stamp: nanoseconds of a clock that begins with the machine, goes on
/// while the machine sleeps, and is never set. No system call.
uint64_t trace_now();

/// The base under which stamps of trace_now() are the present time of day: what
/// trace_writer_options::timeInfo takes, and append_time_calibration when the
/// time of day was set.
cu_timeinfo trace_time_base();

/// The system's id of the calling thread. A system call in its first use by a
/// thread only, and by the thread that comes out of a fork.
uint32_t trace_thread_id();
