#include "service.h"

const program_part PARTS[PROGRAMS] = {
    {"gateway", "_GWY", {"/usr/sbin/gatewayd", "gatewayd", 2211, 1}},
    {"orders", "_ORD", {"/usr/sbin/orderd", "orderd", 3207, 1}},
    {"storage", "_STO", {"/usr/sbin/storaged", "storaged", 1406, 1}},
};

bool service::is_over() const {
    if (bEnd || options.uRecords == 0)
        return bEnd;
    for (const sample_file* const pFile : files)
        if (pFile != nullptr && pFile->uGiven < options.uRecords)
            return false;
    return true;
}

bool service::take_turn(service_program program, uint32_t uDelay, uint64_t* pTime) {
    uNow += uint64_t{uDelay} * 1000 + random.below(1000);
    const sample_file* const pFile = files[program];
    if (bEnd || pFile == nullptr || (options.uRecords != 0 && pFile->uGiven >= options.uRecords))
        return false;
    *pTime = uNow;
    if (pLive != nullptr && !pLive->next(pTime))
        bEnd = true;
    uNow = *pTime;
    return !bEnd;
}

cu_timeinfo voice::time_base() const {
    const sample_file* const pFile = theService.file(program);
    return pFile != nullptr ? pFile->base : cu_timeinfo{};
}

void voice::id(uint32_t uDelay, uint32_t traceId) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) { return w.append_id(o, traceId); });
}

void voice::text(uint32_t uDelay, std::string_view text) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) { return w.append_string(o, text); });
}

void voice::int32(uint32_t uDelay, uint32_t traceId, int32_t value) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_int32(o, traceId, value);
    });
}

void voice::int32_2(uint32_t uDelay, uint32_t traceId, int32_t value1, int32_t value2) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_int32_2(o, traceId, value1, value2);
    });
}

void voice::uint32(uint32_t uDelay, uint32_t traceId, uint32_t value) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_uint32(o, traceId, value);
    });
}

void voice::uint32_2(uint32_t uDelay, uint32_t traceId, uint32_t value1, uint32_t value2) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_uint32_2(o, traceId, value1, value2);
    });
}

void voice::int64(uint32_t uDelay, uint32_t traceId, int64_t value) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_int64(o, traceId, value);
    });
}

void voice::int64_2(uint32_t uDelay, uint32_t traceId, int64_t value1, int64_t value2) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_int64_2(o, traceId, value1, value2);
    });
}

void voice::uint64(uint32_t uDelay, uint32_t traceId, uint64_t value) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_uint64(o, traceId, value);
    });
}

void voice::uint64_2(uint32_t uDelay, uint32_t traceId, uint64_t value1, uint64_t value2) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_uint64_2(o, traceId, value1, value2);
    });
}

void voice::values(uint32_t uDelay, uint32_t traceId,
                   std::initializer_list<uint32_t> values) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_values(o, traceId, values);
    });
}

void voice::values64(uint32_t uDelay, uint32_t traceId,
                     std::initializer_list<uint64_t> values) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_values64(o, traceId, values);
    });
}

void voice::strings(uint32_t uDelay, uint32_t traceId,
                    std::initializer_list<std::string_view> strings) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_strings(o, traceId, strings);
    });
}

void voice::data(uint32_t uDelay, uint32_t traceId,
                 std::initializer_list<sample_bytes> blocks) const {
    std::vector<trace_bytes> bytes;
    for (const sample_bytes& oneBlock : blocks)
        bytes.push_back(oneBlock.bytes());
    write(uDelay,
          [&](trace_writer& w, const trace_origin& o) { return w.append_data(o, traceId, bytes); });
}

void voice::error(uint32_t uDelay, const trace_error_content& error) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) { return w.append_error(o, error); });
}

void voice::start(uint32_t uDelay) const {
    write(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_start(o, 0, PARTS[program].program.uPid, time_base());
    });
}

void voice::restart(uint32_t uDelay, std::string_view why) const {
    write_internal(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_restart(o, 1, PARTS[program].program.uPid, time_base(), why);
    });
}

void voice::time_calibration(uint32_t uDelay) const {
    write_internal(uDelay, [&](trace_writer& w, const trace_origin& o) {
        return w.append_time_calibration(o, time_base());
    });
}

void voice::discarded(uint32_t uDelay) const {
    write_internal(uDelay,
                   [&](trace_writer& w, const trace_origin& o) { return w.append_discarded(o); });
}
