#include "insufficient.h"
#include "mapping.h"
#include "messages.h"
#include "open.h"
#include "print.h"
#include "ring.h"

#include <cerrno>
#include <cstdlib>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

/// A trace file on the number of a standard stream that came closed would be
/// printed into. Returns a number above them for the same file, or -1 with errno.
int above_standard_descriptors(int fd) {
    if (fd < 0 || fd > STDERR_FILENO)
        return fd;
    const int higher = fcntl(fd, F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
    const int savedErrno = errno;
    close(fd);
    errno = savedErrno;
    return higher;
}

/// O_NONBLOCK and O_NOCTTY mean nothing to a regular file; they keep the open
/// of a terminal line or another device from waiting or taking it over.
int open_file(trace_file* pTraceFile) {
    pTraceFile->fd = above_standard_descriptors(
        open(pTraceFile->pName, O_RDWR | O_CLOEXEC | O_NONBLOCK | O_NOCTTY));
    if (pTraceFile->fd >= 0)
        return 0;
    output_sys_message("%s: 2625-102 Error opening file \"%s\",", errno, anchor.pProgName,
                       pTraceFile->pName);
    return -1;
}

int lock_file(const trace_file* pTraceFile) {
    struct flock whole_file {};
    whole_file.l_type = F_WRLCK;
    whole_file.l_whence = SEEK_SET;
    if (fcntl(pTraceFile->fd, F_SETLK, &whole_file) == 0)
        return 0;
    if (errno == EACCES || errno == EAGAIN)
        output_message("%s: 2625-161 Trace file \"%s\" is already in use.\n", anchor.pProgName,
                       pTraceFile->pName);
    else
        output_sys_message(
            "%s: 2625-162 Error returned from fcntl() attempting to lock trace file, ", errno,
            anchor.pProgName);
    return -1;
}

/// What is no regular file has no size and cannot be mapped: too small as well.
int get_size(const trace_file* pTraceFile, size_t* pSize) {
    struct stat status {};
    if (fstat(pTraceFile->fd, &status) != 0) {
        output_sys_message("%s: 2625-104 Error retrieving information about file \"%s\", ", errno,
                           anchor.pProgName, pTraceFile->pName);
        return -1;
    }
    *pSize = S_ISREG(status.st_mode) ? static_cast<size_t>(status.st_size) : 0;
    if (*pSize >= sizeof(trace_file_header))
        return 0;
    output_err_message("%s: 2625-105 File \"%s\" is too small to be a trace file.\n",
                       anchor.pProgName, pTraceFile->pName);
    return -1;
}

/// Maps all `uMappedSize` bytes, though no position beyond the low 32 bits of
/// the size is ever used: the header of a larger file lies inside in any case.
int map_file(trace_file* pTraceFile, size_t uMappedSize) {
    pTraceFile->uSize = static_cast<uint32_t>(uMappedSize);
    void* const pMapping =
        mmap(nullptr, uMappedSize, PROT_READ | PROT_WRITE, MAP_SHARED, pTraceFile->fd, 0);
    if (pMapping == MAP_FAILED) {
        if (errno == EACCES)
            output_message("%s: 2625-180 Either file permissions are too restrictive, or the "
                           "trace file must be copied outside of NFS to be used.\n ",
                           anchor.pProgName);
        else
            warn_insufficient_resources_during_open(pTraceFile->pName, pTraceFile->uSize);
        return -1;
    }
    pTraceFile->uMappedSize = uMappedSize;
    pTraceFile->pHeader = static_cast<trace_file_header*>(pMapping);
    pTraceFile->pMapEnd = ring_position(pTraceFile, pTraceFile->uSize);
    pTraceFile->pWrap = ring_position(pTraceFile, pTraceFile->pHeader->uOffset);
    return 0;
}

} // namespace

int open_lock_map_trace_file(trace_file* pTraceFile) {
    free(pTraceFile->pHeader);
    pTraceFile->pHeader = nullptr;

    size_t uMappedSize = 0;
    if (open_file(pTraceFile) != 0)
        return -1;
    if (!anchor.bNoFileLocking && lock_file(pTraceFile) != 0)
        return -1;
    if (get_size(pTraceFile, &uMappedSize) != 0)
        return -1;
    return map_file(pTraceFile, uMappedSize);
}

void unmap_trace_file(trace_file* pTraceFile) {
    munmap(pTraceFile->pHeader, pTraceFile->uMappedSize);
    pTraceFile->uMappedSize = 0;
    pTraceFile->pHeader = nullptr;
    pTraceFile->pMapEnd = nullptr;
    pTraceFile->pWrap = nullptr;
}
