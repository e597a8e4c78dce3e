#include "opening.h"

#include "print.h"
#include "start.h"
#include "summary.h"
#include "usage.h"

namespace {

constexpr uint16_t VERSION_WITH_BASE_PROG_NAME = 5;

/// -B: nothing but the name, and the file is left as it stood.
int list_base_program_name(const trace_file_header& header) {
    if (header.uVersion < VERSION_WITH_BASE_PROG_NAME)
        return -1;
    print_base_program_name(header);
    return 0;
}

/// The first file argument sets the time zone, and only then is the -s argument
/// read: it may give a date and time. Returns 0, or -1 after a message.
int apply_first_file(const trace_file_header& header) {
    if (!anchor.bLocalTZ && header.uOffset >= MIN_HDR_SIZE_FOR_TZ &&
        header.tz_offset != TRC_TZ_NOT_RECORDED) {
        anchor.tz_offset = header.tz_offset;
        anchor.bHostTZ = 1;
        set_tz();
    }
    if (anchor.bStartRecOpt == 1 && parse_start(anchor.pStartRecordOptArg) != 0) {
        output_usage();
        return -1;
    }
    return 0;
}

/// 0, or -1 after the message.
int report(const char* pName, const open_result& result) {
    report_open_failure(pName, result);
    return result.eOutcome == OPEN_OK ? 0 : -1;
}

} // namespace

int open_trace_file(const char* pName, trace_file** ppTraceFile, TrcPreProcHdrElem* pElem,
                    int bPrBaseProgName, unsigned int total_files, unsigned int fileIndex) {
    *ppTraceFile = nullptr;
    if (total_files > 1)
        output_message("[%02u] Filename: %s\n", fileIndex, pName);
    trace_file_ptr pTraceFile;
    trace_file_header header;
    if (report(pName, open_checked_file(pName, false, &pTraceFile, &header)) != 0)
        return -1;
    if (bPrBaseProgName)
        return list_base_program_name(header);
    if (report(pName, accept_trace_file(pTraceFile.get(), header, pElem)) != 0)
        return -1;
    print_file_summary(pName, header, total_files);
    if (fileIndex == 0 && apply_first_file(header) != 0)
        return -1;
    if (!anchor.bFollow)
        park_trace_file(pTraceFile.get());
    *ppTraceFile = pTraceFile.release();
    return 0;
}
