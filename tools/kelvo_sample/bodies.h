// Bytes of data blocks and packed parameters, put together from values.
#pragma once

#include "trace_load.h"

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <type_traits>
#include <vector>

/// Bytes that grow value by value.
class sample_bytes {
public:
    /// Adds a number as it is, a text with its NUL.
    template <class T> sample_bytes& add(const T& value) {
        if constexpr (std::is_convertible_v<const T&, std::string_view>) {
            const std::string_view text(value);
            add_bytes(std::as_bytes(std::span(text)));
            content.push_back(std::byte{0});
        } else {
            static_assert(std::is_trivially_copyable_v<T>);
            add_bytes(std::as_bytes(std::span(&value, 1)));
        }
        return *this;
    }

    sample_bytes& add_bytes(trace_bytes bytes) {
        content.insert(content.end(), bytes.begin(), bytes.end());
        return *this;
    }

    /// Zero bytes up to a multiple of `uAlignment`.
    sample_bytes& align(size_t uAlignment) {
        while (content.size() % uAlignment != 0)
            content.push_back(std::byte{0});
        return *this;
    }

    /// A long of a program of that addressing mode.
    sample_bytes& add_long(int64_t value, unsigned uAddrBits) {
        return uAddrBits == 64 ? add(value) : add(static_cast<int32_t>(value));
    }

    trace_bytes bytes() const {
        return content;
    }

private:
    std::vector<std::byte> content;
};

/// The bytes of values, one behind the other.
template <class... T> sample_bytes block(const T&... values) {
    sample_bytes bytes;
    (bytes.add(values), ...);
    return bytes;
}
