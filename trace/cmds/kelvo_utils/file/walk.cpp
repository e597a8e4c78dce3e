// Two orders of reading matter here, both because the writer goes on meanwhile.
// It writes a record at the oldest position, then moves uOldestRecordOffset past
// it and stores the record's seqNumber last. The offset is read before the
// record: a record found behind a moved offset is then complete but for its
// number (see number_has_come), and one found at the offset is complete when its
// seqNumber is the expected one, which is read before the rest of it. Whoever
// has seen the number sees the moved offset, so a step past the record never
// leads over the gap behind it.
#include "walk.h"

#include "corruption.h"
#include "reader_words.h"
#include "ring.h"

#include <algorithm>

namespace {

bool component_is_printable(const char (&compId)[4]) {
    return std::all_of(std::begin(compId), std::end(compId),
                       [](char ch) { return ch >= 0x20 && ch <= 0x7E; });
}

bool counts_in_sequence(const trace_record_header& header) {
    return header.function != TRC_FUNC_FILLER || header.seqNumber != TRC_SEQ_FILLER;
}

/// Whether the reader, standing on the oldest position, has read all there is:
/// the record is not the next one in sequence. A gap filler never is, though the
/// numbers of the sequence may happen to reach its own: the ring would be read
/// again, and one of fillers alone without end.
bool has_caught_up(const trace_file* pTraceFile, const trace_record_header& header) {
    return header.seqNumber != pTraceFile->uExpectedSeq || header.function == TRC_FUNC_WRITING ||
           !counts_in_sequence(header);
}

/// What is_last_record says of the sound record at pCurRec. `uOldest` was read
/// before its header.
walk_result judge_position(const trace_file* pTraceFile, uint32_t uOldest,
                           const trace_record_header& header) {
    if (!ring_holds_header(pTraceFile, uOldest)) [[unlikely]] {
        warn_out_of_bounds(pTraceFile, ring_position(pTraceFile, uOldest));
        return WALK_CORRUPT;
    }
    const uint32_t uOffset = get_record_offset(pTraceFile, pTraceFile->pCurRec);
    if (load_actual_file_size(pTraceFile->pHeader) < uOffset) [[unlikely]] {
        warn_beyond_file_size(uOffset);
        return WALK_NO_RECORD;
    }
    if (uOffset < uOldest && uOffset + header.length > uOldest) [[unlikely]] {
        warn_runs_over_oldest(uOffset, header);
        return WALK_NO_RECORD;
    }
    if (uOffset == uOldest && has_caught_up(pTraceFile, header))
        return WALK_NO_RECORD;
    return WALK_RECORD;
}

/// Moves pCurRec past the record; the new position is not yet tested.
void move_past(trace_file* pTraceFile, const trace_record_header& current) {
    const uint64_t uOffset = ring_offset(pTraceFile, pTraceFile->pCurRec);
    pTraceFile->pCurRec = ring_position(pTraceFile, ring_next(pTraceFile, uOffset, current.length));
}

/// Has the processor fetch what will be read some records later: its own
/// prefetching stops at the end of each page. (Only a hint: where nothing is
/// mapped it does nothing.)
void fetch_ahead(const trace_file* pTraceFile) {
    constexpr uint64_t DISTANCE = 1024;
    const uint64_t uAhead = ring_offset(pTraceFile, pTraceFile->pCurRec) + DISTANCE;
    __builtin_prefetch(ring_position(pTraceFile, uAhead));
}

/// A ring of gap fillers has shown the reader no number; the first record does.
void count_as_passed(trace_file* pTraceFile, const trace_record_header& passed) {
    if (counts_in_sequence(passed)) [[likely]] {
        if (pTraceFile->uExpectedSeq == TRC_SEQ_FILLER) [[unlikely]]
            pTraceFile->uExpectedSeq = passed.seqNumber;
        pTraceFile->uExpectedSeq += 2;
    }
    tell_place(pTraceFile);
}

} // namespace

uint32_t get_record_offset(const trace_file* pTraceFile, const trace_record_header* pRec) {
    return static_cast<uint32_t>(ring_offset(pTraceFile, pRec));
}

trace_bytes record_bytes(const trace_file* pTraceFile, const trace_record_header* pRec,
                         uint32_t length) {
    const uint64_t uOffset = ring_offset(pTraceFile, pRec);
    const uint64_t uEnd = ring_end(pTraceFile);
    if (uOffset >= uEnd)
        return {};
    return {reinterpret_cast<const std::byte*>(pRec), std::min<size_t>(length, uEnd - uOffset)};
}

int record_is_bad(const trace_record_header* pRec, const trace_record_header& header,
                  const trace_file* pTraceFile) {
    // Nearly every record has a component: one question tells that it is valid too.
    if (trc_kind_has_component(header.function)) [[likely]] {
        if (!component_is_printable(header.compId)) [[unlikely]] {
            warn_record_component(pTraceFile, get_record_offset(pTraceFile, pRec), header.compId);
            return 1;
        }
    } else if (!trc_kind_is_valid(header.function)) {
        warn_record_function(pTraceFile, get_record_offset(pTraceFile, pRec), header.function);
        return 1;
    }
    if (header.length < sizeof(trace_record_header)) [[unlikely]] {
        warn_record_length(pTraceFile, get_record_offset(pTraceFile, pRec), header.length);
        return 1;
    }
    return 0;
}

int current_record_pointer_is_bad(const trace_file* pTraceFile, trace_record_header* pHeader) {
    const trace_record_header* const pRec = pTraceFile->pCurRec;
    const uint64_t uOffset = ring_offset(pTraceFile, pRec);
    if (!ring_holds_header(pTraceFile, uOffset)) [[unlikely]] {
        warn_out_of_bounds(pTraceFile, pRec);
        return 1;
    }
    load_record_header(pRec, pHeader);
    if (record_is_bad(pRec, *pHeader, pTraceFile))
        return 1;
    if (ring_covers_reader_words(uOffset)) [[unlikely]] {
        warn_out_of_bounds(pTraceFile, pRec);
        return 1;
    }
    return 0;
}

walk_result is_last_record(trace_file* pTraceFile, trace_record_header* pHeader) {
    const uint32_t uOldest = load_oldest_record_offset(pTraceFile->pHeader);
    if (current_record_pointer_is_bad(pTraceFile, pHeader))
        return WALK_CORRUPT;
    tell_place_now(pTraceFile);
    return judge_position(pTraceFile, uOldest, *pHeader);
}

bool number_has_come(const trace_file* pTraceFile, trace_record_header* pHeader) {
    if (pHeader->seqNumber != TRC_SEQ_FILLER || pHeader->function == TRC_FUNC_FILLER) [[likely]]
        return true;
    // The number stands there once the offset has moved beyond the next record.
    const uint64_t uOldest = load_oldest_record_offset(pTraceFile->pHeader);
    pHeader->seqNumber = read_record_header(pTraceFile->pCurRec).seqNumber;
    const uint64_t uOffset = ring_offset(pTraceFile, pTraceFile->pCurRec);
    return pHeader->seqNumber != TRC_SEQ_FILLER ||
           ring_next(pTraceFile, uOffset, pHeader->length) != uOldest;
}

walk_result step_to_next_record(trace_file* pTraceFile, const trace_record_header& current) {
    trace_record_header next;
    move_past(pTraceFile, current);
    if (current_record_pointer_is_bad(pTraceFile, &next))
        return WALK_CORRUPT;
    count_as_passed(pTraceFile, current);
    return WALK_RECORD;
}

// Once a record: with everything in place, the warnings apart, which are cold.
[[gnu::flatten]] walk_result step_and_judge(trace_file* pTraceFile, trace_record_header* pHeader) {
    const trace_record_header passed = *pHeader;
    move_past(pTraceFile, passed);
    fetch_ahead(pTraceFile);
    const uint32_t uOldest = load_oldest_record_offset(pTraceFile->pHeader);
    if (current_record_pointer_is_bad(pTraceFile, pHeader))
        return WALK_CORRUPT;
    count_as_passed(pTraceFile, passed);
    return judge_position(pTraceFile, uOldest, *pHeader);
}

walk_result get_next_record(trace_file* pTraceFile) {
    trace_record_header current;
    const walk_result here = is_last_record(pTraceFile, &current);
    return here == WALK_RECORD ? step_to_next_record(pTraceFile, current) : here;
}
