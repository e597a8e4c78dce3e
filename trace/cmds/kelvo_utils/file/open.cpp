#include "open.h"

#include "accept.h"
#include "mapping.h"
#include "twins.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <new>

namespace {

/// The record and, behind it in the same block, its path.
open_result make_trace_file(const char* pName, trace_file_ptr* ppTraceFile) {
    const size_t uNameSize = strlen(pName) + 1;
    constexpr size_t ALIGNMENT = alignof(trace_file);
    const size_t uSize = (sizeof(trace_file) + uNameSize + ALIGNMENT - 1) / ALIGNMENT * ALIGNMENT;
    void* const pBlock = aligned_alloc(ALIGNMENT, uSize);
    if (pBlock == nullptr)
        return {OPEN_NO_MEMORY, ENOMEM, static_cast<int64_t>(uSize)};
    auto* const pTraceFile = new (pBlock) trace_file{};
    pTraceFile->pName = static_cast<char*>(pBlock) + sizeof(trace_file);
    memcpy(pTraceFile->pName, pName, uNameSize);
    pTraceFile->fd = -1;
    ppTraceFile->reset(pTraceFile);
    return {};
}

open_result open_and_map(trace_file* pTraceFile) {
    pTraceFile->bTellsSeldom = pTraceFile->bReadOnly || pTraceFile->pTwins != nullptr;
    return pTraceFile->pTwins != nullptr ? open_among_twins(pTraceFile) : open_alone(pTraceFile);
}

} // namespace

void file_closer::operator()(trace_file* pTraceFile) const {
    close_trace_file(pTraceFile);
    release_trace_file(pTraceFile);
}

open_result open_checked_file(const char* pName, bool bReadOnly, trace_file_ptr* ppTraceFile,
                              trace_file_header* pHeader) {
    trace_file_ptr pTraceFile;
    open_result result = make_trace_file(pName, &pTraceFile);
    if (result.eOutcome != OPEN_OK)
        return result;
    pTraceFile->bReadOnly = bReadOnly;
    result = open_and_map(pTraceFile.get());
    if (result.eOutcome != OPEN_OK)
        return result;
    memcpy(pHeader, pTraceFile->pHeader, sizeof *pHeader);
    if (!header_is_valid(*pHeader, pTraceFile->uSize))
        result = {OPEN_NO_TRACE_FILE};
    *ppTraceFile = std::move(pTraceFile);
    return result;
}

open_result accept_trace_file(trace_file* pTraceFile, const trace_file_header& header,
                              TrcPreProcHdrElem* pElem) {
    if (!record_area_is_usable(pTraceFile))
        return {OPEN_NO_TRACE_FILE};
    if (!join_twins(pTraceFile))
        return {OPEN_NO_MEMORY, ENOMEM, SIZE_OF_TWINS};
    pTraceFile->bAccepted = 1;
    take_header(pTraceFile, header, pElem);
    return {};
}

void park_trace_file(trace_file* pTraceFile) {
    unmap_trace_file(pTraceFile);
    close_descriptor(pTraceFile);
}

int open_lock_map_trace_file(trace_file* pTraceFile) {
    const open_result result = open_and_map(pTraceFile);
    report_open_failure(pTraceFile->pName, result);
    return result.eOutcome == OPEN_OK ? 0 : -1;
}
