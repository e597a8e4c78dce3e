#include "live_reader.h"

#include <algorithm>
#include <array>
#include <atomic>
#include <bit>
#include <cstring>

namespace {

constexpr uint32_t SEQ_LOCK = offsetof(trace_file_header, uSeqLock);
constexpr uint32_t TAIL_REQ = offsetof(trace_file_header, uTailReq);
constexpr uint32_t OLDEST = offsetof(trace_file_header, uOldestRecordOffset);

} // namespace

live_reader::live_reader(std::span<std::byte> mapped) : file(mapped) {
    std::memcpy(&uArea, file.data() + offsetof(trace_file_header, uOffset), sizeof(uArea));
}

uint32_t live_reader::load_word(uint32_t uOffset) const {
    return std::atomic_ref(*reinterpret_cast<uint32_t*>(file.data() + uOffset))
        .load(std::memory_order_acquire);
}

void live_reader::store_word(uint32_t uOffset, uint32_t uValue) {
    std::atomic_ref(*reinterpret_cast<uint32_t*>(file.data() + uOffset)).store(uValue);
}

trace_record_header live_reader::load_header(uint32_t uOffset) const {
    std::array<uint32_t, 7> words{};
    words[2] = load_word(uOffset + 8); // if this is the expected one, the rest is complete
    for (uint32_t i = 0; i < words.size(); ++i)
        if (i != 2)
            words[i] = load_word(uOffset + 4 * i);
    return std::bit_cast<trace_record_header>(words);
}

bool live_reader::is_sound(uint32_t uOffset, const trace_record_header& candidate) const {
    const unsigned function = candidate.function;
    if ((function > 17 && function != 19 && function != TRC_FUNC_DISCARDED) ||
        candidate.length < sizeof(trace_record_header) || candidate.length > file.size() - uOffset)
        return false;
    return function < 1 || function > 16 ||
           std::all_of(std::begin(candidate.compId), std::end(candidate.compId),
                       [](char c) { return c >= 0x20 && c <= 0x7E; });
}

void live_reader::raise_request() {
    store_word(TAIL_REQ, TRC_TAIL_REQUESTED);
}

bool live_reader::is_acknowledged() const {
    auto& flags = *reinterpret_cast<uint16_t*>(file.data() + offsetof(trace_file_header, uFlags));
    return (std::atomic_ref(flags).load() & TRC_FLAG_TAIL_ACK) != 0;
}

bool live_reader::find_first() {
    uAt = load_word(OLDEST);
    header = load_header(uAt);
    store_word(SEQ_LOCK, header.seqNumber);
    while (header.function == TRC_FUNC_FILLER || header.function == TRC_FUNC_WRITING) {
        if (header.length < sizeof(trace_record_header) || header.length > file.size() - uAt)
            return false;
        uAt += header.length;
        if (uAt == file.size())
            uAt = uArea;
        if (uAt == load_word(OLDEST))
            return true;
        header = load_header(uAt);
        store_word(SEQ_LOCK, header.seqNumber);
    }
    return is_sound(uAt, header);
}

void live_reader::lower_request() {
    store_word(TAIL_REQ, 0);
}

live_reader::result live_reader::look() {
    const uint32_t uOldest = load_word(OLDEST);
    header = load_header(uAt);
    if (!is_sound(uAt, header))
        return CORRUPT;
    if (uAt < uOldest && header.length > uOldest - uAt)
        return CORRUPT; // "last record length is not correct"
    if (uAt == uOldest && header.seqNumber != load_word(SEQ_LOCK))
        return NO_RECORD;
    body.clear();
    if (header.function != TRC_FUNC_FILLER)
        body.assign(file.data() + uAt + sizeof(header), file.data() + uAt + header.length);
    return RECORD;
}

void live_reader::step() {
    const bool bCounts = header.function != TRC_FUNC_FILLER || header.seqNumber != TRC_SEQ_FILLER;
    uAt += header.length;
    if (uAt == file.size())
        uAt = uArea;
    if (bCounts)
        store_word(SEQ_LOCK, load_word(SEQ_LOCK) + 2);
}

void live_reader::close() {
    store_word(TAIL_REQ, 0);
    store_word(SEQ_LOCK, TRC_SEQ_NO_READER);
}
