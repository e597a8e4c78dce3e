#include "identity.h"

#include <fcntl.h>
#include <iterator>
#include <new>
#include <sys/stat.h>

namespace {

bool get_status(int fd, const char* pName, int flags, file_status* pStatus) {
    struct statx status {};
    if (statx(fd, pName, flags, STATX_BASIC_STATS | STATX_BTIME, &status) != 0)
        return false;
    pStatus->identity = {uint64_t{status.stx_dev_major} << 32 | status.stx_dev_minor,
                         status.stx_ino, 0, 0};
    if ((status.stx_mask & STATX_BTIME) != 0) {
        pStatus->identity.iBornSeconds = status.stx_btime.tv_sec;
        pStatus->identity.uBornNanoSeconds = status.stx_btime.tv_nsec;
    }
    pStatus->uSize = status.stx_size;
    pStatus->bRegular = S_ISREG(status.stx_mode);
    return true;
}

// Chains of files whose identities hash alike, linked by pNextInTable. The table
// grows with the files; where memory for that is lacking the chains get longer.
trace_file* firstChains[64];
trace_file** ppChains = firstChains;
size_t uChains = std::size(firstChains); // a power of two
size_t uFiles = 0;

trace_file** chain_of(const file_identity& identity) {
    uint64_t uHash = (identity.uInode ^ identity.uDevice << 40) * 0x9E37'79B9'7F4A'7C15U;
    uHash ^= uHash >> 32;
    return &ppChains[uHash & (uChains - 1)];
}

void put_in_chain(trace_file* pTraceFile) {
    trace_file** const ppChain = chain_of(pTraceFile->identity);
    pTraceFile->pNextInTable = *ppChain;
    *ppChain = pTraceFile;
}

void free_table() {
    if (ppChains != firstChains)
        delete[] ppChains;
    ppChains = firstChains;
    uChains = std::size(firstChains);
}

void grow_table() {
    const size_t uLarger = 4 * uChains;
    auto** const ppLarger = new (std::nothrow) trace_file*[uLarger]();
    if (ppLarger == nullptr)
        return;
    trace_file** const ppOld = ppChains;
    const size_t uOld = uChains;
    ppChains = ppLarger;
    uChains = uLarger;
    for (size_t i = 0; i < uOld; ++i)
        while (trace_file* const pTraceFile = ppOld[i]) {
            ppOld[i] = pTraceFile->pNextInTable;
            put_in_chain(pTraceFile);
        }
    if (ppOld != firstChains)
        delete[] ppOld;
}

} // namespace

bool is_same_file(const file_identity& a, const file_identity& b) {
    const bool bBirthsKnown = a.iBornSeconds != 0 && b.iBornSeconds != 0;
    return a.uDevice == b.uDevice && a.uInode == b.uInode &&
           (!bBirthsKnown ||
            (a.iBornSeconds == b.iBornSeconds && a.uBornNanoSeconds == b.uBornNanoSeconds));
}

bool status_of_path(const char* pName, file_status* pStatus) {
    return get_status(AT_FDCWD, pName, 0, pStatus);
}

bool status_of_descriptor(int fd, file_status* pStatus) {
    return get_status(fd, "", AT_EMPTY_PATH, pStatus);
}

trace_file* find_accepted_file(const file_identity& identity) {
    trace_file* pTraceFile = *chain_of(identity);
    while (pTraceFile != nullptr && !is_same_file(pTraceFile->identity, identity))
        pTraceFile = pTraceFile->pNextInTable;
    return pTraceFile;
}

void enter_accepted_file(trace_file* pTraceFile) {
    if (++uFiles > uChains)
        grow_table();
    put_in_chain(pTraceFile);
}

void forget_accepted_file(trace_file* pTraceFile) {
    trace_file** ppLink = chain_of(pTraceFile->identity);
    while (*ppLink != nullptr && *ppLink != pTraceFile)
        ppLink = &(*ppLink)->pNextInTable;
    if (*ppLink == nullptr)
        return;
    *ppLink = pTraceFile->pNextInTable;
    if (--uFiles == 0)
        free_table();
}
