// The least a reader does, step by step, over a mapping that a writer is
// changing: the other half of the protocol in trace_writer.h. Reads and stores
// shared words atomically, so it may run on another thread of the writer's
// process.
#pragma once

#include "trace_file_fmt.h"

#include <cstddef>
#include <cstdint>
#include <span>
#include <vector>

class live_reader {
public:
    enum result { RECORD, NO_RECORD, CORRUPT };

    explicit live_reader(std::span<std::byte> file);

    void raise_request();
    bool is_acknowledged() const;
    /// Stands on the oldest record. False when the ring makes no sense.
    bool find_first();
    void lower_request();

    /// Whether a record or filler can be read where the reader stands. Leaves
    /// its header and body in `header` and `body`.
    result look();
    /// Steps past what look() has found.
    void step();
    void close();

    trace_record_header header{};
    std::vector<std::byte> body;
    uint32_t offset() const {
        return uAt;
    }

private:
    uint32_t load_word(uint32_t uOffset) const;
    void store_word(uint32_t uOffset, uint32_t uValue);
    trace_record_header load_header(uint32_t uOffset) const;
    bool is_sound(uint32_t uOffset, const trace_record_header& candidate) const;

    std::span<std::byte> file;
    uint32_t uArea;
    uint32_t uAt = 0;
};
