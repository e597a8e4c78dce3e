// The place of a record in the ring: growing the gap over the oldest records,
// going round the end of the area, and the order in which a record is stored.
// The header of trace_writer.h says why the order is what it is.
#include "trace_writer.h"

#include "shared_words.h"

#include <algorithm>
#include <bit>

namespace {

bool function_is_valid(uint16_t function) {
    return function != TRC_FUNC_FILLER && trc_kind_is_valid(function);
}

bool origin_is_valid(uint16_t function, const trace_origin& origin) {
    if (origin.compId.size() != sizeof(trace_record_header::compId))
        return false;
    return !trc_kind_has_component(function) ||
           std::all_of(origin.compId.begin(), origin.compId.end(),
                       [](char c) { return c >= 0x20 && c <= 0x7E; });
}

trace_record_header make_header(uint16_t function, const trace_origin& origin, uint32_t uLength) {
    trace_record_header header{};
    header.length = uLength;
    header.function = function;
    std::copy_n(origin.compId.begin(), sizeof(header.compId), header.compId);
    header.threadId = origin.threadId;
    header.timeStamp = origin.timeStamp;
    return header;
}

/// Everything of a header but length, function and seqNumber.
void store_origin(std::byte* pMap, uint32_t uAt, const header_words& words) {
    for (size_t i = WORD_COMP_ID; i < words.size(); ++i)
        store_header_word(pMap + uAt, i, words[i]);
}

} // namespace

// ------------------------------------------------------------------- stores

void trace_writer::store_filler(uint32_t uAt, uint32_t uLength) {
    // What stood here is no filler at any moment but by its function, so that
    // comes first; the length joins the filler to what it swallows, so that
    // comes last.
    const auto words = std::bit_cast<header_words>(
        make_header(TRC_FUNC_FILLER, {TRC_COMP_INTERNAL, 0, uLastTime}, uLength));
    store_header_word(pMap + uAt, WORD_FUNCTION, words[WORD_FUNCTION]);
    store_header_word(pMap + uAt, WORD_SEQ_NUMBER, TRC_SEQ_FILLER);
    store_origin(pMap, uAt, words);
    store_header_word(pMap + uAt, WORD_LENGTH, uLength);
}

trace_writer_status trace_writer::begin(uint16_t function, const trace_origin& origin,
                                        size_t bodySize, std::byte** ppBody) {
    if (pMap == nullptr || !function_is_valid(function) || !origin_is_valid(function, origin))
        return TRACE_WRITER_INVALID;
    if (bDamaged)
        return TRACE_WRITER_DAMAGED;
    const uint32_t uMaxBody = max_record_length() - TRC_MIN_RECORD;
    if (bodySize > uMaxBody)
        return TRACE_WRITER_TOO_LONG;
    const uint32_t uLength = (TRC_MIN_RECORD + static_cast<uint32_t>(bodySize) + 3) & ~3U;

    answer_reader();
    bool bRoom = make_room(uLength, origin.timeStamp);
    if (!bRoom && forget_dead_reader()) {
        answer_reader();
        bRoom = make_room(uLength, origin.timeStamp);
    }
    if (!bRoom) {
        if (bDamaged)
            return TRACE_WRITER_DAMAGED;
        ++totals.uDropped;
        ++uDropsDue;
        lastDropped = {{}, origin.threadId, origin.timeStamp};
        return TRACE_WRITER_DROPPED;
    }
    current.header = make_header(function, origin, uLength);
    *ppBody = pMap + current.uAt + TRC_MIN_RECORD;
    // Unused bytes stand only in the last word.
    if (bodySize % 4 != 0)
        std::memset(*ppBody + bodySize, 0, 4 - bodySize % 4);
    return TRACE_WRITER_OK;
}

trace_writer_status trace_writer::commit() {
    if (bHolding) {
        commit_held();
        return TRACE_WRITER_OK;
    }
    const auto words = std::bit_cast<header_words>(current.header);
    const uint32_t uAt = current.uAt;
    store_origin(pMap, uAt, words);
    store_header_word(pMap + uAt, WORD_LENGTH, words[WORD_LENGTH]);
    store_header_word(pMap + uAt, WORD_FUNCTION, words[WORD_FUNCTION]);
    store_oldest_record_offset(file_header(), current.uOldest);
    store_header_word(pMap + uAt, WORD_SEQ_NUMBER, uNextSeq);
    uWrite = current.uOldest;
    uGapEnd = current.uGapEnd;
    uNextSeq += 2;
    ++totals.uAppended;
    return TRACE_WRITER_OK;
}

// ------------------------------------------------------------------- places

bool trace_writer::make_room(uint32_t uLength, uint64_t uTimeStamp) {
    if (bDamaged || (uDropsDue != 0 && !append_discard(uLength)))
        return false;
    return place(uLength, uTimeStamp);
}

/// Finds the place of a record and stores the gap that will follow it, already
/// with the record's time.
bool trace_writer::place(uint32_t uLength, uint64_t uTimeStamp) {
    uLastTime = uTimeStamp;
    if (bHolding)
        return place_held(uLength);
    swallow_first_filler();
    gap_plan plan;
    if (!plan_room(uLength, &plan))
        return false;
    carry_out(plan);
    current.uAt = uWrite;
    if (uGapEnd - uWrite == uLength) { // ends with the file; its gap stands at the head already
        current.uOldest = uArea;
        current.uGapEnd = plan.uHeadEnd;
    } else {
        current.uOldest = uWrite + uLength;
        current.uGapEnd = uGapEnd;
        store_filler(current.uOldest, current.uGapEnd - current.uOldest);
    }
    return true;
}

/// Writes the record that speaks for what was dropped, if the record of
/// `uLengthAfter` bytes for which it makes way has room too: else the ring would
/// fill with such records.
bool trace_writer::append_discard(uint32_t uLengthAfter) {
    const uint64_t uBoth = uint64_t{uLengthAfter} + (uLengthAfter != 0 ? TRC_MIN_RECORD : 0);
    if (bHolding) {
        if (uBoth > max_record_length() || !place_held(static_cast<uint32_t>(uBoth)))
            return false;
    } else {
        swallow_first_filler();
        gap_plan plan;
        const uint32_t uSeqLock = load_reader_position(file_header());
        if (!plan_room(uBoth, &plan) && uSeqLock != TRC_SEQ_NO_READER) {
            if (uSeqLock != uNextSeq)
                return false;
            // The reader has passed all there is, and only the gap on which it
            // may stand is in the way: move on past the end with it.
            gap_plan toHead;
            if (plan_grown_gap(uSize, &toHead) && plan_head(2 * TRC_MIN_RECORD, &toHead)) {
                toHead.bWrap = true;
                carry_out(toHead);
            }
        }
    }
    if (!place(TRC_MIN_RECORD, lastDropped.timeStamp))
        return false;
    current.header = make_header(TRC_FUNC_DISCARDED,
                                 {TRC_COMP_INTERNAL, lastDropped.threadId, lastDropped.timeStamp},
                                 TRC_MIN_RECORD);
    commit();
    uDropsDue = 0;
    ++totals.uDiscards;
    return true;
}

/// Finds out how a record of `uLength` bytes can get room. Changes nothing.
bool trace_writer::plan_room(uint64_t uLength, gap_plan* pPlan) {
    if (uLength > max_record_length() || !plan_grown_gap(uLength + TRC_MIN_RECORD, pPlan))
        return false;
    const uint32_t uRoom = pPlan->uEnd - uWrite;
    if (uRoom >= uLength + TRC_MIN_RECORD)
        return true;
    // The gap reaches the end of the file. The record ends there too, with the
    // next gap at the start of the area; or it goes to the start itself.
    pPlan->bWrap = uRoom != uLength;
    return plan_head(pPlan->bWrap ? uLength + TRC_MIN_RECORD : TRC_MIN_RECORD, pPlan);
}

/// Lets the gap grow to `uNeeded` bytes, or up to the end of the file.
bool trace_writer::plan_grown_gap(uint64_t uNeeded, gap_plan* pPlan) {
    pPlan->uEnd = uGapEnd;
    while (pPlan->uEnd - uWrite < uNeeded && pPlan->uEnd != uSize)
        if (!swallow(&pPlan->uEnd, uSize, pPlan))
            return false;
    return true;
}

/// Frees `uNeeded` bytes at the start of the area.
bool trace_writer::plan_head(uint64_t uNeeded, gap_plan* pPlan) {
    pPlan->uHeadEnd = uArea;
    while (pPlan->uHeadEnd - uArea < uNeeded) {
        if (pPlan->uHeadEnd != uWrite) {
            if (!swallow(&pPlan->uHeadEnd, uWrite, pPlan))
                return false;
        } else if (reader_has_passed(uNextSeq)) {
            pPlan->uHeadEnd = uSize; // nothing is left but the gap: take it along
        } else {
            return false; // somebody may be standing on the gap
        }
    }
    return true;
}

/// Extends `*pEnd` over the record or filler that begins there and ends at
/// `uLimit` at the latest, if no reader can be standing on it.
bool trace_writer::swallow(uint32_t* pEnd, uint32_t uLimit, gap_plan* pPlan) {
    const trace_record_header header = header_at(*pEnd);
    if (header.length < TRC_MIN_RECORD || header.length > uLimit - *pEnd) {
        bDamaged = true;
        return false;
    }
    if (!reader_has_passed(header.function == TRC_FUNC_FILLER ? seq_number_from(*pEnd)
                                                              : header.seqNumber))
        return false;
    if (header.function != TRC_FUNC_FILLER)
        ++pPlan->uGivenUp;
    *pEnd += header.length;
    return true;
}

/// Number of the first record from `uAt` on: the next one to come when only
/// fillers follow before the gap.
uint32_t trace_writer::seq_number_from(uint32_t uAt) const {
    while (uAt != uWrite) {
        const trace_record_header header = header_at(uAt);
        if (header.function != TRC_FUNC_FILLER)
            return header.seqNumber;
        if (header.length < TRC_MIN_RECORD || header.length > uSize - uAt)
            break;
        uAt = header.length == uSize - uAt ? uArea : uAt + header.length;
    }
    return uNextSeq;
}

bool trace_writer::reader_has_passed(uint32_t uSeqNumber) const {
    const uint32_t uSeqLock = load_reader_position(file_header());
    if (uSeqLock == TRC_SEQ_NO_READER)
        return true;
    // An odd number is none of ours: the reader has not found its place.
    return uSeqLock % 2 == 0 && static_cast<int32_t>(uSeqLock - uSeqNumber) > 0;
}

/// Gives the planned records up. The ring is sound after every store.
void trace_writer::carry_out(const gap_plan& plan) {
    totals.uGivenUp += plan.uGivenUp;
    if (plan.uEnd != uGapEnd) {
        store_header_word(pMap + uWrite, WORD_LENGTH, plan.uEnd - uWrite);
        uGapEnd = plan.uEnd;
    }
    if (plan.bWrap)
        move_to_head(plan);
    else if (plan.uHeadEnd != 0)
        store_filler(uArea, plan.uHeadEnd - uArea);
}

/// Makes a gap at the start of the area and leaves the old one as a filler
/// before the end of the file.
void trace_writer::move_to_head(const gap_plan& plan) {
    const uint32_t uFirstEnd = plan.uHeadEnd == uSize ? uWrite : plan.uHeadEnd;
    store_filler(uArea, uFirstEnd - uArea);
    store_oldest_record_offset(file_header(), uArea);
    if (plan.uHeadEnd != uFirstEnd) // the old gap as well, now that no walk begins on it
        store_header_word(pMap + uArea, WORD_LENGTH, plan.uHeadEnd - uArea);
    uWrite = uArea;
    uGapEnd = plan.uHeadEnd;
}

/// The last filler of an empty ring has served when the first record comes. No
/// reader stands on it: it follows the gap, which none can pass.
void trace_writer::swallow_first_filler() {
    if (!bFirstFiller)
        return;
    bFirstFiller = false;
    uGapEnd = uSize;
    store_header_word(pMap + uWrite, WORD_LENGTH, uGapEnd - uWrite);
}
