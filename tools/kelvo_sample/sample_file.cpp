#include "sample_file.h"

#include <cerrno>
#include <cstdio>
#include <cstring>

namespace {

constexpr uint32_t MACHINE_ID = 0x5A170042;
constexpr uint64_t NODE_ID = 0x00C0FFEE5A170000;

const char* reason(trace_writer_status status, int error) {
    switch (status) {
    case TRACE_WRITER_SYSTEM:
        return strerror(error);
    case TRACE_WRITER_TOO_LONG:
        return "a record is longer than the file can hold; choose a larger --file-size";
    case TRACE_WRITER_DAMAGED:
        return "somebody else has overwritten it";
    default:
        return "no trace file can be made so";
    }
}

} // namespace

bool sample_file::open(const sample_options& options, const std::string& sName,
                       const sample_program& program, uint64_t uSize, const cu_timeinfo& clockBase,
                       const cu_timeinfo& headerBase) {
    name = sName;
    base = clockBase;
    uGiven = 0;
    failure = TRACE_WRITER_OK;

    trace_writer_options file;
    file.uFileSize = static_cast<uint32_t>(uSize);
    file.uProperties = static_cast<uint8_t>(TRC_PROP_LITTLE_ENDIAN |
                                            (options.uAddrBits == 64 ? TRC_PROP_ADDR_64 : 0));
    file.uNodeNumber = program.uNode;
    file.uNode_ID = NODE_ID + program.uNode;
    file.timeInfo = headerBase;
    file.machineId = MACHINE_ID;
    file.uPid = options.bLive ? 0 : program.uPid;
    file.program = program.path;
    file.buildName = "kelvo_sample";
    file.baseProgName = program.name;
    file.tz_offset = options.iMinutesWest;
    const std::string sPath = options.directory + "/" + name;
    const trace_writer_status status = writer.create(sPath.c_str(), file);
    if (status != TRACE_WRITER_OK)
        fprintf(stderr, "kelvo_sample: cannot make %s: %s\n", sPath.c_str(), reason(status, errno));
    return status == TRACE_WRITER_OK;
}

bool sample_file::close() {
    writer.close();
    counts = writer.counts();
    if (failure != TRACE_WRITER_OK)
        fprintf(stderr, "kelvo_sample: cannot write to %s: %s\n", name.c_str(),
                reason(failure, errno));
    return failure == TRACE_WRITER_OK;
}
