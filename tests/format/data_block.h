// The blocks of data records.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>

/// A block with its length and its padding.
inline std::string block(std::string_view data) {
    const auto iSize = static_cast<int32_t>(data.size());
    std::string bytes(reinterpret_cast<const char*>(&iSize), sizeof(iSize));
    bytes += data;
    bytes.resize((bytes.size() + 3) / 4 * 4);
    return bytes;
}
