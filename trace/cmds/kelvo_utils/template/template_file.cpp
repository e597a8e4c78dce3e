#include "template_file.h"

#include "parse.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>

/// A pair of ids and the entry that answers for it. The index is an array of
/// these, ordered by key, so that a large template costs a few comparisons per
/// record and no hostile choice of ids can make it cost more.
struct format_index_slot {
    uint64_t uKey;
    format_entry* pEntry;
};

namespace {

/// Up to this many entries the list is as quick as an index.
constexpr size_t MIN_INDEXED_FORMATS = 8;

constexpr uint64_t index_key(uint32_t trace_id, int block_id) {
    return static_cast<uint64_t>(trace_id) << 32 | static_cast<uint32_t>(block_id);
}

uint64_t index_key(const format_entry& entry) {
    return index_key(static_cast<uint32_t>(entry.trace_id), entry.block_id);
}

/// Indexes a template that was read. Without memory it stays without an index
/// and is searched entry by entry.
void build_format_index(template_file* pTemplate) {
    size_t uCount = 0;
    for (const format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext)
        ++uCount;
    if (uCount < MIN_INDEXED_FORMATS)
        return;
    auto* const pIndex =
        static_cast<format_index_slot*>(std::malloc(uCount * sizeof(format_index_slot)));
    if (pIndex == nullptr)
        return;
    format_index_slot* pEnd = pIndex;
    for (format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext)
        *pEnd++ = {index_key(*pEntry), pEntry};

    // The list is newest first, and so are equal keys after a stable sort: the
    // first of them is the one that counts.
    std::stable_sort(pIndex, pEnd, [](const format_index_slot& a, const format_index_slot& b) {
        return a.uKey < b.uKey;
    });
    pEnd = std::unique(pIndex, pEnd, [](const format_index_slot& a, const format_index_slot& b) {
        return a.uKey == b.uKey;
    });
    pTemplate->pIndex = pIndex;
    pTemplate->uIndexSize = static_cast<size_t>(pEnd - pIndex);
}

} // namespace

template_owner make_template(const char* compId) {
    template_owner pTemplate(static_cast<template_file*>(std::calloc(1, sizeof(template_file))));
    if (pTemplate != nullptr)
        std::memcpy(pTemplate->compId, compId, sizeof(pTemplate->compId));
    return pTemplate;
}

int read_template(template_file* pTemplate, const char* pFileName, FILE* pFile,
                  int* p_insufficient_resources) {
    const int iResult = parse_template_file(pTemplate, pFileName, pFile, p_insufficient_resources);
    if (iResult == 0)
        build_format_index(pTemplate);
    return iResult;
}

format_entry* find_format(const template_file* pTemplate, uint32_t trace_id, int block_id) {
    const uint64_t uKey = index_key(trace_id, block_id);
    if (pTemplate->pIndex != nullptr) {
        const format_index_slot* const pEnd = pTemplate->pIndex + pTemplate->uIndexSize;
        const format_index_slot* const pSlot = std::lower_bound(
            static_cast<const format_index_slot*>(pTemplate->pIndex), pEnd, uKey,
            [](const format_index_slot& slot, uint64_t uWanted) { return slot.uKey < uWanted; });
        return pSlot != pEnd && pSlot->uKey == uKey ? pSlot->pEntry : nullptr;
    }
    for (format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext) {
        if (index_key(*pEntry) == uKey)
            return pEntry;
    }
    return nullptr;
}

void release_formats(template_file* pTemplate) {
    std::free(pTemplate->pIndex);
    pTemplate->pIndex = nullptr;
    pTemplate->uIndexSize = 0;
    while (pTemplate->pFormats != nullptr) {
        format_entry* const pEntry = pTemplate->pFormats;
        pTemplate->pFormats = pEntry->pNext;
        std::free(pEntry);
    }
}

void release_template(template_file* pTemplate) {
    release_formats(pTemplate);
    std::free(pTemplate->preload_path);
    std::free(pTemplate);
}
