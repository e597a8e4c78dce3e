#include "run.h"

#include "cleanup.h"
#include "descriptors.h"
#include "file_starts.h"
#include "handover.h"
#include "insufficient.h"
#include "kelvo.h"
#include "merge.h"
#include "messages.h"
#include "mutex.h"
#include "opening.h"
#include "pool.h"
#include "print.h"
#include "progress.h"
#include "reader.h"
#include "record.h"
#include "record_batch.h"
#include "signals.h"
#include "stdout_stream.h"
#include "store.h"

#include <cstdio>
#include <cstdlib>
#include <new>

namespace {

TrcFmtngProcCtrl& ctrl = Glbl_TrcFmtngProcCtrl;

constexpr size_t PRELOAD_FROM_FILES = 50; // templates are read in advance from here on
constexpr int64_t LOW_MEMORY_PAUSE_US = 30'000'000;

// ------------------------------------------------------------ opening files

bool allocate_file_list(uint32_t total_files) {
    ctrl.pTrcPreProcHdrList = new (std::nothrow) TrcPreProcHdrElem[total_files]();
    if (ctrl.pTrcPreProcHdrList == nullptr || !reserve_merge_files(total_files))
        return false;
    ctrl.uTrcPreProcHdrListLen = total_files;
    total_tf_count = total_files;
    return true;
}

/// In follow mode readers run while files are still being opened, hence the lock.
void add_file(trace_file* pTraceFile, uint32_t fileIndex) {
    pTraceFile->index = static_cast<int>(fileIndex);
    pTraceFile->pNext = anchor.pFirstFile;
    anchor.pFirstFile = pTraceFile;
    const mutex_guard guard(ctrl.priorityQmutex);
    ++anchor.iNumberFiles;
}

/// Starts the reader of a file in follow mode. Returns 0 or -1.
int start_following(trace_file* pTraceFile) {
    const mutex_guard guard(ctrl.priorityQmutex);
    return start_tracefile_processing(pTraceFile, nullptr);
}

/// Opens one file argument and adds it to the run. Returns 0 or -1.
int open_file(const command_line& command, uint32_t fileIndex) {
    const auto total_files = static_cast<uint32_t>(command.files.size());
    TrcPreProcHdrElem elem{};
    trace_file* pTraceFile = nullptr;
    if (open_trace_file(command.files[fileIndex], &pTraceFile, &elem, command.bPrBaseProgName,
                        total_files, fileIndex) != 0) {
        if (!anchor.bFollow)
            kelvo_progress_status();
        return -1;
    }
    if (command.bPrBaseProgName)
        return 0;
    if (anchor.bFollow) {
        if (start_following(pTraceFile) != 0) {
            release_trace_file(pTraceFile);
            return -1;
        }
    } else {
        elem.pTrcFile = pTraceFile;
        ctrl.pTrcPreProcHdrList[anchor.iNumberFiles] = elem;
    }
    add_file(pTraceFile, fileIndex);
    return 0;
}

int open_files(const command_line& command) {
    int bError = 0;
    for (uint32_t fileIndex = 0; fileIndex < command.files.size(); ++fileIndex) {
        if (open_file(command, fileIndex) != 0)
            bError = 1;
        take_pending_signal();
    }
    return bError;
}

// ------------------------------------------------------------ normal mode

void print_sorted_files() {
    output_err_text("================================SORTED TRACE FILE LIST"
                    "===================================\n");
    for (int32_t i = 0; i < anchor.iNumberFiles; ++i) {
        const TrcPreProcHdrElem& elem = ctrl.pTrcPreProcHdrList[i];
        output_err_text("FileIndex: %03u\tTimeStamp: %020llu\tFileName: %s\n",
                        static_cast<unsigned int>(elem.pTrcFile->index),
                        static_cast<unsigned long long>(elem.header.timeStamp),
                        elem.pTrcFile->pName);
    }
    main_thread_sleep(LOW_MEMORY_PAUSE_US);
}

/// Arranges the files in time order and starts the reader of the first one.
void start_merging() {
    sort_files();
    if (memory_is_restricted)
        print_sorted_files();
    const mutex_guard guard(ctrl.priorityQmutex);
    TrcFileProcessingCtrl(nullptr, 0);
}

// ------------------------------------------------------------------ records

/// Prints the records, and lives through what else may happen between them.
class text_output final : public merge_listener {
public:
    void take_record(trace_queue_element* pElement) override {
        if (format_record(pElement) != 0)
            warn_insufficient_resources(pElement->pFile->pName, ctrl.queueDepth);
    }
    void between_records() override {
        write_handed_over_output();
        take_pending_signal();
    }
    void wait(int64_t iMicroseconds) override {
        if (anchor.bFollow && !stdout_is_empty())
            stdout_flush(); // whoever reads a pipe sees the records at once
        main_thread_sleep(iMicroseconds);
    }
};

// ------------------------------------------------------------ around the run

/// Minutes east of UTC, as the line names them.
void print_time_zone() {
    const int64_t iOffset = -static_cast<int64_t>(anchor.tz_offset);
    const int iHours = static_cast<int>(iOffset / 60);
    const int iMinutes = static_cast<int>(iOffset < 0 ? -iOffset % 60 : iOffset % 60);
    char zone[16];
    snprintf(zone, sizeof zone, iHours < 0 ? "UTC%02d:%02d" : "UTC+%02d:%02d", iHours, iMinutes);
    output_message("\t\t\t\t*** Formatting traces using TZ=%s ***\n", zone);
}

void print_totals() {
    if (const uint32_t uWarnings = insufficient_resources_warnings(); uWarnings != 0)
        output_err_text("Total insufficient memory warning messages: %u\n"
                        "Total insufficient memory warning messages during file open: %u\n",
                        uWarnings, insufficient_resources_warnings_during_open());
}

/// Everything between the start of the pool and the totals. Returns bError.
int process_files(const command_line& command) {
    if (command.preLoadTemplateFiles || command.files.size() >= PRELOAD_FROM_FILES)
        load_all_template_files();
    if (!allocate_file_list(static_cast<uint32_t>(command.files.size())))
        return 1;
    pool_task_main = thread_main;
    file_was_read = [] { kelvo_progress_status(); };
    if (startNewThreadPool() == -1)
        return 1;
    if (!anchor.bFollow)
        kelvo_progress_status();
    const int bError = open_files(command);
    if (command.bPrBaseProgName)
        return 0;
    if (!anchor.bFollow)
        start_merging();
    if (anchor.bHostTZ)
        print_time_zone();
    text_output output;
    merge_records(output);
    print_totals();
    if (!anchor.bFollow && bShowProgress)
        output_err_text("\n");
    return bError;
}

/// The end of every run that no signal ended.
int end_run(int bError) {
    bReadersMayRun = !endThrdPool();
    if (!bReadersMayRun) {
        release_merge_files();
        release_kept_blocks();
    }
    cleanup(0);
    return bError;
}

} // namespace

int run(const command_line& command) {
    trc_init_recursive_mutex(&ctrl.priorityQmutex);
    raise_descriptor_limit();
    anchor.threadId = pthread_self();

    // The jump point is set while signals are blocked, so that the mask saved
    // with it is the one under which a run that a signal ended is finished.
    if (change_signal_mask(SIG_BLOCK) != 0)
        return end_run(1);
    if (sigsetjmp(anchor.sigbuf, 1) != 0) {
        // Readers still run: their memory is left to the end of the process.
        let_second_signal_through();
        write_handed_over_output();
        return 0;
    }
    install_signal_handlers();
    if (change_signal_mask(SIG_UNBLOCK) != 0)
        return end_run(1);
    return end_run(process_files(command));
}
