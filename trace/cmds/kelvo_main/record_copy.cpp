#include "record_copy.h"

#include "insufficient.h"
#include "walk.h"

#include <cstdlib>
#include <cstring>

trace_queue_element* copy_record(trace_file* pTraceFile, const trace_record_header& header,
                                 element_memory* pMemory) {
    const trace_bytes record = record_bytes(pTraceFile, pTraceFile->pCurRec, header.length);
    const size_t uSize = record.size() + QUEUE_ELEMENT_OVERHEAD;
    auto* const pElement = static_cast<trace_queue_element*>(
        pMemory != nullptr ? pMemory->allocate(uSize) : malloc(uSize));
    if (pElement == nullptr) {
        warn_insufficient_resources(pTraceFile->pName, static_cast<int64_t>(uSize));
        return nullptr;
    }
    constexpr size_t HEAD = offsetof(trace_queue_element, header);
    auto* const pBytes = reinterpret_cast<std::byte*>(pElement);
    memset(pBytes, 0, HEAD);
    memcpy(pBytes + HEAD, record.data(), record.size());
    memset(pBytes + HEAD + record.size(), 0, uSize - HEAD - record.size());
    pElement->header = header;
    pElement->header.length = static_cast<uint32_t>(record.size());
    pElement->pFile = pTraceFile;
    pElement->offset = get_record_offset(pTraceFile, pTraceFile->pCurRec);
    pElement->length = static_cast<uint32_t>(uSize);
    return pElement;
}
