// The words of a mapped trace file that one process stores while another reads
// them, both halves of each: five of the file header, and the headers of the
// records.
//
// No lock joins the two processes. What joins them is the order of single
// 32-bit words (16 for uFlags):
// - The writer fills a record, then moves uOldestRecordOffset past it (release)
//   and stores its seqNumber last (release). A reader that sees the moved offset
//   (acquire) sees the whole record but its number; one that sees the number
//   (acquire) sees the moved offset too.
// - The reader is done with a record before it raises uSeqLock past it
//   (release), which is the writer's permission to overwrite the record.
// trace_writer.h tells the whole protocol.
//
// Each function makes one access. Plain instructions do on x86, but for the
// answers and requests of a handshake, once per file. A mapping starts on a
// page and a private copy on a malloc block, so the header's words are aligned;
// records that the writer here makes are, others need not be.
#pragma once

#include "trace_file_fmt.h"

#include <array>
#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstring>

// ---------------------------------------------------------- the file header

/// Where the oldest data begins: the writer moves it when a record is complete.
inline uint32_t load_oldest_record_offset(const trace_file_header* pHeader) {
    return __atomic_load_n(&pHeader->uOldestRecordOffset, __ATOMIC_ACQUIRE);
}

inline void store_oldest_record_offset(trace_file_header* pHeader, uint32_t uOffset) {
    __atomic_store_n(&pHeader->uOldestRecordOffset, uOffset, __ATOMIC_RELEASE);
}

/// Zero until a new file is laid out.
inline uint32_t load_actual_file_size(const trace_file_header* pHeader) {
    return __atomic_load_n(&pHeader->uActualFileSize, __ATOMIC_RELAXED);
}

inline void store_actual_file_size(trace_file_header* pHeader, uint32_t uSize) {
    __atomic_store_n(&pHeader->uActualFileSize, uSize, __ATOMIC_RELEASE);
}

// The request of a reader and its answer. Sequentially consistent: neither must
// be overtaken by what its side reads next, the ring or the other's word.

inline void store_tail_request(trace_file_header* pHeader, uint32_t uTailReq) {
    __atomic_store_n(&pHeader->uTailReq, uTailReq, __ATOMIC_SEQ_CST);
}

inline uint32_t load_tail_request(const trace_file_header* pHeader) {
    return __atomic_load_n(&pHeader->uTailReq, __ATOMIC_SEQ_CST);
}

inline void acknowledge_tail_request(trace_file_header* pHeader) {
    __atomic_fetch_or(&pHeader->uFlags, TRC_FLAG_TAIL_ACK, __ATOMIC_SEQ_CST);
}

inline void withdraw_acknowledgement(trace_file_header* pHeader) {
    __atomic_fetch_and(&pHeader->uFlags, static_cast<uint16_t>(~TRC_FLAG_TAIL_ACK),
                       __ATOMIC_SEQ_CST);
}

inline bool tail_request_is_acknowledged(const trace_file_header* pHeader) {
    return (__atomic_load_n(&pHeader->uFlags, __ATOMIC_ACQUIRE) & TRC_FLAG_TAIL_ACK) != 0;
}

inline void store_seq_lock(trace_file_header* pHeader, uint32_t uSeqLock) {
    __atomic_store_n(&pHeader->uSeqLock, uSeqLock, __ATOMIC_RELEASE);
}

/// The same word for the writer: records with lower numbers are done with.
inline uint32_t load_reader_position(const trace_file_header* pHeader) {
    return __atomic_load_n(&pHeader->uSeqLock, __ATOMIC_ACQUIRE);
}

/// Resets the words of a reader that died, as far as they still are what was
/// seen of it.
inline void forget_reader(trace_file_header* pHeader, uint32_t uSeqLock, uint32_t uTailReq) {
    __atomic_compare_exchange_n(&pHeader->uSeqLock, &uSeqLock, TRC_SEQ_NO_READER, false,
                                __ATOMIC_SEQ_CST, __ATOMIC_SEQ_CST);
    __atomic_compare_exchange_n(&pHeader->uTailReq, &uTailReq, 0, false, __ATOMIC_SEQ_CST,
                                __ATOMIC_SEQ_CST);
}

// --------------------------------------------------------------- the records

using shared_word [[gnu::may_alias]] = uint32_t;

/// A record header as words, and their places in it.
using header_words = std::array<uint32_t, sizeof(trace_record_header) / sizeof(uint32_t)>;
enum header_word : size_t {
    WORD_LENGTH = 0,
    WORD_FUNCTION = 1, ///< function and reserved
    WORD_SEQ_NUMBER = 2,
    WORD_COMP_ID = 3, ///< the first of those that order does not matter for
};

/// Stores a word of the header at `pRecord`, which is aligned, behind everything
/// stored before.
inline void store_header_word(std::byte* pRecord, size_t word, uint32_t uValue) {
    __atomic_store_n(reinterpret_cast<shared_word*>(pRecord) + word, uValue, __ATOMIC_RELEASE);
}

/// The word at `pWord`, read before everything that is read after it. May alias
/// what the writer stored.
inline uint32_t load_first(const std::byte* pWord) {
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
    if (!KELVO_THREAD_SANITIZER || reinterpret_cast<uintptr_t>(pRecord) % alignof(uint32_t) != 0) {
        memcpy(pHeader, pRecord, sizeof *pHeader);
        return;
    }
    const auto* const pWords = reinterpret_cast<const shared_word*>(pRecord);
    header_words words;
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
