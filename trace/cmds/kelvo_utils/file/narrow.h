#pragma once

#include <algorithm>
#include <cstdint>

/// The signed 32-bit number nearest to `value`.
constexpr int32_t nearest_int32(int64_t value) {
    return static_cast<int32_t>(std::clamp<int64_t>(value, INT32_MIN, INT32_MAX));
}
