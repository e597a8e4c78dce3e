// Memory of queue elements. Small elements of one reader lie one behind the
// other in blocks, so that the main thread finds the next one where the
// processor has already looked, and allocation and release cost a few
// instructions. A block goes back to a common list, from which readers take
// their next one, when its last element is released; some blocks are kept there,
// the rest go back to the allocator. Large elements are blocks of malloc.
#pragma once

#include "kelvo.h"

#include <cstddef>
#include <span>

struct element_block;

/// Where one reader takes its elements from. One thread at a time; what was
/// taken outlives it.
class element_memory {
public:
    element_memory() = default;
    element_memory(const element_memory&) = delete;
    element_memory& operator=(const element_memory&) = delete;
    ~element_memory();

    /// Room for an element of `uSize` bytes, aligned as by malloc; null when
    /// memory ran out. Released with release_elements.
    void* allocate(size_t uSize);

private:
    void close_block();

    element_block* m_pBlock = nullptr; ///< the one that is being filled
    std::byte* m_pNext = nullptr;      ///< its free part, of m_uLeft bytes
    size_t m_uLeft = 0;
    uint32_t m_uElements = 0; ///< taken from it
};

/// Releases elements; their `length` still says what was allocated. Any thread.
void release_elements(std::span<trace_queue_element*> elements);

/// Returns the blocks that are kept to the allocator. When no reader runs.
void release_kept_blocks();
