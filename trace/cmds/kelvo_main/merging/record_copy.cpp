#include "record_copy.h"

#include "walk.h"

#include <cstring>

trace_bytes record_at_reader(const trace_file* pTraceFile, const trace_record_header& header) {
    return record_bytes(pTraceFile, pTraceFile->pCurRec, header.length);
}

trace_queue_element* copy_record(trace_file* pTraceFile, const trace_record_header& header,
                                 trace_bytes record, void* pRoom) {
    constexpr size_t HEAD = offsetof(trace_queue_element, header);
    const size_t uSize = record.size() + QUEUE_ELEMENT_OVERHEAD;
    auto* const pElement = static_cast<trace_queue_element*>(pRoom);
    auto* const pBytes = static_cast<std::byte*>(pRoom);
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
