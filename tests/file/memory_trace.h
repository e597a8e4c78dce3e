// A trace file in memory: a heap buffer of exactly its size, so that the address
// sanitizer sees every read beyond it, and a trace_file over it.
#pragma once

#include "kelvo.h"
#include "raw_trace.h"
#include "ring.h"

#include <cstring>
#include <memory>
#include <string>

class memory_trace {
public:
    explicit memory_trace(const raw_trace& trace) {
        const std::vector<std::byte> bytes = trace.bytes();
        pBytes = std::make_unique<std::byte[]>(bytes.size());
        memcpy(pBytes.get(), bytes.data(), bytes.size());
        file.pName = name.data();
        file.fd = -1;
        file.uSize = static_cast<uint32_t>(bytes.size());
        file.pHeader = reinterpret_cast<trace_file_header*>(pBytes.get());
        file.pMapEnd = ring_position(&file, file.uSize);
        file.pWrap = ring_position(&file, trace.header.uOffset);
        file.pCurRec = file.pWrap;
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
        const std::vector<std::byte> bytes = raw_record_bytes(record);
        memcpy(pBytes.get() + uAt, bytes.data(), bytes.size());
    }

    std::vector<std::byte> bytes() const {
        return {pBytes.get(), pBytes.get() + file.uSize};
    }

    std::string name = "ring.trc";
    trace_file file{};

private:
    std::unique_ptr<std::byte[]> pBytes;
};

/// The text of an out-of-bounds warning for the position at `uOffset`.
inline std::string out_of_bounds_warning(const trace_file& file, uint64_t uOffset) {
    char text[400];
    snprintf(text, sizeof(text),
             "WARNING: Irrecoverable corruption detected (giving up on the rest of this file): "
             "pCurRec out of bounds: file(%s) pHeader(%p) pCurRec(%p) pMapEnd(%p).\n",
             file.pName, static_cast<void*>(file.pHeader),
             static_cast<void*>(ring_position(&file, uOffset)), static_cast<void*>(file.pMapEnd));
    return text;
}
