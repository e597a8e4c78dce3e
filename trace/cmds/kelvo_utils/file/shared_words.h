// The words of a mapping that another process reads or writes at the same time:
// five of the file header, and the headers of the records.
//
// No lock joins the two processes. What joins them is the order of single
// 32-bit words (16 for uFlags):
// - The writer fills a record, then moves uOldestRecordOffset past it (release)
//   and stores its seqNumber last (release). A reader that sees the moved offset
//   (acquire) sees the whole record but its number; one that sees the number
//   (acquire) sees the moved offset too.
// - The reader is done with a record before it raises uSeqLock past it
//   (release), which is the writer's permission to overwrite the record.
//
// Each function makes one access. Plain instructions do on x86: nothing here
// locks the bus but store_tail_request, once per file. A mapping starts on a
// page and a private copy on a malloc block, so the header's words are aligned;
// records need not be.
#pragma once

#include "trace_file_fmt.h"

#include <array>
#include <atomic>
#include <bit>
#include <cstdint>
#include <cstring>

// ---------------------------------------------------------- the file header

inline uint32_t load_oldest_record_offset(const trace_file_header* pHeader) {
    return __atomic_load_n(&pHeader->uOldestRecordOffset, __ATOMIC_ACQUIRE);
}

inline uint32_t load_actual_file_size(const trace_file_header* pHeader) {
    return __atomic_load_n(&pHeader->uActualFileSize, __ATOMIC_RELAXED);
}

inline bool tail_request_is_acknowledged(const trace_file_header* pHeader) {
    return (__atomic_load_n(&pHeader->uFlags, __ATOMIC_ACQUIRE) & TRC_FLAG_TAIL_ACK) != 0;
}

/// Sequentially consistent: the request must not be overtaken by the reads of
/// the ring that follow it.
inline void store_tail_request(trace_file_header* pHeader, uint32_t uTailReq) {
    __atomic_store_n(&pHeader->uTailReq, uTailReq, __ATOMIC_SEQ_CST);
}

/// The reader's own word: no order is needed to read it back.
inline uint32_t load_seq_lock(const trace_file_header* pHeader) {
    return __atomic_load_n(&pHeader->uSeqLock, __ATOMIC_RELAXED);
}

inline void store_seq_lock(trace_file_header* pHeader, uint32_t uSeqLock) {
    __atomic_store_n(&pHeader->uSeqLock, uSeqLock, __ATOMIC_RELEASE);
}

// --------------------------------------------------------------- the records

/// A record header as seven words. May alias what the writer stored by field.
using shared_word [[gnu::may_alias]] = uint32_t;
using record_header_words = std::array<uint32_t, sizeof(trace_record_header) / sizeof(uint32_t)>;
static_assert(sizeof(record_header_words) == sizeof(trace_record_header));

/// A copy of the record header at `pRecord`, each word read once and seqNumber
/// first: if that is the expected one, the others are complete.
inline trace_record_header load_record_header(const void* pRecord) {
    constexpr size_t SEQ = offsetof(trace_record_header, seqNumber) / sizeof(uint32_t);
    record_header_words words;
    if (reinterpret_cast<uintptr_t>(pRecord) % alignof(uint32_t) == 0) [[likely]] {
        const auto* const pWords = static_cast<const shared_word*>(pRecord);
        words[SEQ] = __atomic_load_n(pWords + SEQ, __ATOMIC_ACQUIRE);
        for (size_t i = 0; i < words.size(); ++i)
            if (i != SEQ)
                words[i] = __atomic_load_n(pWords + i, __ATOMIC_RELAXED);
    } else { // no atomic access to words that may cross a cache line; the order is kept
        const auto* const pBytes = static_cast<const std::byte*>(pRecord);
        constexpr size_t BEFORE = SEQ * sizeof(uint32_t);
        constexpr size_t BEHIND = BEFORE + sizeof(uint32_t);
        memcpy(&words[SEQ], pBytes + BEFORE, sizeof(uint32_t));
        std::atomic_signal_fence(std::memory_order_acquire);
        memcpy(words.data(), pBytes, BEFORE);
        memcpy(&words[SEQ + 1], pBytes + BEHIND, sizeof(words) - BEHIND);
    }
    return std::bit_cast<trace_record_header>(words);
}
