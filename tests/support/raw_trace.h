// Trace files made byte by byte, sound or not: any header, any record at any
// offset. For sound files see sample_trace.h.
#pragma once

#include "trace_file_fmt.h"
#include "trace_load.h"

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

/// Adds a copy of `more` to `*pBytes`.
void add_bytes(std::vector<std::byte>* pBytes, trace_bytes more);

/// The bytes of the arguments, one behind the other without padding: numbers as
/// they are, string views without a NUL.
template <class... T> std::vector<std::byte> raw_bytes(const T&... values) {
    std::vector<std::byte> bytes;
    const auto add = [&bytes](const auto& value) {
        using value_type = std::remove_cvref_t<decltype(value)>;
        if constexpr (std::is_convertible_v<const value_type&, std::string_view>) {
            add_bytes(&bytes, std::as_bytes(std::span(std::string_view(value))));
        } else {
            static_assert(std::is_trivially_copyable_v<value_type>);
            add_bytes(&bytes, std::as_bytes(std::span(&value, 1)));
        }
    };
    (add(values), ...);
    return bytes;
}

/// A record as it is to stand in the file, nothing checked.
struct raw_record {
    uint16_t function = TRC_FUNC_ID;
    uint32_t seqNumber = 0;
    std::string_view compId = "_TST"; ///< at most four bytes are taken, missing ones are 0
    uint32_t threadId = 1;
    uint64_t timeStamp = 0;
    std::vector<std::byte> body{};
    int64_t length = -1; ///< length field; -1: 28 + size of the body
    uint16_t reserved = 0;
};

/// The bytes of one record, header and body.
std::vector<std::byte> raw_record_bytes(const raw_record& record);

/// A file of a fixed size. Zero bytes where nothing was put.
class raw_trace {
public:
    /// The header is that of a sound, empty file of this size: little endian,
    /// 64-bit, platform 2, version 6, the acknowledge bit set, no reader.
    explicit raw_trace(uint32_t uSize);

    /// Laid over the first 200 bytes (as many as there are) by bytes() and
    /// write(), except those from `uHeaderBytes` on.
    trace_file_header header{};
    uint32_t uHeaderBytes = sizeof(trace_file_header);

    /// Copies `bytes` to `uAt`; what lies beyond the end of the file is cut.
    raw_trace& put(uint32_t uAt, trace_bytes bytes);
    raw_trace& put(uint32_t uAt, const raw_record& record);

    /// Puts the record behind the last one that was put, at header.uOffset if
    /// there is none, and returns its offset.
    uint32_t add(const raw_record& record);
    /// Adds a filler of `uLength` bytes that does not count in the sequence.
    uint32_t add_filler(uint32_t uLength, uint32_t seqNumber = TRC_SEQ_FILLER);
    /// Adds such a filler up to the end of the file; it must leave 28 bytes.
    uint32_t add_rest();

    /// Offset behind the last record that was put.
    uint32_t end() const {
        return uEnd != 0 ? uEnd : header.uOffset;
    }

    std::vector<std::byte> bytes() const;
    /// Returns false, with errno, when the file cannot be written.
    bool write(const std::string& path) const;

private:
    std::vector<std::byte> content;
    uint32_t uEnd = 0;
};

/// Writes `bytes` as the file `path`. Returns false, with errno, on failure.
bool write_file(const std::string& path, trace_bytes bytes);

/// The content of a file; empty when it cannot be read.
std::vector<std::byte> read_file(const std::string& path);
