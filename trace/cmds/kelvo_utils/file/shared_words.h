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
#include <cstddef>
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

inline void store_seq_lock(trace_file_header* pHeader, uint32_t uSeqLock) {
    __atomic_store_n(&pHeader->uSeqLock, uSeqLock, __ATOMIC_RELEASE);
}

// --------------------------------------------------------------- the records

/// The word at `pWord`, read before everything that is read after it. May alias
/// what the writer stored.
inline uint32_t load_first(const std::byte* pWord) {
    using shared_word [[gnu::may_alias]] = uint32_t;
    if (reinterpret_cast<uintptr_t>(pWord) % alignof(uint32_t) == 0) [[likely]]
        return __atomic_load_n(reinterpret_cast<const shared_word*>(pWord), __ATOMIC_ACQUIRE);
    uint32_t uWord; // no atomic access to a word that may cross a cache line
    memcpy(&uWord, pWord, sizeof uWord);
    std::atomic_signal_fence(std::memory_order_acquire);
    return uWord;
}

#if defined(__SANITIZE_THREAD__)
#define KELVO_THREAD_SANITIZER true
#elif defined(__has_feature)
#define KELVO_THREAD_SANITIZER __has_feature(thread_sanitizer)
#else
#define KELVO_THREAD_SANITIZER false
#endif

/// Copies a record header whose words may change meanwhile. In one piece: a copy
/// made of single words would hold up whoever copies it on at once. Only the
/// thread sanitizer, which knows no other order than that of atomic accesses, gets
/// it word by word, when a writer in the same process keeps to whole words too.
inline void copy_header_words(trace_record_header* pHeader, const std::byte* pRecord) {
    using shared_word [[gnu::may_alias]] = uint32_t;
    if (!KELVO_THREAD_SANITIZER || reinterpret_cast<uintptr_t>(pRecord) % alignof(uint32_t) != 0) {
        memcpy(pHeader, pRecord, sizeof *pHeader);
        return;
    }
    const auto* const pWords = reinterpret_cast<const shared_word*>(pRecord);
    std::array<uint32_t, sizeof *pHeader / sizeof(uint32_t)> words;
    for (size_t i = 0; i < words.size(); ++i)
        words[i] = __atomic_load_n(pWords + i, __ATOMIC_RELAXED);
    memcpy(pHeader, words.data(), sizeof *pHeader);
}

/// Copies the record header at `pRecord`. Its seqNumber is read before the rest: if
/// that is the expected one, the others are complete. What is copied does not change
/// any more, whatever the writer does.
inline void load_record_header(const void* pRecord, trace_record_header* pHeader) {
    const auto* const pBytes = static_cast<const std::byte*>(pRecord);
    const uint32_t seqNumber = load_first(pBytes + offsetof(trace_record_header, seqNumber));
    copy_header_words(pHeader, pBytes);
    std::atomic_signal_fence(std::memory_order_seq_cst); // no field is read from the ring again
    if (pHeader->seqNumber == seqNumber) [[likely]]
        return;
    // Stored meanwhile. The fence keeps the compiler from storing it always, which
    // would hold up whoever reads the copy at once.
    std::atomic_signal_fence(std::memory_order_seq_cst);
    pHeader->seqNumber = seqNumber;
}
