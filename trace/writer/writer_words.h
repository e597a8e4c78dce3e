// The aligned words of a mapped trace file that the writer shares with a
// reader. Private to the writer.
#pragma once

#include "trace_file_fmt.h"

#include <array>
#include <atomic>
#include <bit>
#include <cstring>

using header_words = std::array<uint32_t, sizeof(trace_record_header) / sizeof(uint32_t)>;

/// Indices of the words of a record header.
enum header_word : size_t {
    WORD_LENGTH = 0,
    WORD_FUNCTION = 1, ///< function and reserved
    WORD_SEQ_NUMBER = 2,
    WORD_COMP_ID = 3,
    WORD_THREAD_ID = 4,
    WORD_TIME_STAMP = 5, ///< and the word after it
};

/// The T at `uAt`, which must be aligned for it.
template <class T> std::atomic_ref<T> shared(std::byte* pMap, size_t uAt) {
    return std::atomic_ref<T>(*reinterpret_cast<T*>(pMap + uAt));
}

inline std::atomic_ref<uint32_t> shared_word_of(std::byte* pMap, uint32_t uRecord,
                                                header_word word) {
    return shared<uint32_t>(pMap, uRecord + word * sizeof(uint32_t));
}

inline std::atomic_ref<uint32_t> shared_oldest(std::byte* pMap) {
    return shared<uint32_t>(pMap, offsetof(trace_file_header, uOldestRecordOffset));
}

inline std::atomic_ref<uint32_t> shared_seq_lock(std::byte* pMap) {
    return shared<uint32_t>(pMap, offsetof(trace_file_header, uSeqLock));
}

inline std::atomic_ref<uint32_t> shared_tail_request(std::byte* pMap) {
    return shared<uint32_t>(pMap, offsetof(trace_file_header, uTailReq));
}

inline std::atomic_ref<uint16_t> shared_flags(std::byte* pMap) {
    return shared<uint16_t>(pMap, offsetof(trace_file_header, uFlags));
}

/// The word that holds `function` and a reserved field of `uReserved`.
inline uint32_t function_word(uint16_t function, uint16_t uReserved = 0) {
    return std::bit_cast<uint32_t>(std::array<uint16_t, 2>{function, uReserved});
}

/// Plain copy of a header; only the writer changes headers.
inline trace_record_header own_header(const std::byte* pMap, uint32_t uAt) {
    trace_record_header header;
    std::memcpy(&header, pMap + uAt, sizeof(header));
    return header;
}
