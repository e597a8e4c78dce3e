#include "record.h"

#include "frame.h"
#include "messages.h"
#include "record_bodies.h"
#include "sink.h"
#include "trace_file_fmt.h"

#include <cstring>

namespace {

bool is_internal(const trace_record_header& header) {
    return std::memcmp(header.compId, TRC_COMP_INTERNAL, sizeof(header.compId)) == 0;
}

/// What some records change of their file before anything is written.
void apply_to_file(const trace_record_header& header, trace_bytes bytes, trace_file* pTraceFile) {
    const uint16_t uFunction = header.function;
    if (uFunction == TRC_FUNC_TIME_CALIBRATION) {
        replace_time_base(pTraceFile, load_time_base(bytes, offsetof(time_calibration, reBase)));
    } else if (is_internal(header)) {
        if (uFunction == TRC_FUNC_VALUES || uFunction == TRC_FUNC_START)
            free_thread_info(pTraceFile);
        // Already now, so that the record's own prefix goes by it.
        if (uFunction == TRC_FUNC_START)
            replace_time_base(pTraceFile,
                              load_time_base(bytes, offsetof(trace_record_start, timeInfo)));
    }
}

/// Looks the record's format up and writes the body. Returns 1 when memory ran
/// out, else 0.
int write_body(const record_view& record) {
    const record_kind* pKind = record.pKind;
    if (!pKind || !pKind->pWriter) {
        output_err_message("%s: 2625-149 Internal Error, unknown trace record type found.\n",
                           anchor.pProgName);
        return 0;
    }
    const format_entry* pFormat = nullptr;
    if (pKind->iTemplateKey != TEMPLATE_KEY_NONE) {
        const uint32_t uKey = pKind->iTemplateKey == TEMPLATE_KEY_OF_BODY
                                  ? record.uTraceId
                                  : static_cast<uint32_t>(pKind->iTemplateKey);
        int insufficient_resources;
        pFormat = find_record_format(record, uKey, -1, &insufficient_resources);
        if (insufficient_resources)
            return 1;
    }
    pKind->pWriter(record, pFormat);
    return 0;
}

} // namespace

int format_record(trace_queue_element* pProcessThisElement) {
    const trace_record_header& header = pProcessThisElement->header;
    trace_file* pTraceFile = pProcessThisElement->pFile;
    const trace_bytes bytes = element_record_bytes(pProcessThisElement);

    apply_to_file(header, bytes, pTraceFile);
    if (header.function == TRC_FUNC_TIME_CALIBRATION) {
        output_end_rec();
        return 0;
    }
    if (output_start_rec(pTraceFile, header.compId, header.threadId, header.function,
                         header.seqNumber, pProcessThisElement->offset, header.timeStamp,
                         &pTraceFile->timeInfo))
        return 1;

    const record_kind* pKind = find_record_kind(header.function);
    const bool bHasTraceId = pKind && pKind->uTraceIdOffset != 0;
    const record_view record = {.pElement = pProcessThisElement,
                                .pFile = pTraceFile,
                                .pKind = pKind,
                                .bytes = bytes,
                                .uTraceId =
                                    bHasTraceId ? load<uint32_t>(bytes, pKind->uTraceIdOffset) : 0};
    if (write_body(record)) {
        output_abandon_rec(); // the state of its thread may go with the file
        return 1;
    }
    output_end_rec();
    return 0;
}
