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

uint64_t trace_id_key(const format_entry& entry) {
    return static_cast<uint32_t>(entry.trace_id);
}

/// Orders the entries of a list by key, of equal keys only the newest. Null,
/// and `*pSize` 0, when memory is exhausted.
format_index_slot* make_index(const template_file* pTemplate, size_t uCount,
                              uint64_t (*pKey)(const format_entry&), size_t* pSize) {
    auto* const pIndex =
        static_cast<format_index_slot*>(std::malloc(uCount * sizeof(format_index_slot)));
    *pSize = 0;
    if (pIndex == nullptr)
        return nullptr;
    format_index_slot* pEnd = pIndex;
    for (format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext)
        *pEnd++ = {pKey(*pEntry), pEntry};

    // The list is newest first, and so are equal keys after a stable sort: the
    // first of them is the one that counts.
    std::stable_sort(pIndex, pEnd, [](const format_index_slot& a, const format_index_slot& b) {
        return a.uKey < b.uKey;
    });
    pEnd = std::unique(pIndex, pEnd, [](const format_index_slot& a, const format_index_slot& b) {
        return a.uKey == b.uKey;
    });
    *pSize = static_cast<size_t>(pEnd - pIndex);
    return pIndex;
}

/// Indexes a template that was read. Without memory it stays without an index
/// and is searched entry by entry.
void build_format_indexes(template_file* pTemplate) {
    size_t uCount = 0;
    for (const format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext)
        ++uCount;
    if (uCount < MIN_INDEXED_FORMATS)
        return;
    pTemplate->pIndex = make_index(
        pTemplate, uCount, [](const format_entry& entry) { return index_key(entry); },
        &pTemplate->uIndexSize);
    pTemplate->pTraceIdIndex =
        make_index(pTemplate, uCount, trace_id_key, &pTemplate->uTraceIdIndexSize);
}

format_entry* find_in_index(const format_index_slot* pIndex, size_t uSize, uint64_t uKey) {
    const format_index_slot* const pEnd = pIndex + uSize;
    const format_index_slot* const pSlot =
        std::lower_bound(pIndex, pEnd, uKey, [](const format_index_slot& slot, uint64_t uWanted) {
            return slot.uKey < uWanted;
        });
    return pSlot != pEnd && pSlot->uKey == uKey ? pSlot->pEntry : nullptr;
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
        build_format_indexes(pTemplate);
    return iResult;
}

format_entry* find_format(const template_file* pTemplate, uint32_t trace_id, int block_id) {
    const uint64_t uKey = index_key(trace_id, block_id);
    if (pTemplate->pIndex != nullptr)
        return find_in_index(pTemplate->pIndex, pTemplate->uIndexSize, uKey);
    for (format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext) {
        if (index_key(*pEntry) == uKey)
            return pEntry;
    }
    return nullptr;
}

format_entry* find_newest_format(const template_file* pTemplate, int32_t trace_id) {
    if (pTemplate->pTraceIdIndex != nullptr)
        return find_in_index(pTemplate->pTraceIdIndex, pTemplate->uTraceIdIndexSize,
                             static_cast<uint32_t>(trace_id));
    format_entry* pEntry = pTemplate->pFormats;
    while (pEntry && pEntry->trace_id != trace_id)
        pEntry = pEntry->pNext;
    return pEntry;
}

void release_formats(template_file* pTemplate) {
    std::free(pTemplate->pIndex);
    pTemplate->pIndex = nullptr;
    pTemplate->uIndexSize = 0;
    std::free(pTemplate->pTraceIdIndex);
    pTemplate->pTraceIdIndex = nullptr;
    pTemplate->uTraceIdIndexSize = 0;
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
