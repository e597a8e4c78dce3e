#include "element_memory.h"

#include "mutex.h"

#include <atomic>
#include <cstdint>
#include <cstdlib>
#include <new>

/// The head of a block. A block starts at a multiple of its size, so that an
/// element tells its block. Its head does not stand at the start but as many cache
/// lines behind it as the block's address tells (its colour), and its elements
/// begin COLOURS lines behind the head: else the heads of all blocks, and the
/// elements that readers of many like files write side by side, would fall into a
/// few sets of the processor's caches.
struct element_block {
    element_block* pNextKept;
    std::atomic<uint32_t> uLive; ///< elements not yet released; UNCOUNTED more while it is filled
};

namespace {

constexpr size_t BLOCK_SIZE = 64 * 1024;
constexpr size_t LINE = 64;
constexpr size_t COLOURS = 32;
constexpr size_t FIRST_ELEMENT = COLOURS * LINE; // behind the head of a block
constexpr size_t ALIGNMENT = 16;
constexpr size_t MAX_SMALL = 4096;
constexpr uint32_t UNCOUNTED = 1U << 30;
/// More than a full queue of short records takes, with a block for each of many
/// readers: to get blocks from the system again and again would cost more than to
/// format the records.
constexpr size_t MAX_KEPT = 256;
/// So many blocks rest after their release before they are filled again. By then
/// the main thread's processor has let go of them; to take them away from it
/// would hold the reader up.
constexpr size_t RESTING = 32;
static_assert(RESTING < MAX_KEPT);
static_assert(sizeof(element_block) <= LINE);
static_assert((COLOURS - 1) * LINE + FIRST_ELEMENT + MAX_SMALL <= BLOCK_SIZE);

#if defined(__SANITIZE_ADDRESS__)
#define KELVO_ELEMENTS_APART 1
#elif defined(__has_feature)
#if __has_feature(address_sanitizer)
#define KELVO_ELEMENTS_APART 1
#endif
#endif
#ifdef KELVO_ELEMENTS_APART
constexpr bool ELEMENTS_APART = true; // so that reads beyond an element show
#else
constexpr bool ELEMENTS_APART = false;
#endif

bool is_small(size_t uSize) {
    return !ELEMENTS_APART && uSize <= MAX_SMALL;
}

pthread_mutex_t kept_mutex = PTHREAD_MUTEX_INITIALIZER; // guards the kept blocks; taken last
element_block* pFirstKept = nullptr;                    // released first
element_block* pLastKept = nullptr;                     // meaningless when there is none
size_t uKept = 0;

/// The start of the block that the address lies in.
std::byte* start_of(void* pInside) {
    auto* const pByte = static_cast<std::byte*>(pInside);
    return pByte - reinterpret_cast<uintptr_t>(pByte) % BLOCK_SIZE;
}

/// The head of the block that the address lies in.
std::byte* head_of(void* pInside) {
    std::byte* const pStart = start_of(pInside);
    return pStart + reinterpret_cast<uintptr_t>(pStart) / BLOCK_SIZE % COLOURS * LINE;
}

void free_block(element_block* pBlock) {
    std::free(start_of(pBlock));
}

/// The block that was released first, when there are more than `uAbove`; or null.
element_block* take_kept_block(size_t uAbove) {
    const mutex_guard guard(kept_mutex);
    if (uKept <= uAbove)
        return nullptr;
    element_block* const pBlock = pFirstKept;
    pFirstKept = pBlock->pNextKept;
    --uKept;
    return pBlock;
}

element_block* take_block() {
    if (element_block* const pBlock = take_kept_block(RESTING))
        return pBlock;
    if (void* const pMemory = std::aligned_alloc(BLOCK_SIZE, BLOCK_SIZE))
        return new (head_of(pMemory)) element_block{};
    return take_kept_block(0);
}

void give_back(element_block* pBlock) {
    {
        const mutex_guard guard(kept_mutex);
        if (uKept < MAX_KEPT) {
            pBlock->pNextKept = nullptr;
            (uKept != 0 ? pLastKept->pNextKept : pFirstKept) = pBlock;
            pLastKept = pBlock;
            ++uKept;
            return;
        }
    }
    free_block(pBlock);
}

void count_down(element_block* pBlock, uint32_t uElements) {
    if (pBlock->uLive.fetch_sub(uElements, std::memory_order_acq_rel) == uElements)
        give_back(pBlock);
}

element_block* block_of(trace_queue_element* pElement) {
    return reinterpret_cast<element_block*>(head_of(pElement));
}

} // namespace

element_memory::~element_memory() {
    close_block();
}

void element_memory::close_block() {
    if (m_pBlock != nullptr)
        count_down(m_pBlock, UNCOUNTED - m_uElements);
    m_pBlock = nullptr;
}

void* element_memory::allocate(size_t uSize) {
    if (!is_small(uSize))
        return std::malloc(uSize);
    uSize = (uSize + ALIGNMENT - 1) / ALIGNMENT * ALIGNMENT;
    if (m_pBlock == nullptr || uSize > m_uLeft) {
        close_block();
        m_pBlock = take_block();
        if (m_pBlock == nullptr)
            return nullptr;
        m_pBlock->uLive.store(UNCOUNTED, std::memory_order_relaxed);
        m_pNext = reinterpret_cast<std::byte*>(m_pBlock) + FIRST_ELEMENT;
        m_uLeft = static_cast<size_t>(start_of(m_pBlock) + BLOCK_SIZE - m_pNext);
        m_uElements = 0;
    }
    std::byte* const pRoom = m_pNext;
    m_pNext += uSize;
    m_uLeft -= uSize;
    ++m_uElements;
    return pRoom;
}

void release_elements(std::span<trace_queue_element*> elements) {
    element_block* pBlock = nullptr;
    uint32_t uOfBlock = 0;
    for (trace_queue_element* pElement : elements) {
        if (!is_small(pElement->length)) {
            std::free(pElement);
            continue;
        }
        if (block_of(pElement) != pBlock && uOfBlock != 0) {
            count_down(pBlock, uOfBlock);
            uOfBlock = 0;
        }
        pBlock = block_of(pElement);
        ++uOfBlock;
    }
    if (uOfBlock != 0)
        count_down(pBlock, uOfBlock);
}

void release_kept_blocks() {
    while (pFirstKept != nullptr) {
        element_block* const pBlock = pFirstKept;
        pFirstKept = pBlock->pNextKept;
        free_block(pBlock);
    }
    uKept = 0;
}
