#include "open.h"

#include "accept.h"
#include "mapping.h"
#include "open_result.h"
#include "print.h"
#include "start.h"
#include "summary.h"
#include "twins.h"
#include "usage.h"

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>

namespace {

constexpr uint16_t VERSION_WITH_BASE_PROG_NAME = 5;

/// A file that is not handed out is closed and released.
struct file_closer {
    void operator()(trace_file* pTraceFile) const {
        close_trace_file(pTraceFile);
        release_trace_file(pTraceFile);
    }
};
using trace_file_ptr = std::unique_ptr<trace_file, file_closer>;

/// The record and, behind it in the same block, its path. Null when memory ran
/// out (reported).
trace_file_ptr make_trace_file(const char* pName) {
    const size_t uNameSize = strlen(pName) + 1;
    constexpr size_t ALIGNMENT = alignof(trace_file);
    const size_t uSize = (sizeof(trace_file) + uNameSize + ALIGNMENT - 1) / ALIGNMENT * ALIGNMENT;
    void* const pBlock = aligned_alloc(ALIGNMENT, uSize);
    if (pBlock == nullptr) {
        report_open_failure(pName, {OPEN_NO_MEMORY, ENOMEM, static_cast<int64_t>(uSize)});
        return nullptr;
    }
    trace_file_ptr pTraceFile(new (pBlock) trace_file{});
    pTraceFile->pName = static_cast<char*>(pBlock) + sizeof(trace_file);
    memcpy(pTraceFile->pName, pName, uNameSize);
    pTraceFile->fd = -1;
    return pTraceFile;
}

int refuse(const char* pName, const open_result& result) {
    report_open_failure(pName, result);
    return -1;
}

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

/// Gives mapping, descriptor and lock back until the file is read.
void park(trace_file* pTraceFile) {
    unmap_trace_file(pTraceFile);
    close_descriptor(pTraceFile);
}

} // namespace

int open_lock_map_trace_file(trace_file* pTraceFile) {
    pTraceFile->bTellsSeldom = pTraceFile->bReadOnly || pTraceFile->pTwins != nullptr;
    const open_result result =
        pTraceFile->pTwins != nullptr ? open_among_twins(pTraceFile) : open_alone(pTraceFile);
    return result.eOutcome == OPEN_OK ? 0 : refuse(pTraceFile->pName, result);
}

int open_trace_file(const char* pName, trace_file** ppTraceFile, TrcPreProcHdrElem* pElem,
                    int bPrBaseProgName, unsigned int total_files, unsigned int fileIndex) {
    *ppTraceFile = nullptr;
    if (total_files > 1)
        output_message("[%02u] Filename: %s\n", fileIndex, pName);
    trace_file_ptr pTraceFile = make_trace_file(pName);
    if (pTraceFile == nullptr || open_lock_map_trace_file(pTraceFile.get()) != 0)
        return -1;

    trace_file_header header; // the writer may change the mapped one at any time
    memcpy(&header, pTraceFile->pHeader, sizeof(header));
    if (!header_is_valid(header, pTraceFile->uSize))
        return refuse(pName, {OPEN_NO_TRACE_FILE});
    if (bPrBaseProgName)
        return list_base_program_name(header);
    if (!record_area_is_usable(pTraceFile.get()))
        return refuse(pName, {OPEN_NO_TRACE_FILE});
    if (!join_twins(pTraceFile.get()))
        return refuse(pName, {OPEN_NO_MEMORY, ENOMEM, SIZE_OF_TWINS});
    pTraceFile->bAccepted = 1;

    take_header(pTraceFile.get(), header, pElem);
    print_file_summary(pName, header, total_files);
    if (fileIndex == 0 && apply_first_file(header) != 0)
        return -1;
    if (!anchor.bFollow)
        park(pTraceFile.get());
    *ppTraceFile = pTraceFile.release();
    return 0;
}
