// The writer's answers to a reader that looks for its first record, and what is
// appended meanwhile; readers that died.
//
// Held records stand in a chain behind the gap, which keeps 28 bytes. Their
// function is 0xFFFF, which the reader's search skips; the real one waits in
// `reserved`, and seqNumber holds the offset of the held record before it (0:
// none), by which they are published from the last to the first: so a file
// whose writer is killed in between has no 0xFFFF behind the first record.
#include "trace_writer.h"

#include "shared_words.h"

#include <bit>
#include <ctime>
#include <fcntl.h>

namespace {

/// Between two questions for the lock, ms.
constexpr uint64_t ASK_INTERVAL = 10;
/// A reader that takes no lock gets this long to find its first record, ms.
constexpr uint64_t ASK_AFTER_REQUEST = 200;

uint64_t now_ms() {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
    return static_cast<uint64_t>(now.tv_sec) * 1000 + static_cast<uint64_t>(now.tv_nsec) / 1000000;
}

/// The word of a record header that holds `function`.
uint32_t function_word(uint16_t function) {
    return std::bit_cast<uint32_t>(std::array<uint16_t, 2>{function, 0});
}

} // namespace

trace_writer_status trace_writer::poll() {
    if (pMap == nullptr)
        return TRACE_WRITER_INVALID;
    answer_reader();
    if (uDropsDue != 0 && !bDamaged && !append_discard(0) && forget_dead_reader()) {
        answer_reader();
        append_discard(0);
    }
    return bDamaged ? TRACE_WRITER_DAMAGED : TRACE_WRITER_OK;
}

void trace_writer::answer_reader() {
    uint32_t uTailReq = load_tail_request(file_header());
    if (uTailReq == 0 && !bHolding) [[likely]]
        return;
    if (!bHolding)
        start_holding();
    if (uTailReq != 0 && forget_dead_reader())
        uTailReq = load_tail_request(file_header());
    if (uTailReq != 0)
        return;
    // A reader that raises the word from now on must not find the old answer:
    // either it sees the bit cleared, or its request is seen here.
    withdraw_acknowledgement(file_header());
    if (load_tail_request(file_header()) != 0)
        acknowledge_tail_request(file_header());
    else
        publish_held();
}

void trace_writer::start_holding() {
    bHolding = true;
    uLastHeld = 0;
    uHeldEnd = uWrite + TRC_MIN_RECORD;
    uNextAsk = now_ms() + ASK_AFTER_REQUEST;
    acknowledge_tail_request(file_header());
}

/// The place of a held record, and the rest of the gap behind it.
bool trace_writer::place_held(uint32_t uLength) {
    const uint64_t uNeeded = uint64_t{uLength} + TRC_MIN_RECORD;
    if (uHeldEnd > uGapEnd || uGapEnd - uHeldEnd < uNeeded)
        return false;
    current.uAt = uHeldEnd;
    current.uOldest = uHeldEnd + uLength;
    current.uGapEnd = uGapEnd;
    store_filler(current.uOldest, uGapEnd - current.uOldest);
    return true;
}

void trace_writer::commit_held() {
    current.header.reserved = current.header.function;
    current.header.function = TRC_FUNC_WRITING;
    current.header.seqNumber = uLastHeld;
    const auto words = std::bit_cast<header_words>(current.header);
    const uint32_t uAt = current.uAt;
    for (size_t i = WORD_SEQ_NUMBER; i < words.size(); ++i)
        store_header_word(pMap + uAt, i, words[i]);
    store_header_word(pMap + uAt, WORD_LENGTH, words[WORD_LENGTH]);
    store_header_word(pMap + uAt, WORD_FUNCTION, words[WORD_FUNCTION]);
    if (uLastHeld == 0) // the chain begins: the gap lets it be seen
        store_header_word(pMap + uWrite, WORD_LENGTH, TRC_MIN_RECORD);
    uLastHeld = uAt;
    uHeldEnd = current.uOldest;
    ++totals.uHeld;
}

void trace_writer::publish_held() {
    bHolding = false;
    if (uLastHeld == 0)
        return;
    uint32_t uSeqNumber = uNextSeq + 2 * static_cast<uint32_t>(totals.uHeld);
    uNextSeq = uSeqNumber;
    for (uint32_t uAt = uLastHeld; uAt != 0;) {
        const trace_record_header header = header_at(uAt);
        uSeqNumber -= 2;
        store_header_word(pMap + uAt, WORD_SEQ_NUMBER, uSeqNumber);
        store_header_word(pMap + uAt, WORD_FUNCTION, function_word(header.reserved));
        uAt = header.seqNumber;
    }
    uWrite = uHeldEnd;
    swallow_first_filler();
    store_oldest_record_offset(file_header(), uWrite);
    totals.uAppended += totals.uHeld;
    totals.uHeld = 0;
    uLastHeld = 0;
}

/// Resets the reader's words if it stands in the way and nobody holds a lock.
/// True when it did. Only the values seen before the question are reset: a
/// reader that comes just now stores others, or at least waits 10 ms before it
/// looks at the ring.
bool trace_writer::forget_dead_reader() {
    if (!bAskLock)
        return false;
    const uint64_t uNow = now_ms();
    if (uNow < uNextAsk)
        return false;
    const uint32_t uTailReq = load_tail_request(file_header());
    const uint32_t uSeqLock = load_reader_position(file_header());
    if (uTailReq == 0 && uSeqLock == TRC_SEQ_NO_READER)
        return false;
    uNextAsk = uNow + ASK_INTERVAL;
    struct flock lock {};
    lock.l_type = F_WRLCK;
    lock.l_whence = SEEK_SET;
    if (fcntl(fd, F_GETLK, &lock) != 0 || lock.l_type != F_UNLCK)
        return false;
    forget_reader(file_header(), uSeqLock, uTailReq);
    return true;
}
