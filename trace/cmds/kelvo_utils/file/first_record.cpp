#include "first_record.h"

#include "corruption.h"
#include "reader_words.h"
#include "ring.h"
#include "shared_words.h"
#include "walk.h"

#include <algorithm>

namespace {

/// A walk over the ring that ends after one turn whatever the lengths are.
struct ring_search {
    const trace_file* pTraceFile;
    uint64_t uOffset;
    uint64_t uWalked = 0; ///< bytes from where the search began

    bool stands_on_record() const {
        return ring_holds_header(pTraceFile, uOffset);
    }

    trace_record_header header() const {
        return read_record_header(ring_position(pTraceFile, uOffset));
    }

    /// Back where the search began. The oldest position may be elsewhere by now: a
    /// writer that made it begin on an unfinished record has finished that one.
    bool is_back() const {
        return uWalked == ring_size(pTraceFile);
    }

    bool has_gone_round() const {
        return uWalked >= ring_size(pTraceFile);
    }

    /// A step that reaches or passes the end goes on at the start of the area.
    void step(uint32_t uLength) {
        const uint64_t uLeft = ring_end(pTraceFile) - uOffset;
        uWalked += std::min<uint64_t>(uLength, uLeft);
        uOffset = uLength < uLeft ? uOffset + uLength : ring_start(pTraceFile);
    }
};

/// Fillers and what is just being written: held records, and the newest record
/// while it stands on the oldest position and waits for its number.
bool is_passed_over(const trace_record_header& header) {
    return header.function == TRC_FUNC_FILLER || header.function == TRC_FUNC_WRITING ||
           header.seqNumber == TRC_SEQ_FILLER;
}

void stand_on(trace_file* pTraceFile, const trace_record_header& header) {
    pTraceFile->uExpectedSeq = header.seqNumber;
    tell_place_now(pTraceFile);
}

int give_up_at(const ring_search& search) {
    warn_out_of_bounds(search.pTraceFile, ring_position(search.pTraceFile, search.uOffset));
    return -1;
}

/// Time base of a record: a start record has its own.
cu_timeinfo time_base(const trace_file* pTraceFile, uint64_t uOffset,
                      const trace_record_header& header) {
    constexpr size_t OWN_BASE = offsetof(trace_record_start, timeInfo);
    const trace_bytes record =
        record_bytes(pTraceFile, ring_position(pTraceFile, uOffset), header.length);
    if (!trc_kind_has_own_base(header.function) ||
        !lies_inside(record, OWN_BASE, sizeof(cu_timeinfo)))
        return pTraceFile->timeInfo;
    return load<cu_timeinfo>(record, OWN_BASE);
}

} // namespace

int find_first_record(trace_file* pTraceFile) {
    ring_search search{pTraceFile, load_oldest_record_offset(pTraceFile->pHeader)};
    pTraceFile->pCurRec = ring_position(pTraceFile, search.uOffset);
    if (!search.stands_on_record())
        return give_up_at(search);
    trace_record_header header = search.header();
    stand_on(pTraceFile, header);

    while (is_passed_over(header)) {
        if (header.length < sizeof(trace_record_header)) {
            warn_record_length(pTraceFile, static_cast<uint32_t>(search.uOffset), header.length);
            return -1;
        }
        search.step(header.length);
        pTraceFile->pCurRec = ring_position(pTraceFile, search.uOffset);
        if (!search.stands_on_record())
            return give_up_at(search);
        if (search.is_back())
            return 0;
        if (search.has_gone_round())
            return give_up_at(search);
        header = search.header();
        stand_on(pTraceFile, header);
        cu_cvt_time_platform_1(header.timeStamp, &pTraceFile->timeInfo, &pTraceFile->modTime,
                               pTraceFile->uPlatform);
        pTraceFile->timeStampIsValid = 1;
    }
    return 0;
}

bool oldest_record_time(const trace_file* pTraceFile, cu_nanoseconds* pTime) {
    ring_search search{pTraceFile, load_oldest_record_offset(pTraceFile->pHeader)};
    while (search.stands_on_record() && !search.has_gone_round()) {
        const trace_record_header header = search.header();
        const bool bPassedOver = is_passed_over(header);
        if (!bPassedOver && trc_kind_is_output(header.function)) {
            *pTime = cu_time_ns(header.timeStamp, time_base(pTraceFile, search.uOffset, header));
            return true;
        }
        const bool bPassable = bPassedOver || trc_kind_is_valid(header.function);
        if (!bPassable || header.length < sizeof(trace_record_header))
            return false;
        search.step(header.length);
    }
    return false;
}
