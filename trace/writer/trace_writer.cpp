// The life of a trace file: making it, laying out its header and its empty
// ring, closing it.
#include "trace_writer.h"

#include "shared_words.h"

#include <algorithm>
#include <cerrno>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

/// A gap, and the shortest record or the last filler of an empty ring.
constexpr uint32_t MIN_AREA = 2 * TRC_MIN_RECORD;
/// The header fields that both sides of the protocol use end here.
constexpr uint32_t MIN_OFFSET = offsetof(trace_file_header, program);

constexpr int CLOSE_WAITS = 200;
constexpr useconds_t CLOSE_WAIT_US = 1000;

bool options_are_valid(const trace_writer_options& options) {
    const uint32_t uOffset = options.uOffset;
    return uOffset >= MIN_OFFSET && uOffset % 4 == 0 && options.uFileSize % 4 == 0 &&
           options.uFileSize >= sizeof(trace_file_header) && options.uFileSize >= uOffset &&
           options.uFileSize - uOffset >= MIN_AREA && options.uFirstSeqNumber % 2 == 0;
}

template <size_t N> void copy_text(char (&field)[N], std::string_view text) {
    std::copy_n(text.begin(), std::min(text.size(), N), field);
}

trace_file_header make_header(const trace_writer_options& options) {
    trace_file_header header{};
    header.uProperties = options.uProperties;
    header.uPlatform = options.uPlatform;
    header.uVersion = options.uVersion;
    header.uFlags = static_cast<uint16_t>(options.uFlags & ~TRC_FLAG_TAIL_ACK);
    header.uNodeNumber = options.uNodeNumber;
    header.uOffset = options.uOffset;
    header.uSeqLock = TRC_SEQ_NO_READER;
    header.timeInfo = options.timeInfo;
    header.machineId = options.machineId;
    header.uOldestRecordOffset = options.uOffset;
    header.uPid = options.uPid != 0 ? options.uPid : static_cast<uint32_t>(getpid());
    copy_text(header.program, options.program);
    copy_text(header.buildName, options.buildName);
    copy_text(header.baseProgName, options.baseProgName);
    header.uNode_ID = options.uNode_ID;
    header.sp_reuse_tm = options.sp_reuse_tm;
    header.sp_flags = options.sp_flags;
    header.tz_offset = options.tz_offset;
    return header;
}

/// Makes the empty file as long as it will be; not by sparse bytes if that can
/// be helped. Returns 0 or an errno value.
int set_size(int fd, const trace_writer_options& options) {
    rlimit limit{};
    if (getrlimit(RLIMIT_FSIZE, &limit) == 0 && options.uFileSize > limit.rlim_cur)
        return EFBIG; // the call itself would send SIGXFSZ
    if (ftruncate(fd, options.uFileSize) != 0)
        return errno;
    // In pieces: a call that a signal interrupts begins again.
    constexpr off_t PIECE = 8 << 20;
    for (off_t iAt = 0; options.bReserveSpace && iAt < options.uFileSize;) {
        const off_t iSize = std::min<off_t>(PIECE, options.uFileSize - iAt);
        const int error = posix_fallocate(fd, iAt, iSize);
        if (error == EOPNOTSUPP || error == EINVAL || error == ENOSYS)
            break; // the file system can do neither this nor what stands in for it
        if (error != 0 && error != EINTR)
            return error;
        iAt += error == 0 ? iSize : 0;
    }
    return 0;
}

} // namespace

trace_writer::~trace_writer() {
    close();
}

trace_writer_status trace_writer::create(const char* pPath, const trace_writer_options& options) {
    close();
    if (pPath == nullptr || !options_are_valid(options))
        return TRACE_WRITER_INVALID;
    const trace_writer_status status = make_file(pPath, options);
    if (status == TRACE_WRITER_OK) {
        lay_out_file(options);
        return status;
    }
    const int error = errno;
    if (fd >= 0) {
        ::close(fd);
        fd = -1;
        unlink(pPath);
    }
    errno = error;
    return status;
}

trace_writer_status trace_writer::make_file(const char* pPath,
                                            const trace_writer_options& options) {
    // A former file is replaced, never truncated: truncating would pull the
    // pages from under whoever has it mapped.
    if (unlink(pPath) != 0 && errno != ENOENT)
        return TRACE_WRITER_SYSTEM;
    fd = open(pPath, O_RDWR | O_CREAT | O_EXCL | O_CLOEXEC, options.uMode);
    if (fd < 0)
        return TRACE_WRITER_SYSTEM;
    if (const int error = set_size(fd, options); error != 0) {
        errno = error;
        return TRACE_WRITER_SYSTEM;
    }
    void* const pAddress =
        mmap(nullptr, options.uFileSize, PROT_READ | PROT_WRITE, MAP_SHARED, fd, 0);
    if (pAddress == MAP_FAILED)
        return TRACE_WRITER_SYSTEM;
    pMap = static_cast<std::byte*>(pAddress);
    uSize = options.uFileSize;
    return TRACE_WRITER_OK;
}

void trace_writer::lay_out_file(const trace_writer_options& options) {
    bAskLock = options.bForgetDeadReaders;
    bDamaged = false;
    uArea = options.uOffset;
    uWrite = uArea;
    uNextSeq = options.uFirstSeqNumber;
    uLastTime = options.timeInfo.timeinfo2;
    bHolding = false;
    uLastHeld = 0;
    uDropsDue = 0;
    uNextAsk = 0;
    totals = {};

    const trace_file_header header = make_header(options);
    std::memcpy(pMap, &header, std::min<size_t>(sizeof(header), uArea));
    bFirstFiller = true;
    uGapEnd = uSize - TRC_MIN_RECORD;
    store_filler(uGapEnd, TRC_MIN_RECORD);
    store_header_word(pMap + uGapEnd, WORD_SEQ_NUMBER, uNextSeq);
    store_filler(uWrite, uGapEnd - uWrite);
    // Only now is it a trace file to anybody who opens it.
    store_actual_file_size(file_header(), uSize);
}

void trace_writer::close() {
    if (pMap == nullptr)
        return;
    poll();
    for (int i = 0; bHolding && i < CLOSE_WAITS; ++i) {
        usleep(CLOSE_WAIT_US);
        poll();
    }
    if (bHolding)
        publish_held();
    acknowledge_tail_request(file_header());
    munmap(pMap, uSize);
    pMap = nullptr;
    uSize = 0;
    ::close(fd);
    fd = -1;
}

uint32_t trace_writer::max_record_length() const {
    return pMap == nullptr ? 0 : uSize - uArea - TRC_MIN_RECORD;
}
