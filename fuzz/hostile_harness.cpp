#include "hostile_harness.h"

#include "accept.h"
#include "first_record.h"
#include "reader_words.h"
#include "record.h"
#include "record_batch.h"
#include "record_copy.h"
#include "ring.h"
#include "shared_words.h"
#include "start.h"
#include "stdout_stream.h"
#include "store.h"
#include "summary.h"
#include "thread_state.h"
#include "walk.h"

#include <algorithm>
#include <clocale>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <memory>
#include <unistd.h>

// There when the program is built with a sanitizer.
extern "C" __attribute__((weak)) void __sanitizer_set_report_fd(void* pDescriptor);

namespace {

/// Standard error as it was when the process began.
const int fdReports = fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3);

char fileName[] = "hostile.trc";

// ------------------------------------------------------------------ the file

struct block_freer {
    void operator()(void* pBlock) const {
        free(pBlock);
    }
};
using byte_block = std::unique_ptr<std::byte, block_freer>;
using element_ptr = std::unique_ptr<trace_queue_element, block_freer>;

byte_block copy_of(trace_bytes bytes) {
    auto* const pBlock = static_cast<std::byte*>(malloc(bytes.size()));
    hostile_check(pBlock != nullptr, "memory lasts");
    memcpy(pBlock, bytes.data(), bytes.size());
    return byte_block(pBlock);
}

/// The checks and the summary of the opening. Returns whether it would succeed.
bool open_file(trace_file* pTraceFile, const trace_file_header& header) {
    pTraceFile->timeInfo = header.timeInfo;
    pTraceFile->uPlatform = header.uPlatform;
    if (!header_is_valid(header, pTraceFile->uSize) || !record_area_is_usable(pTraceFile))
        return false;
    TrcPreProcHdrElem element{};
    take_header(pTraceFile, header, &element);
    print_file_summary(fileName, header, 1);
    print_base_program_name(header);
    return true;
}

/// Nothing of the file may have changed but the two words of the reader.
void check_untouched(const std::byte* pBytes, trace_bytes original) {
    constexpr size_t FIRST = offsetof(trace_file_header, uSeqLock);
    constexpr size_t BEHIND = offsetof(trace_file_header, uTailReq) + sizeof(uint32_t);
    hostile_check(std::equal(original.begin(), original.begin() + FIRST, pBytes) &&
                      std::equal(original.begin() + BEHIND, original.end(), pBytes + BEHIND),
                  "nothing but uSeqLock and uTailReq is written to a trace file");
}

// ---------------------------------------------------------------- the output

/// What a run of the command begins with, as far as it is not set for good.
void reset_output(const hostile_options& options) {
    anchor.startOptions = options.startOptions;
    anchor.startSeconds = options.startSeconds;
    anchor.startNanoSeconds = options.startNanoSeconds;
    anchor.startRecords = options.startRecords;
    anchor.iNumberFiles = options.bManyFiles ? 2 : 1;
    memset(anchor.outputOptions, 0, sizeof(anchor.outputOptions));
    options.sLetters.copy(anchor.outputOptions, sizeof(anchor.outputOptions) - 1);
    anchor.curColumn = 0;
    anchor.firstChar = 0;
    anchor.outputFlags = 0;
    anchor.headerIndent = 0;
    anchor.currentIndent = 0;
    anchor.pCurFile = nullptr;
    anchor.pCurThread = nullptr;
    stdout_reset();
}

void check_between_records() {
    hostile_check(anchor.curColumn == 0 && anchor.firstChar == 0 && anchor.headerIndent == 0 &&
                      anchor.currentIndent == 0 && anchor.pCurFile == nullptr &&
                      (anchor.outputFlags & OUTPUT_START_PENDING) == 0,
                  "a record is closed once it is written");
}

void write_record(trace_queue_element* pElement, uint8_t uForms) {
    for (const uint8_t uForm : {FORM_TEMPLATE, FORM_RAW, FORM_BRIEF}) {
        if ((uForms & uForm) == 0)
            continue;
        anchor.bRaw = uForm == FORM_RAW;
        anchor.bBrief = uForm == FORM_BRIEF;
        hostile_check(format_record(pElement) == 0, "memory lasts");
        check_between_records();
    }
}

// -------------------------------------------------------------- the reading

struct reading {
    trace_file* pTraceFile;
    const hostile_options& options;
    hostile_result& result;
};

void take_record(reading& run, const trace_record_header& header) {
    trace_file* const pTraceFile = run.pTraceFile;
    const trace_bytes record = record_at_reader(pTraceFile, header);
    void* const pRoom = malloc(record.size() + QUEUE_ELEMENT_OVERHEAD);
    hostile_check(pRoom != nullptr, "memory lasts");
    const element_ptr pElement(copy_record(pTraceFile, header, record, pRoom));
    const uint32_t uLength = pElement->header.length;
    hostile_check(pElement->length == uLength + QUEUE_ELEMENT_OVERHEAD &&
                      uLength >= sizeof(trace_record_header) && uLength <= header.length &&
                      pElement->offset <= pTraceFile->uSize &&
                      uLength <= pTraceFile->uSize - pElement->offset,
                  "a queued record lies inside the file");
    (void)brought_time_base(pElement.get());
    write_record(pElement.get(), run.options.uForms);
    ++run.result.uWritten;
    if (run.options.onWritten)
        run.options.onWritten(*pElement);
}

/// Where a walk stands.
struct walk_state {
    trace_record_header* pCurRec;
    uint32_t uExpectedSeq;
    uint32_t uSeqLock;

    friend bool operator==(const walk_state&, const walk_state&) = default;
};

walk_state state_of(const trace_file* pTraceFile) {
    return {pTraceFile->pCurRec, pTraceFile->uExpectedSeq, pTraceFile->pHeader->uSeqLock};
}

/// The step as the reader makes it, held against that by the plain operations.
walk_result step(trace_file* pTraceFile, trace_record_header* pHeader) {
    const walk_state before = state_of(pTraceFile);
    trace_record_header plainHeader;
    walk_result plain = get_next_record(pTraceFile);
    if (plain == WALK_RECORD)
        plain = is_last_record(pTraceFile, &plainHeader);
    const walk_state behind = state_of(pTraceFile);

    pTraceFile->pCurRec = before.pCurRec;
    pTraceFile->uExpectedSeq = before.uExpectedSeq;
    const walk_result result = step_and_judge(pTraceFile, pHeader);
    hostile_check(result == plain && state_of(pTraceFile) == behind,
                  "both ways of stepping lead to the same place");
    return result;
}

bool is_taken(const reading& run, const trace_record_header& header) {
    return trc_kind_is_output(header.function)
               ? start_is_reached(run.pTraceFile, header)
               : run.options.bEveryKind && header.function != TRC_FUNC_FILLER;
}

hostile_end walk(reading& run) {
    trace_file* const pTraceFile = run.pTraceFile;
    // What is left of the first turn, and one more when the number at the oldest
    // position happens to be the next one.
    uint64_t uStepsLeft = 2 * (ring_size(pTraceFile) / sizeof(trace_record_header)) + 2;
    trace_record_header header;
    walk_result here = is_last_record(pTraceFile, &header);
    while (here == WALK_RECORD) {
        hostile_check(uStepsLeft-- > 0, "the walk ends");
        if (is_taken(run, header)) {
            (void)number_has_come(pTraceFile, &header);
            take_record(run, header);
        }
        here = step(pTraceFile, &header);
    }
    if (here == WALK_CORRUPT)
        return hostile_end::CORRUPT;
    hostile_check(is_last_record(pTraceFile, &header) == WALK_NO_RECORD,
                  "a file at rest has no more records when it is asked again");
    return hostile_end::NO_MORE;
}

/// What a reader task does, without the waits of the handshake.
hostile_end read_file(reading& run) {
    trace_file* const pTraceFile = run.pTraceFile;
    store_tail_request(pTraceFile->pHeader, TRC_TAIL_REQUESTED);
    int iResult = find_first_record(pTraceFile);
    if (iResult == 0)
        iResult = set_file_start(pTraceFile);
    release_tail(pTraceFile);
    pTraceFile->recordNumber = 0;
    return iResult == 0 ? walk(run) : hostile_end::CORRUPT;
}

void check_star(const format_entry& entry, const conv_spec& conv, uint8_t uOffset, uint8_t parmNum,
                const char* pWhat) {
    constexpr uint8_t NO_PARM = 255;
    const bool bNone = uOffset == 0 && parmNum == NO_PARM;
    hostile_check(bNone || (uOffset > 0 && uOffset < conv.lenConv && parmNum < entry.numParms &&
                            entry.pString[conv.offset + uOffset] == '*'),
                  pWhat);
}

} // namespace

void set_up_hostile_runs() {
    setlocale(LC_ALL, "C");
    setenv("TZ", "UTC0", 1);
    tzset();
    static char program[] = "kelvo";
    static char templatePath[] = KELVO_FUZZ_TEMPLATES;
    anchor.pProgName = program;
    anchor.pTemplatePath = templatePath;
    load_all_template_files();
    int insufficient_resources = 0;
    hostile_check(get_format_from_file(nullptr, "_FUZ", 1, -1, &insufficient_resources) != nullptr,
                  "the templates in " KELVO_FUZZ_TEMPLATES " are read");
}

void hostile_check(bool bHolds, const char* pWhat) {
    if (bHolds)
        return;
    dprintf(fdReports, "hostile input: this does not hold: %s\n", pWhat);
    abort();
}

redirected_output::redirected_output(int fdOut)
    : m_fdOut(fcntl(STDOUT_FILENO, F_DUPFD_CLOEXEC, 3)),
      m_fdErr(fcntl(STDERR_FILENO, F_DUPFD_CLOEXEC, 3)) {
    fflush(stdout);
    const int fdNull = open("/dev/null", O_WRONLY | O_CLOEXEC);
    dup2(fdOut >= 0 ? fdOut : fdNull, STDOUT_FILENO);
    dup2(fdNull, STDERR_FILENO);
    close(fdNull);
    if (__sanitizer_set_report_fd != nullptr)
        __sanitizer_set_report_fd(reinterpret_cast<void*>(intptr_t{fdReports}));
}

redirected_output::~redirected_output() {
    fflush(stdout);
    dup2(m_fdOut, STDOUT_FILENO);
    dup2(m_fdErr, STDERR_FILENO);
    close(m_fdOut);
    close(m_fdErr);
}

hostile_result read_hostile_file(trace_bytes bytes, const hostile_options& options) {
    hostile_result result;
    reset_output(options);
    if (bytes.size() < sizeof(trace_file_header))
        return result;
    const byte_block pBytes = copy_of(bytes);
    trace_file file{};
    file.pName = fileName;
    file.fd = -1;
    ring_map_over(&file, pBytes.get(), bytes.size());
    const auto header = load<trace_file_header>(bytes, 0);
    file.addrMode64 = (header.uProperties & TRC_PROP_ADDR_64) != 0;
    result.bAccepted = open_file(&file, header);
    stdout_reset(); // the summary goes no further

    reading run{&file, options, result};
    result.end = read_file(run);
    free_thread_info(&file);
    check_untouched(pBytes.get(), bytes);
    return result;
}

void check_format(const format_entry& entry) {
    hostile_check(entry.numParms >= 0 && entry.numParms <= MAX_PARMS && entry.numConvs >= 0 &&
                      entry.numConvs <= MAX_PARMS,
                  "a format has at most 128 parameters and conversions");
    for (int i = 0; i < entry.numParms; ++i) {
        const parm_type_t base = entry.pParmTypes[i] & PARM_BASE_MASK;
        hostile_check(entry.pParmTypes[i] != PARM_UNREFERENCED && base >= PARM_CHAR &&
                          base <= PARM_TRACE_ID,
                      "every parameter has a type");
    }
    const size_t uLength = strlen(entry.pString);
    size_t uFree = 0;
    for (int i = 0; i < entry.numConvs; ++i) {
        const conv_spec& conv = entry.pConvSpecs[i];
        hostile_check(conv.offset >= uFree && conv.lenConv >= 2 &&
                          size_t{conv.offset} + conv.lenConv <= uLength &&
                          entry.pString[conv.offset] == '%',
                      "conversions lie in order inside their string");
        uFree = size_t{conv.offset} + conv.lenConv;
        hostile_check(conv.parmNum < entry.numParms, "a conversion has a parameter");
        check_star(entry, conv, conv.widthOffset, conv.widthParmNum, "a '*' width has a parameter");
        check_star(entry, conv, conv.precOffset, conv.precParmNum,
                   "a '*' precision has a parameter");
    }
}
