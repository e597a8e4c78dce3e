// The output queue and the order in which records leave it.
#pragma once

#include "kelvo.h"

#include <cstddef>

/// -1, 0 or 1: seconds first, then nanoseconds.
int compare_timestamps(const timespec* pFirst, const timespec* pSecond);

/// Record order: negative when the first record comes first, positive when the
/// second does, 0 only for the same element. By time under the time bases in
/// force now, then by push number.
int cmp_Q_elements(const trace_queue_element* pFirst, const trace_queue_element* pSecond);

/// Sort comparison of two TrcPreProcHdrElem by the time of their `header`.
int cmp_trc_file_hdrs(const void* pFirst, const void* pSecond);
