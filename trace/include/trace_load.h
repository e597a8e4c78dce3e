// The one door through which bytes of a trace file are read: bounded loads over
// a run of bytes. Nothing here assumes alignment, and every test is made by
// subtraction, so no offset, however large, can wrap past the end.
#pragma once

#include <cstddef>
#include <cstring>
#include <span>
#include <string_view>
#include <type_traits>

using trace_bytes = std::span<const std::byte>;

/// Whether `size` bytes at `offset` lie wholly inside `bytes`.
constexpr bool lies_inside(trace_bytes bytes, size_t offset, size_t size) {
    return offset <= bytes.size() && size <= bytes.size() - offset;
}

/// The T at `offset`, or a zero T when it does not lie wholly inside `bytes`.
template <class T> T load(trace_bytes bytes, size_t offset) {
    static_assert(std::is_trivially_copyable_v<T>);
    T value{};
    if (lies_inside(bytes, offset, sizeof(T)))
        std::memcpy(&value, bytes.data() + offset, sizeof(T));
    return value;
}

/// The part of `bytes` from `offset` on, at most `size` bytes; empty when
/// `offset` lies beyond the end.
constexpr trace_bytes load_run(trace_bytes bytes, size_t offset,
                               size_t size = std::dynamic_extent) {
    if (offset >= bytes.size())
        return {};
    const size_t left = bytes.size() - offset;
    return bytes.subspan(offset, size < left ? size : left);
}

/// The string that begins at `offset`: up to its NUL, or to the end of `bytes`
/// when it has none; empty when `offset` lies outside.
inline std::string_view load_string(trace_bytes bytes, size_t offset) {
    const trace_bytes rest = load_run(bytes, offset);
    const auto* pText = reinterpret_cast<const char*>(rest.data());
    return {pText, rest.empty() ? 0 : strnlen(pText, rest.size())};
}
