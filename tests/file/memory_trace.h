// A trace file in memory: a heap buffer of exactly its size, so that the address
// sanitizer sees every read beyond it, and a trace_file over it.
#pragma once

#include "kelvo.h"
#include "raw_trace.h"
#include "ring.h"

#include <algorithm>
#include <string>

class memory_trace {
public:
    explicit memory_trace(const raw_trace& trace) : content(trace.bytes()) {
        content.shrink_to_fit();
        file.pName = name.data();
        ring_map_over(&file, content.data(), content.size());
        file.pCurRec = file.pWrap;
        file.uExpectedSeq = trace.header.uSeqLock;
        file.timeInfo = trace.header.timeInfo;
        file.uPlatform = trace.header.uPlatform;
    }

    memory_trace& stand_on(uint64_t uOffset) {
        file.pCurRec = ring_position(&file, uOffset);
        return *this;
    }

    uint64_t offset() const {
        return ring_offset(&file, file.pCurRec);
    }

    void put(uint32_t uAt, const raw_record& record) {
        std::ranges::copy(raw_record_bytes(record), content.begin() + uAt);
    }

    std::string name = "ring.trc";
    trace_file file{};

private:
    std::vector<std::byte> content;
};

inline const std::string GIVING_UP =
    "WARNING: Irrecoverable corruption detected (giving up on the rest of this file): ";

/// The warning that something of the record at offset 200 is not valid.
inline std::string record_warning(const std::string& what, const std::string& found) {
    return GIVING_UP + "invalid record " + what + ": file(ring.trc) record_offset(0x000000c8) " +
           found + "\n";
}

/// The text of an out-of-bounds warning for the position at `uOffset`.
inline std::string out_of_bounds_warning(const trace_file& file, uint64_t uOffset) {
    char text[400];
    snprintf(text, sizeof(text),
             "pCurRec out of bounds: file(%s) pHeader(%p) pCurRec(%p) pMapEnd(%p).\n", file.pName,
             static_cast<void*>(file.pHeader), static_cast<void*>(ring_position(&file, uOffset)),
             static_cast<void*>(file.pMapEnd));
    return GIVING_UP + text;
}
