#include "template_file.h"

#include "parse.h"

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

/// A pair of ids and the entry that answers for it. The index is an array of
/// these, ordered by key, so that a large template costs a few comparisons per
/// record and no hostile choice of ids can make it cost more.
struct format_index_slot {
    uint64_t uKey;
    format_entry* pEntry;
    uint32_t uAge;    ///< place of the entry in the list, which is newest first
    uint32_t uNewest; ///< slot of the newest entry with this trace id; in its first slot only
};

namespace {

/// Up to this many entries the list is as quick as an index.
constexpr size_t MIN_INDEXED_FORMATS = 8;

constexpr uint64_t index_key(uint32_t trace_id, uint32_t block_id) {
    return uint64_t{trace_id} << 32 | block_id;
}

uint64_t index_key(const format_entry& entry) {
    return index_key(static_cast<uint32_t>(entry.trace_id), static_cast<uint32_t>(entry.block_id));
}

uint32_t trace_id_of(const format_index_slot& slot) {
    return static_cast<uint32_t>(slot.uKey >> 32);
}

/// Indexes a template that was read. Without memory it stays without an index
/// and is searched entry by entry.
void build_format_index(template_file* pTemplate) {
    uint32_t uCount = 0;
    for (const format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext)
        ++uCount;
    if (uCount < MIN_INDEXED_FORMATS)
        return;
    auto* const pIndex =
        static_cast<format_index_slot*>(std::malloc(uCount * sizeof(format_index_slot)));
    if (pIndex == nullptr)
        return;
    uint32_t uAge = 0;
    for (format_entry* pEntry = pTemplate->pFormats; pEntry; pEntry = pEntry->pNext, ++uAge)
        pIndex[uAge] = {index_key(*pEntry), pEntry, uAge, 0};

    // Of equal keys the newest is the one that counts.
    std::sort(pIndex, pIndex + uCount, [](const format_index_slot& a, const format_index_slot& b) {
        return a.uKey != b.uKey ? a.uKey < b.uKey : a.uAge < b.uAge;
    });
    const format_index_slot* const pEnd = std::unique(
        pIndex, pIndex + uCount,
        [](const format_index_slot& a, const format_index_slot& b) { return a.uKey == b.uKey; });
    uCount = static_cast<uint32_t>(pEnd - pIndex);
    for (uint32_t uSlot = 0, uFirst = 0; uSlot < uCount; ++uSlot) {
        if (trace_id_of(pIndex[uSlot]) != trace_id_of(pIndex[uFirst]))
            uFirst = uSlot;
        uint32_t& uNewest = pIndex[uFirst].uNewest;
        if (uFirst == uSlot || pIndex[uSlot].uAge < pIndex[uNewest].uAge)
            uNewest = uSlot;
    }
    pTemplate->pIndex = pIndex;
    pTemplate->uIndexSize = uCount;
}

/// The first slot whose key is not below `uKey`; null when there is none.
const format_index_slot* find_slot(const template_file* pTemplate, uint64_t uKey) {
    const format_index_slot* const pEnd = pTemplate->pIndex + pTemplate->uIndexSize;
    const format_index_slot* const pSlot = std::lower_bound(
        static_cast<const format_index_slot*>(pTemplate->pIndex), pEnd, uKey,
        [](const format_index_slot& slot, uint64_t uWanted) { return slot.uKey < uWanted; });
    return pSlot != pEnd ? pSlot : nullptr;
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

int read_template_file(template_file* pTemplate, const char* pFileName,
                       int* p_insufficient_resources) {
    const int fd = open(pFileName, O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC);
    if (fd < 0)
        return -1;
    struct stat status;
    const bool bRegular = fstat(fd, &status) == 0 && S_ISREG(status.st_mode);
    const file_owner pFile(bRegular ? fdopen(fd, "r") : nullptr);
    if (pFile == nullptr) {
        close(fd);
        return bRegular ? -1 : 0;
    }
    return read_template(pTemplate, pFileName, pFile.get(), p_insufficient_resources);
}

format_entry* find_format(const template_file* pTemplate, uint32_t trace_id, int block_id) {
    const uint64_t uKey = index_key(trace_id, static_cast<uint32_t>(block_id));
    if (pTemplate->pIndex != nullptr) {
        const format_index_slot* const pSlot = find_slot(pTemplate, uKey);
        return pSlot != nullptr && pSlot->uKey == uKey ? pSlot->pEntry : nullptr;
    }
    format_entry* pEntry = pTemplate->pFormats;
    while (pEntry && index_key(*pEntry) != uKey)
        pEntry = pEntry->pNext;
    return pEntry;
}

format_entry* find_newest_format(const template_file* pTemplate, int32_t trace_id) {
    const auto uTraceId = static_cast<uint32_t>(trace_id);
    if (pTemplate->pIndex != nullptr) {
        const format_index_slot* const pSlot = find_slot(pTemplate, index_key(uTraceId, 0));
        return pSlot != nullptr && trace_id_of(*pSlot) == uTraceId
                   ? pTemplate->pIndex[pSlot->uNewest].pEntry
                   : nullptr;
    }
    format_entry* pEntry = pTemplate->pFormats;
    while (pEntry && pEntry->trace_id != trace_id)
        pEntry = pEntry->pNext;
    return pEntry;
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
