#include "corruption.h"

#include "messages.h"

#define GIVING_UP                                                                                  \
    "WARNING: Irrecoverable corruption detected (giving up on the rest of this file): "

void warn_out_of_bounds(const trace_file* pTraceFile, const trace_record_header* pRec) {
    output_err_text(GIVING_UP
                    "pCurRec out of bounds: file(%s) pHeader(%p) pCurRec(%p) pMapEnd(%p).\n",
                    pTraceFile->pName, static_cast<const void*>(pTraceFile->pHeader),
                    static_cast<const void*>(pRec), static_cast<const void*>(pTraceFile->pMapEnd));
}

void warn_record_function(const trace_file* pTraceFile, uint32_t uOffset, uint16_t uFunction) {
    output_err_text(GIVING_UP
                    "invalid record function type: file(%s) record_offset(0x%08x) function(%hu).\n",
                    pTraceFile->pName, uOffset, uFunction);
}

void warn_record_component(const trace_file* pTraceFile, uint32_t uOffset, const char* pCompId) {
    const auto byte = [pCompId](int i) -> unsigned int {
        return static_cast<unsigned char>(pCompId[i]);
    };
    output_err_text(GIVING_UP "invalid record compId: file(%s) record_offset(0x%08x) "
                              "compId[0-3][0x%x%x%x%x])\n",
                    pTraceFile->pName, uOffset, byte(0), byte(1), byte(2), byte(3));
}

void warn_record_length(const trace_file* pTraceFile, uint32_t uOffset, uint32_t uLength) {
    output_err_text(GIVING_UP "invalid record length: file(%s) record_offset(0x%08x) length(%u).\n",
                    pTraceFile->pName, uOffset, uLength);
}

void warn_beyond_file_size(uint32_t uOffset) {
    output_err_text("Bad trace file, last record extends beyond end of file, offset = %d (0x%x).\n",
                    static_cast<int>(uOffset), uOffset);
}

void warn_runs_over_oldest(uint32_t uOffset, const trace_record_header& header) {
    output_err_text(
        "Bad trace file, last record length is not correct. offset=%d (0x%x), length=%d, "
        "function=%d, seqNumber=%d (0x%x)\n",
        static_cast<int>(uOffset), uOffset, static_cast<int>(header.length), header.function,
        static_cast<int>(header.seqNumber), static_cast<unsigned int>(header.seqNumber));
}
