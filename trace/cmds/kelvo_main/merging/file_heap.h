// A heap of files by a time, in which a file can be found again: its time may be
// changed, and it may be taken out, wherever it stands.
#pragma once

#include "kv_cu.h"

#include <cstdint>
#include <memory>

/// Files are known by their numbers, from 0 on. The earliest is on top; of two
/// with the same time the one with the lower push number.
class file_heap {
public:
    struct entry {
        cu_nanoseconds time;
        uint32_t uPush; ///< low half of a push number: two of them are less than 2^31 apart
        uint32_t uFile;
    };

    /// Makes room for the files 0 to `uFiles` - 1; the heap is empty then. Returns
    /// false when memory ran out.
    bool reserve(uint32_t uFiles);

    /// Adds the file, or gives it another place when it is there.
    void put(const entry& added);

    /// Takes the file out; harmless when it is not there.
    void remove(uint32_t uFile);

    bool empty() const {
        return m_uSize == 0;
    }
    const entry& top() const {
        return m_entries[0];
    }

private:
    static constexpr uint32_t NOWHERE = UINT32_MAX;

    void move(uint32_t uTo, const entry& moved);
    void move_up(uint32_t uHole, const entry& moved);
    void move_down(uint32_t uHole, const entry& moved);

    std::unique_ptr<entry[]> m_entries;
    std::unique_ptr<uint32_t[]> m_places; ///< by file: its index in m_entries, or NOWHERE
    uint32_t m_uSize = 0;
};

/// Whether the first comes later than the second.
inline bool is_later(const file_heap::entry& first, const file_heap::entry& second) {
    if (first.time != second.time)
        return first.time > second.time;
    return static_cast<int32_t>(first.uPush - second.uPush) > 0;
}
