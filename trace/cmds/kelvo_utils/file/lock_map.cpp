#include "descriptors.h"
#include "identity.h"
#include "mapping.h"
#include "ring.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/mman.h>
#include <unistd.h>

namespace {

/// The status of an open file, or why there is none.
struct taken_status {
    file_status status;
    int iErrno; ///< 0: taken
};

/// Whether the file may be opened under this record. An accepted one has been seen
/// before. In follow mode the others of the run are open, and to close a second
/// descriptor of one of them would drop its lock.
open_outcome judge_identity(const trace_file* pTraceFile, const file_identity& identity) {
    if (pTraceFile->bAccepted)
        return is_same_file(identity, pTraceFile->identity) ? OPEN_OK : OPEN_REPLACED;
    return anchor.bFollow && find_accepted_file(identity) != nullptr ? OPEN_IN_USE : OPEN_OK;
}

/// Opens the file that is meant.
open_result open_file(trace_file* pTraceFile, taken_status* pTaken) {
    file_status* const pStatus = &pTaken->status;
    if ((anchor.bFollow || pTraceFile->bAccepted) && status_of_path(pTraceFile->pName, pStatus))
        if (const open_outcome eOutcome = judge_identity(pTraceFile, pStatus->identity))
            return {eOutcome};
    const int fd = open_descriptor(pTraceFile->pName, pTraceFile->bReadOnly ? O_RDONLY : O_RDWR);
    if (fd < 0)
        return {OPEN_REFUSED, errno};
    pTaken->iErrno = status_of_descriptor(fd, pStatus) ? 0 : errno;
    if (pTaken->iErrno == 0)
        if (const open_outcome eOutcome = judge_identity(pTraceFile, pStatus->identity))
            // Exchanged since it was looked at. It may be one that is being read under
            // another name, so the descriptor stays open to the end of the run.
            return {eOutcome};
    pTraceFile->fd = fd;
    return {};
}

open_result lock_file(const trace_file* pTraceFile) {
    struct flock whole_file {};
    whole_file.l_type = F_WRLCK;
    whole_file.l_whence = SEEK_SET;
    if (fcntl(pTraceFile->fd, F_SETLK, &whole_file) == 0)
        return {};
    const bool bHeld = errno == EACCES || errno == EAGAIN;
    return {bHeld ? OPEN_IN_USE : OPEN_LOCK_FAILED, errno};
}

/// Maps all bytes of the file, though no position beyond the low 32 bits of its size
/// is ever used: the header of a larger file lies inside in any case. Nothing reaches
/// a file that is only read: what is stored lands in private pages.
open_result map_file(trace_file* pTraceFile, uint64_t uFileSize) {
    const int iSharing = pTraceFile->bReadOnly ? MAP_PRIVATE | MAP_NORESERVE : MAP_SHARED;
    pTraceFile->uSize = static_cast<uint32_t>(uFileSize);
    void* const pMapping =
        mmap(nullptr, uFileSize, PROT_READ | PROT_WRITE, iSharing, pTraceFile->fd, 0);
    if (pMapping == MAP_FAILED && errno == EACCES)
        return {OPEN_NOT_MAPPABLE, errno};
    if (pMapping == MAP_FAILED)
        return {OPEN_NO_MEMORY, errno, pTraceFile->uSize};
    pTraceFile->uMappedSize = uFileSize;
    ring_map_over(pTraceFile, pMapping, uFileSize);
    return {};
}

open_result lock_and_map(trace_file* pTraceFile, const taken_status& taken) {
    if (!anchor.bNoFileLocking && !pTraceFile->bReadOnly)
        if (const open_result result = lock_file(pTraceFile); result.eOutcome != OPEN_OK)
            return result;
    if (taken.iErrno != 0)
        return {OPEN_NO_STATUS, taken.iErrno};
    // What is no regular file has no size and cannot be mapped: too small as well.
    if (!taken.status.bRegular || taken.status.uSize < sizeof(trace_file_header))
        return {OPEN_TOO_SMALL};
    pTraceFile->identity = taken.status.identity;
    return map_file(pTraceFile, taken.status.uSize);
}

void forget_mapping(trace_file* pTraceFile) {
    pTraceFile->uMappedSize = 0;
    pTraceFile->pHeader = nullptr;
    pTraceFile->pMapEnd = nullptr;
    pTraceFile->pWrap = nullptr;
}

} // namespace

open_result open_alone(trace_file* pTraceFile) {
    pTraceFile->fd = -1;
    taken_status taken{};
    open_result result = open_file(pTraceFile, &taken);
    if (result.eOutcome == OPEN_OK)
        result = lock_and_map(pTraceFile, taken);
    if (result.eOutcome != OPEN_OK)
        close_descriptor(pTraceFile);
    return result;
}

void unmap_trace_file(trace_file* pTraceFile) {
    if (pTraceFile->pMapEnd != nullptr)
        munmap(pTraceFile->pHeader, pTraceFile->uMappedSize);
    forget_mapping(pTraceFile);
}

void close_descriptor(trace_file* pTraceFile) {
    if (pTraceFile->fd >= 0)
        close(pTraceFile->fd);
    pTraceFile->fd = -1;
}

void share_open_file(trace_file* pTraceFile, const trace_file* pOther) {
    pTraceFile->fd = pOther->fd;
    pTraceFile->uSize = pOther->uSize;
    pTraceFile->uMappedSize = pOther->uMappedSize;
    pTraceFile->pHeader = pOther->pHeader;
    pTraceFile->pMapEnd = pOther->pMapEnd;
    pTraceFile->pWrap = pOther->pWrap;
}

void forget_open_file(trace_file* pTraceFile) {
    pTraceFile->fd = -1;
    forget_mapping(pTraceFile);
}
