// Sound trace files, small and of every kind of record, to be damaged.
#pragma once

#include "raw_trace.h"

#include <span>
#include <vector>

/// Every kind that a sound file may hold.
inline constexpr uint16_t SAMPLE_KINDS[] = {TRC_FUNC_ID,
                                            TRC_FUNC_STRING,
                                            TRC_FUNC_DATA,
                                            TRC_FUNC_INT32,
                                            TRC_FUNC_INT32_2,
                                            TRC_FUNC_UINT32,
                                            TRC_FUNC_UINT32_2,
                                            TRC_FUNC_INT64,
                                            TRC_FUNC_INT64_2,
                                            TRC_FUNC_UINT64,
                                            TRC_FUNC_UINT64_2,
                                            TRC_FUNC_VALUES,
                                            TRC_FUNC_VALUES64,
                                            TRC_FUNC_ERROR,
                                            TRC_FUNC_STRINGS,
                                            TRC_FUNC_START,
                                            TRC_FUNC_TIME_CALIBRATION,
                                            TRC_FUNC_RESTART,
                                            TRC_FUNC_DISCARDED};

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
