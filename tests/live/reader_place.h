// Whether a reader of a file that is being written has found its first record.
#pragma once

#include "trace_writer.h"

#include <unistd.h>

/// Answers the reader on the way.
inline bool reader_has_its_place(trace_writer& writer) {
    writer.poll();
    const auto& header = *reinterpret_cast<const trace_file_header*>(writer.mapping().data());
    return __atomic_load_n(&header.uSeqLock, __ATOMIC_ACQUIRE) != TRC_SEQ_NO_READER &&
           __atomic_load_n(&header.uTailReq, __ATOMIC_ACQUIRE) == 0;
}
