#include "reader.h"

#include "exchange.h"
#include "file_starts.h"
#include "first_record.h"
#include "messages.h"
#include "mutex.h"
#include "open.h"
#include "reader_words.h"
#include "start.h"
#include "walk.h"

void (*file_was_read)() = nullptr;

namespace {

TrcFmtngProcCtrl& ctrl = Glbl_TrcFmtngProcCtrl;

constexpr int64_t MS = 1'000'000;
constexpr int64_t HANDSHAKE_WAIT_NS = 10 * MS;
constexpr int HANDSHAKE_WAITS = 5; // a writer that has ended answers no more
constexpr int64_t NUMBER_WAIT_NS = MS / 10;
constexpr int NUMBER_WAITS = 500; // a writer that was killed stores no number any more

/// In follow mode a file is looked at again after at most 100 milliseconds, and many
/// files at the same moments, so that a thread wakes up for all of them.
constexpr int64_t FOLLOW_WAIT_NS = 100 * MS;
constexpr int64_t FOLLOW_MOMENTS_NS = 20 * MS;

/// While somebody starts a row of files, under the lock that every step needs sooner
/// or later, no other step begins: it would only keep its thread.
constexpr int64_t START_WAIT_NS = MS;

/// A step ends after so many records in any case, so that others have their turn.
constexpr uint32_t MOST_IN_A_STEP = 65'536;

constexpr task_wish SUSPEND{task_wish::SUSPENDED};
constexpr task_wish END{task_wish::ENDED};

/// Diagnostic line of the low-memory mode.
void say(const char* pWhat, const trace_file* pTraceFile) {
    if (memory_is_restricted)
        output_err_text("%s: %s\n", pWhat, pTraceFile->pName);
}

/// One step of one reader.
class reader_step {
public:
    explicit reader_step(merge_file& file)
        : m_file(file), m_pTraceFile(file.pFile), m_state(file.reader), m_records(&file) {}

    task_wish run() {
        if (files_are_being_started() && m_state.phase != reader_phase::BEGINS)
            return {task_wish::LATER, pool_now() + START_WAIT_NS};
        switch (m_state.phase) {
        case reader_phase::BEGINS:
            return begin();
        case reader_phase::SHAKES:
            return shake_hands();
        case reader_phase::LOOKS:
        case reader_phase::READS:
            return read();
        case reader_phase::DRAINED:
            return close();
        }
        return END;
    }

private:
    task_wish begin();
    task_wish shake_hands();
    task_wish read();
    bool number_is_there();
    task_wish pause_until(int64_t iMoment);
    task_wish finish();
    task_wish close();

    merge_file& m_file;
    trace_file* const m_pTraceFile;
    reader_state& m_state;
    batch_writer m_records;
    uint32_t m_uRoom = 0; ///< records that may be read before the next push
};

task_wish reader_step::begin() {
    say("Processing", m_pTraceFile);
    request_tail(m_pTraceFile);
    m_state.phase = reader_phase::SHAKES;
    return {task_wish::LATER, pool_now() + HANDSHAKE_WAIT_NS};
}

/// Stands on the first record as soon as the writer leaves that where it is.
task_wish reader_step::shake_hands() {
    if (!tail_is_kept(m_pTraceFile) && ++m_state.iWaits < HANDSHAKE_WAITS)
        return {task_wish::LATER, pool_now() + HANDSHAKE_WAIT_NS};
    m_state.iWaits = 0;
    int iResult = find_first_record(m_pTraceFile);
    if (iResult == 0)
        iResult = set_file_start(m_pTraceFile);
    release_tail(m_pTraceFile);
    m_pTraceFile->recordNumber = 0;
    if (iResult != 0)
        return finish();
    m_state.phase = reader_phase::LOOKS;
    return read();
}

/// Whether the record's number is there, or will not come any more: the writer takes
/// a moment from making a record readable to storing it.
bool reader_step::number_is_there() {
    if (!number_has_come(m_pTraceFile, &m_state.header) && m_state.iWaits++ < NUMBER_WAITS)
        return false;
    m_state.iWaits = 0;
    return true;
}

task_wish reader_step::read() {
    m_uRoom = push_and_ask(m_file, {});
    if (m_uRoom == 0)
        return SUSPEND;
    walk_result here = WALK_RECORD;
    if (m_state.phase == reader_phase::LOOKS)
        here = is_last_record(m_pTraceFile, &m_state.header);
    m_state.phase = reader_phase::READS;
    uint32_t uRead = 0;
    while (here == WALK_RECORD && !m_pTraceFile->bDone) {
        if (trc_kind_is_output(m_state.header.function) &&
            (m_state.bPassed || start_is_reached(m_pTraceFile, m_state.header))) {
            m_state.bPassed = !number_is_there();
            if (m_state.bPassed)
                return pause_until(pool_now() + NUMBER_WAIT_NS);
            if (!m_records.add(m_state.header, &m_state.base))
                return finish();
        }
        here = step_and_judge(m_pTraceFile, &m_state.header);
        if (here != WALK_RECORD)
            break;
        if (m_records.count() >= m_uRoom || m_records.bytes() >= MAX_BATCH_BYTES) {
            m_uRoom = push_and_ask(m_file, m_records.take_over());
            if (m_uRoom == 0) {
                m_state.phase = reader_phase::LOOKS; // much may happen meanwhile
                tell_place_now(m_pTraceFile);
                return SUSPEND;
            }
        }
        if (++uRead == MOST_IN_A_STEP)
            return pause_until(0);
    }
    if (here != WALK_NO_RECORD || !anchor.bFollow || m_pTraceFile->bDone)
        return finish();
    m_state.phase = reader_phase::LOOKS;
    return pause_until((pool_now() + FOLLOW_WAIT_NS) / FOLLOW_MOMENTS_NS * FOLLOW_MOMENTS_NS);
}

/// Leaves the thread until the moment, with nothing kept back.
task_wish reader_step::pause_until(int64_t iMoment) {
    push_batches(m_file, m_records.take_over());
    tell_place_now(m_pTraceFile);
    return {task_wish::LATER, iMoment};
}

/// Nothing more is read. Until the file's last record is formatted the main thread
/// works with what closing it releases.
task_wish reader_step::finish() {
    {
        const mutex_guard guard(ctrl.priorityQmutex);
        push_batches(m_file, m_records.take_over());
        TrcFileProcessingCtrl(nullptr, m_pTraceFile->index2 + 1);
        m_state.phase = reader_phase::DRAINED;
        if (!stop_pushing(m_file))
            return SUSPEND;
    }
    return close();
}

task_wish reader_step::close() {
    if (!anchor.bFollow && file_was_read != nullptr) {
        const mutex_guard guard(ctrl.priorityQmutex);
        file_was_read();
    }
    close_trace_file(m_pTraceFile);
    say("Closed", m_pTraceFile);
    const mutex_guard guard(ctrl.priorityQmutex);
    file_stops_running(m_file);
    TrcFileProcessingCtrl(nullptr, m_pTraceFile->index2 + 1);
    m_pTraceFile->bDone = 1;
    return END;
}

} // namespace

task_wish thread_main(void* pTask) {
    return reader_step(*static_cast<merge_file*>(pTask)).run();
}
