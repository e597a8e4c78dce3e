#include "cleanup.h"

#include "kelvo.h"
#include "open.h"
#include "options.h"
#include "store.h"

#include <cstdlib>

std::atomic<bool> bReadersMayRun{false};

namespace {

/// The files themselves were closed by their readers.
void release_files() {
    while (anchor.pFirstFile != nullptr) {
        trace_file* const pTraceFile = anchor.pFirstFile;
        anchor.pFirstFile = pTraceFile->pNext;
        release_trace_file(pTraceFile);
    }
    anchor.iNumberFiles = 0;
}

void release_file_list() {
    delete[] Glbl_TrcFmtngProcCtrl.pTrcPreProcHdrList;
    Glbl_TrcFmtngProcCtrl.pTrcPreProcHdrList = nullptr;
    Glbl_TrcFmtngProcCtrl.uTrcPreProcHdrListLen = 0;
}

} // namespace

void cleanup(int bSigActive) {
    // The signal may have come in the middle of anything, the allocator included.
    if (bSigActive)
        return;
    if (!bReadersMayRun)
        release_files();
    release_template_path();
    free(anchor.pFormatBuffer);
    anchor.pFormatBuffer = nullptr;
    anchor.lenFormatBuffer = 0;
    free_template_info();
    free(anchor.pStartRecordOptArg);
    anchor.pStartRecordOptArg = nullptr;
    if (!bReadersMayRun)
        release_file_list();
}
