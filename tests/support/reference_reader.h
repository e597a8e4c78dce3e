// A slow and simple reader of whole trace files, written apart from the
// command's own walk: what it lists is what a test may expect.
#pragma once

#include "trace_file_fmt.h"
#include "trace_load.h"

#include <cstddef>
#include <cstdint>
#include <string>
#include <vector>

/// One record or filler of a ring.
struct ring_element {
    uint32_t uAt = 0; ///< offset in the file
    trace_record_header header{};
    std::vector<std::byte> body{};

    bool is_filler() const {
        return header.function == TRC_FUNC_FILLER;
    }
    bool is_held() const {
        return header.function == TRC_FUNC_WRITING;
    }
    bool counts() const {
        return !is_filler() || header.seqNumber != TRC_SEQ_FILLER;
    }
};

struct ring_listing {
    std::vector<ring_element> elements; ///< from uOldestRecordOffset once around
    std::string problem;                ///< why the ring is not sound; empty: it is

    /// The elements that are records, oldest first.
    std::vector<ring_element> records() const;
};

/// Lists the ring of a file at rest. It is sound when the elements tile the
/// record area exactly, have valid kinds and printable component ids, and those
/// that count in the sequence are numbered in steps of 2.
ring_listing list_ring(trace_bytes file);
