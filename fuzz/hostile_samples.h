// Sound trace files, small and of every kind of record, to be damaged.
#pragma once

#include "raw_trace.h"

#include <algorithm>
#include <array>
#include <span>
#include <vector>

/// Every kind that a sound file may hold.
inline constexpr auto SAMPLE_KINDS = [] {
    constexpr auto is_record = [](const trc_kind& kind) {
        return kind.function != TRC_FUNC_FILLER && trc_kind_is_valid(kind.function);
    };
    std::array<uint16_t, std::ranges::count_if(TRC_KINDS, is_record)> kinds{};
    size_t uNext = 0;
    for (const trc_kind& kind : TRC_KINDS)
        if (is_record(kind))
            kinds[uNext++] = kind.function;
    return kinds;
}();

/// A body for a record of the kind, with every part that the kind can have; its
/// trace id is the kind's code.
std::vector<std::byte> sample_body(uint16_t function);

/// A record of the kind with that body, of component "_FUZ".
raw_record sample_of_kind(uint16_t function);

/// A file that these records, numbered here, fill to the last byte, the oldest
/// one at the start of the area.
raw_trace full_ring(std::span<const raw_record> records);

/// The same with one record of each of the kinds.
raw_trace full_ring_of(std::span<const uint16_t> kinds);

/// A file of `uSize` bytes whose records begin behind a gap in the middle, run
/// to the end, and go on at the start of the area up to the gap. Strings and
/// numbers take turns; none of them changes how another one is written.
raw_trace wrapped_ring(uint32_t uSize);
