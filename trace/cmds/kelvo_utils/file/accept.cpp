#include "accept.h"

#include "first_record.h"
#include "platform.h"
#include "ring.h"
#include "walk.h"

namespace {

/// Big-endian writers of this version made headers of full size only.
constexpr uint16_t VERSION_WITH_FULL_HEADER = 5;

} // namespace

bool header_is_valid(const trace_file_header& header, uint32_t uSize) {
    if (header.uVersion == VERSION_WITH_FULL_HEADER &&
        (is_BE_unix_platform(header.uPlatform) || is_BE_linux_platform(header.uPlatform)) &&
        header.uOffset != sizeof(trace_file_header))
        return false;
    return (header.uProperties & TRC_PROP_RESERVED) == 0 &&
           is_compatible_platform_to_run(header.uPlatform) && header.uVersion <= TRC_MAX_VERSION &&
           header.uActualFileSize == uSize;
}

bool record_area_is_usable(const trace_file* pTraceFile) {
    return ring_holds_header(pTraceFile, ring_start(pTraceFile));
}

void take_header(trace_file* pTraceFile, const trace_file_header& header,
                 TrcPreProcHdrElem* pElem) {
    pTraceFile->timeInfo = header.timeInfo;
    pTraceFile->uPlatform = header.uPlatform;
    pTraceFile->addrMode64 = (header.uProperties & TRC_PROP_ADDR_64) != 0;
    pElem->header = read_record_header(pTraceFile->pWrap);
    pElem->bOldestKnown = !anchor.bFollow && oldest_record_time(pTraceFile, &pElem->oldestTime);
}
