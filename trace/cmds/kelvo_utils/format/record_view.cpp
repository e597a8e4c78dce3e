#include "record_view.h"

#include "format_text.h"
#include "hex.h"
#include "mutex.h"

#include "store.h"

#include <algorithm>

trace_bytes element_record_bytes(const trace_queue_element* pElement) {
    const uint32_t uHeld =
        pElement->length > QUEUE_ELEMENT_OVERHEAD ? pElement->length - QUEUE_ELEMENT_OVERHEAD : 0;
    const uint32_t uLength = pElement->header.length;
    const auto* pBlock = reinterpret_cast<const std::byte*>(pElement);
    return {pBlock + offsetof(trace_queue_element, header), std::min(uHeld, uLength)};
}

cu_timeinfo load_time_base(trace_bytes bytes, size_t uOffset) {
    return load<cu_timeinfo>(bytes, uOffset);
}

void replace_time_base(trace_file* pTraceFile, const cu_timeinfo& base) {
    const mutex_guard guard(Glbl_TrcFmtngProcCtrl.priorityQmutex);
    pTraceFile->timeInfo = base;
}

const format_entry* find_record_format(const record_view& record, uint32_t uTraceId, int iBlockId,
                                       int* pInsufficientResources) {
    *pInsufficientResources = 0;
    if (anchor.bRaw)
        return nullptr;
    return get_format_from_file(record.pFile, record.pElement->header.compId, uTraceId, iBlockId,
                                pInsufficientResources);
}

void format_data_block(const format_entry* pFormatEntry, trace_bytes data, int bAddr64) {
    format_packed_parms(pFormatEntry, &data, bAddr64);
    if (!data.empty())
        format_hex(data);
}
