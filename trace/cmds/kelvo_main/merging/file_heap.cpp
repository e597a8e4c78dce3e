#include "file_heap.h"

#include <algorithm>
#include <new>

bool file_heap::reserve(uint32_t uFiles) {
    m_entries.reset(new (std::nothrow) entry[uFiles]);
    m_places.reset(new (std::nothrow) uint32_t[uFiles]);
    m_uSize = 0;
    if (m_entries == nullptr || m_places == nullptr)
        return false;
    std::fill_n(m_places.get(), uFiles, NOWHERE);
    return true;
}

void file_heap::move(uint32_t uTo, const entry& moved) {
    m_entries[uTo] = moved;
    m_places[moved.uFile] = uTo;
}

void file_heap::move_up(uint32_t uHole, const entry& moved) {
    while (uHole != 0) {
        const uint32_t uParent = (uHole - 1) / 2;
        if (!is_later(m_entries[uParent], moved))
            break;
        move(uHole, m_entries[uParent]);
        uHole = uParent;
    }
    move(uHole, moved);
}

void file_heap::move_down(uint32_t uHole, const entry& moved) {
    for (;;) {
        uint32_t uChild = 2 * uHole + 1;
        if (uChild >= m_uSize)
            break;
        if (uChild + 1 < m_uSize && is_later(m_entries[uChild], m_entries[uChild + 1]))
            ++uChild;
        if (!is_later(moved, m_entries[uChild]))
            break;
        move(uHole, m_entries[uChild]);
        uHole = uChild;
    }
    move(uHole, moved);
}

void file_heap::put(const entry& added) {
    const uint32_t uPlace = m_places[added.uFile];
    if (uPlace == NOWHERE)
        move_up(m_uSize++, added);
    else if (uPlace != 0 && is_later(m_entries[(uPlace - 1) / 2], added))
        move_up(uPlace, added);
    else
        move_down(uPlace, added);
}

void file_heap::remove(uint32_t uFile) {
    const uint32_t uPlace = m_places[uFile];
    if (uPlace == NOWHERE)
        return;
    m_places[uFile] = NOWHERE;
    const entry last = m_entries[--m_uSize];
    if (last.uFile == uFile)
        return;
    m_places[last.uFile] = uPlace;
    put(last);
}
