// The writing side of trace files: creates a file, appends records to its ring
// and keeps the writer's half of the protocol with a reader that may have the
// file mapped at the same time.
//
// A trace_writer belongs to one thread at a time; callers with several threads
// put a lock around it. No function throws; no append makes a system call
// except to ask, now and then, whether a reader that holds it up still lives.
//
// THE RING. The record area is tiled without holes: records and fillers lie
// back to back, and one of them ends exactly at the end of the file. At
// uOldestRecordOffset, between the newest record and the oldest one, stands the
// gap: a filler (function 0, seqNumber 0xFFF) of at least 28 bytes. A record is
// written at the start of the gap, and a shortened gap stands behind it. When
// the gap is too short the oldest records are given up, that is, swallowed by
// it. A record that does not fit before the end of the file goes to the start
// of the area, and the gap that was too short stays behind as a filler.
// Records are multiples of 4 bytes, so every header word is aligned; record
// numbers are even and rise by 2, so none is ever 0xFFF or 0xFFFFFFFF. While
// there is no record at all, a last filler carries the number of the first
// record to come: a reader that arrives then waits for the right number.
//
// THE PROTOCOL, the writer's half. A reader walks without locks, and one that
// has caught up stands on the gap. It takes what stands there for a new record
// when uOldestRecordOffset has moved on, or when seqNumber is its uSeqLock.
// 1. An append stores, in this order: the shortened gap behind the record; the
//    body; compId, threadId and timeStamp; length; function; then
//    uOldestRecordOffset; last seqNumber. Each is one aligned store, and
//    everything before uOldestRecordOffset is visible to whoever sees its new
//    value. In between the header at the old gap is a mixture of filler and
//    record, of which every one passes for sound: both compIds are printable,
//    both lengths are at least 28, both functions valid. seqNumber comes after
//    uOldestRecordOffset, for a reader that stepped past the record before the
//    end of the ring had moved would run over the gap into the oldest records.
//    A reader must therefore load uOldestRecordOffset before the header that it
//    judges, and seqNumber before the rest of that header.
// 2. uSeqLock is the number of the record that the reader stands on; what it
//    has passed has lower numbers. With a reader (uSeqLock is not 0xFFFFFFFF)
//    only records with lower numbers are given up, and a filler only when the
//    record that follows it has a lower number, since passing a filler leaves
//    no trace in uSeqLock. If that does not make room, the new record is
//    dropped and counted, and a record of kind 0xFFFE, numbered like any other,
//    takes the place of all that were dropped once there is room again.
// 3. While uTailReq is raised the reader looks for its first record, from the
//    gap on, and has no place yet. The writer sets bit 15 of uFlags, gives up
//    nothing and leaves uOldestRecordOffset alone. What is appended meanwhile
//    is held: the gap keeps its place with 28 bytes, behind it grows a chain
//    of records of function 0xFFFF, which the search skips, as far as the gap
//    reaches; what has no room is dropped. When uTailReq is lowered, bit 15 is
//    cleared, the held records get their functions and numbers, and
//    uOldestRecordOffset moves behind them, all with the next append or poll.
// 4. A reader that died leaves uSeqLock and uTailReq as they were. When it
//    stands in the way, the writer asks, at most every 10 milliseconds, whether
//    another process still holds a lock on the file, and if none does resets
//    both words. (A lock of the own process does not show: see
//    bForgetDeadReaders.)
// 5. A closed file has bit 15 set, so a reader's wait is short. A file whose
//    writer was killed at any point is a sound ring too.
//
// THE SPACE. A store into a mapped page for which the disk has no room ends the
// process with SIGBUS. So create takes all space of the file at once, and when
// the disk (or a quota, or the process's limit of file sizes) does not allow it,
// create fails with TRACE_WRITER_SYSTEM and errno ENOSPC, EDQUOT or EFBIG, and
// leaves no file: the program goes on untraced. A file of that name is gone by
// then; its space may be what the new one needs. Where the file system cannot
// reserve, each block is written once; where even that is refused, and with
// bReserveSpace false, the file is sparse and the risk stays. A file system that
// writes every change to a new place (copy on write) may break the reservation.
#pragma once

#include "trace_clock.h"
#include "trace_file_fmt.h"
#include "trace_load.h"

#include <initializer_list>
#include <span>
#include <string_view>

/// What the functions of a trace_writer return. Negative: nothing was written,
/// and nothing is counted as dropped.
enum trace_writer_status : int {
    TRACE_WRITER_OK = 0,
    TRACE_WRITER_DROPPED = 1,   ///< a reader left no room: the record is lost, and counted
    TRACE_WRITER_INVALID = -1,  ///< an argument or option that no trace file can hold, or no file
    TRACE_WRITER_TOO_LONG = -2, ///< the record is longer than max_record_length()
    TRACE_WRITER_SYSTEM = -3,   ///< a system call failed; errno says why
    TRACE_WRITER_DAMAGED = -4,  ///< somebody else has overwritten the ring
};

/// How a file is made. The fields of the file header keep their names; texts
/// longer than their field are cut.
struct trace_writer_options {
    uint32_t uFileSize = 1024 * 1024; ///< bytes, multiple of 4; the area needs 56 at least
    uint8_t uProperties = TRC_PROP_LITTLE_ENDIAN | TRC_PROP_ADDR_64;
    uint8_t uPlatform = 2;
    uint16_t uVersion = TRC_MAX_VERSION;
    uint16_t uFlags = 0; ///< the acknowledge bit is the writer's and is ignored here
    uint16_t uNodeNumber = 0;
    uint32_t uOffset =
        MIN_HDR_SIZE_FOR_TZ;    ///< 52 or more, multiple of 4; fields beyond are left out
    cu_timeinfo timeInfo{0, 0}; ///< default: raw stamps are nanoseconds since the epoch
    uint32_t machineId = 0;
    uint32_t uPid = 0; ///< 0: the calling process
    std::string_view program = "traced";
    std::string_view buildName = "kelvo";
    std::string_view baseProgName = "traced";
    uint64_t uNode_ID = 0;
    uint32_t sp_reuse_tm = 0;
    uint8_t sp_flags = 0;
    int32_t tz_offset = TRC_TZ_NOT_RECORDED; ///< minutes west of UTC

    uint32_t uFirstSeqNumber = 2;   ///< number of the first record; even
    unsigned uMode = 0644;          ///< permissions of the new file, before the umask
    bool bReserveSpace = true;      ///< take the file's space from the disk now; see THE SPACE
    bool bForgetDeadReaders = true; ///< false when the reader is a thread of this process
};

/// Where and when a record was written. compId: four characters, printable for
/// kinds with TRC_KIND_COMPONENT. timeStamp is raw, in the file's time base.
struct trace_origin {
    std::string_view compId;
    uint32_t threadId = 0;
    uint64_t timeStamp = 0;
};

/// The origin of a record of the calling thread, now; the file's timeInfo is
/// that of trace_time_base(). With several threads call it under their lock, so
/// that the times of the file rise.
inline trace_origin trace_here(std::string_view compId) {
    return {compId, trace_thread_id(), trace_now()};
}

/// The content of an error record. Texts with a null data() are absent;
/// funcName and fileName are always written. Arguments of type
/// CU_ERROR_ARG_CHAR_STR hold a string in memory, which may be null (written as
/// offset 0).
struct trace_error_content {
    uint32_t traceId = 0;
    uint32_t errorId = 0;
    uint32_t lineNumber = 0;
    std::string_view funcName;
    std::string_view fileName;
    std::string_view ffdcId;
    uint32_t msgSetNumber = 0;
    uint32_t msgNumber = 0;
    std::string_view msgCatName;
    std::string_view defMsg;
    std::span<const cu_error_arg_t> args;
};

/// The bytes of a record behind its header.
template <class RECORD> trace_bytes trace_body_of(const RECORD& record) {
    return std::as_bytes(std::span(&record, 1)).subspan(sizeof(trace_record_header));
}

/// What a writer has done so far.
struct trace_writer_counts {
    uint64_t uAppended = 0; ///< records written, those of kind 0xFFFE included
    uint64_t uGivenUp = 0;  ///< of these, oldest records overwritten since
    uint64_t uDropped = 0;  ///< records lost because a reader left no room
    uint64_t uDiscards = 0; ///< records of kind 0xFFFE written
    uint64_t uHeld = 0;     ///< records that wait for uTailReq to be lowered; not yet appended
};

/// One trace file that is being written. Starts without a file; the destructor
/// closes.
class trace_writer {
public:
    trace_writer() = default;
    ~trace_writer();
    trace_writer(const trace_writer&) = delete;
    trace_writer& operator=(const trace_writer&) = delete;

    /// Makes the file, empty of records, in place of any file of that name (a
    /// reader of the former file keeps it). Closes what was open before.
    trace_writer_status create(const char* pPath, const trace_writer_options& options = {});

    /// Closes the file and sets its acknowledge bit. Held records are
    /// published; a reader that is looking for its first record is given up to
    /// 200 milliseconds to finish.
    void close();

    bool is_open() const {
        return pMap != nullptr;
    }

    /// Answers a waiting reader, publishes held records and writes the record
    /// of kind 0xFFFE that is due, without appending anything. For a writer
    /// that may be idle while a reader comes: call it every few milliseconds.
    trace_writer_status poll();

    // Appends, one per kind. All return TRACE_WRITER_OK, TRACE_WRITER_DROPPED
    // or a negative status.

    /// Any kind from its body: the bytes that follow the record header.
    /// `function` must be a kind with TRC_KIND_VALID, and no filler.
    trace_writer_status append(uint16_t function, const trace_origin& origin, trace_bytes body);
    /// The same, the body being the concatenation of `parts`.
    trace_writer_status append(uint16_t function, const trace_origin& origin,
                               std::initializer_list<trace_bytes> parts);

    trace_writer_status append_id(const trace_origin& origin, uint32_t traceId) {
        return append_fields<trace_record_id>(TRC_FUNC_ID, origin, traceId);
    }
    trace_writer_status append_int32(const trace_origin& origin, uint32_t traceId, int32_t value) {
        return append_fields<trace_record_int32>(TRC_FUNC_INT32, origin, traceId, value);
    }
    trace_writer_status append_int32_2(const trace_origin& origin, uint32_t traceId, int32_t value1,
                                       int32_t value2) {
        return append_fields<trace_record_int32_2>(TRC_FUNC_INT32_2, origin, traceId, value1,
                                                   value2);
    }
    trace_writer_status append_uint32(const trace_origin& origin, uint32_t traceId,
                                      uint32_t value) {
        return append_fields<trace_record_uint32>(TRC_FUNC_UINT32, origin, traceId, value);
    }
    trace_writer_status append_uint32_2(const trace_origin& origin, uint32_t traceId,
                                        uint32_t value1, uint32_t value2) {
        return append_fields<trace_record_uint32_2>(TRC_FUNC_UINT32_2, origin, traceId, value1,
                                                    value2);
    }
    trace_writer_status append_int64(const trace_origin& origin, uint32_t traceId, int64_t value) {
        return append_fields<trace_record_int64>(TRC_FUNC_INT64, origin, traceId, value);
    }
    trace_writer_status append_int64_2(const trace_origin& origin, uint32_t traceId, int64_t value1,
                                       int64_t value2) {
        return append_fields<trace_record_int64_2>(TRC_FUNC_INT64_2, origin, traceId, value1,
                                                   value2);
    }
    trace_writer_status append_uint64(const trace_origin& origin, uint32_t traceId,
                                      uint64_t value) {
        return append_fields<trace_record_uint64>(TRC_FUNC_UINT64, origin, traceId, value);
    }
    trace_writer_status append_uint64_2(const trace_origin& origin, uint32_t traceId,
                                        uint64_t value1, uint64_t value2) {
        return append_fields<trace_record_uint64_2>(TRC_FUNC_UINT64_2, origin, traceId, value1,
                                                    value2);
    }
    trace_writer_status append_start(const trace_origin& origin, uint32_t traceId, uint32_t pid,
                                     const cu_timeinfo& timeInfo) {
        return append_fields<trace_record_start>(TRC_FUNC_START, origin, traceId, pid, timeInfo);
    }
    trace_writer_status append_time_calibration(const trace_origin& origin,
                                                const cu_timeinfo& reBase) {
        return append_fields<time_calibration>(TRC_FUNC_TIME_CALIBRATION, origin, reBase);
    }
    trace_writer_status append_discarded(const trace_origin& origin) {
        return append(TRC_FUNC_DISCARDED, origin, trace_bytes());
    }

    /// The text is written up to its first NUL, and a NUL added.
    trace_writer_status append_string(const trace_origin& origin, std::string_view text);
    trace_writer_status append_data(const trace_origin& origin, uint32_t traceId,
                                    std::span<const trace_bytes> blocks);
    trace_writer_status append_values(const trace_origin& origin, uint32_t traceId,
                                      std::span<const uint32_t> values);
    trace_writer_status append_values64(const trace_origin& origin, uint32_t traceId,
                                        std::span<const uint64_t> values);
    trace_writer_status append_error(const trace_origin& origin, const trace_error_content& error);
    trace_writer_status append_strings(const trace_origin& origin, uint32_t traceId,
                                       std::span<const std::string_view> strings);
    trace_writer_status append_restart(const trace_origin& origin, uint32_t traceId, uint32_t pid,
                                       const cu_timeinfo& timeInfo, std::string_view text);

    /// Longest record, header included, that the area can take.
    uint32_t max_record_length() const;

    const trace_writer_counts& counts() const {
        return totals;
    }

    /// Number that the next record gets.
    uint32_t next_seq_number() const {
        return uNextSeq;
    }

    /// The whole mapped file, for tests and for a reader in the same process.
    /// Valid until close.
    std::span<std::byte> mapping() {
        return {pMap, uSize};
    }

private:
    /// Where a record is going: made by begin, finished by commit.
    struct open_record {
        trace_record_header header{};
        uint32_t uAt = 0;     ///< offset of the record
        uint32_t uOldest = 0; ///< where the gap stands afterwards
        uint32_t uGapEnd = 0; ///< and where it ends
    };
    /// What a record costs: how far the gap has to swallow the oldest records.
    struct gap_plan {
        uint32_t uEnd = 0;     ///< end of the grown gap
        uint32_t uHeadEnd = 0; ///< end of a filler at the start of the area; 0: none
        bool bWrap = false;    ///< the record goes to the start of the area
        uint32_t uGivenUp = 0; ///< records swallowed
    };

    trace_file_header* file_header() const {
        return reinterpret_cast<trace_file_header*>(pMap);
    }
    /// Plain copy of a record's header; only the writer changes headers.
    trace_record_header header_at(uint32_t uAt) const {
        return load<trace_record_header>({pMap, uSize}, uAt);
    }

    // trace_writer.cpp: the file
    trace_writer_status make_file(const char* pPath, const trace_writer_options& options);
    void lay_out_file(const trace_writer_options& options);

    // ring.cpp: the place of a record
    trace_writer_status begin(uint16_t function, const trace_origin& origin, size_t bodySize,
                              std::byte** ppBody);
    trace_writer_status commit();
    bool make_room(uint32_t uLength, uint64_t uTimeStamp);
    bool plan_room(uint64_t uLength, gap_plan* pPlan);
    bool plan_grown_gap(uint64_t uNeeded, gap_plan* pPlan);
    bool plan_head(uint64_t uNeeded, gap_plan* pPlan);
    bool swallow(uint32_t* pEnd, uint32_t uLimit, gap_plan* pPlan);
    void carry_out(const gap_plan& plan);
    void move_to_head(const gap_plan& plan);
    bool place(uint32_t uLength, uint64_t uTimeStamp);
    bool append_discard(uint32_t uLengthAfter);
    uint32_t seq_number_from(uint32_t uAt) const;
    bool reader_has_passed(uint32_t uSeqNumber) const;
    void store_filler(uint32_t uAt, uint32_t uLength);
    void swallow_first_filler();

    /// A kind whose body is a row of fields, as the struct of the kind says.
    template <class RECORD, class... FIELD> trace_writer_status
    append_fields(uint16_t function, const trace_origin& origin, const FIELD&... fields) {
        return append(function, origin, trace_body_of(RECORD{{}, fields...}));
    }

    // append.cpp: the other bodies
    template <class FILL> trace_writer_status
    append_filled(uint16_t function, const trace_origin& origin, size_t bodySize, const FILL& fill);

    // live.cpp: requests of a reader, and readers that died
    void answer_reader();
    void start_holding();
    void publish_held();
    bool place_held(uint32_t uLength);
    void commit_held();
    bool forget_dead_reader();

    std::byte* pMap = nullptr; ///< the mapped file; null without one
    uint32_t uSize = 0;        ///< of the file
    int fd = -1;
    bool bAskLock = true;      ///< forget readers that hold no lock any more
    bool bDamaged = false;     ///< the ring was found overwritten
    bool bFirstFiller = false; ///< the last filler of an empty ring still stands

    uint32_t uArea = 0;     ///< offset of the record area
    uint32_t uWrite = 0;    ///< start of the gap = uOldestRecordOffset
    uint32_t uGapEnd = 0;   ///< where the gap ends
    uint32_t uNextSeq = 0;  ///< number of the next record
    uint64_t uLastTime = 0; ///< of the newest record, placed or not; fillers carry it
    open_record current;

    bool bHolding = false;    ///< uTailReq is raised and acknowledged
    uint32_t uLastHeld = 0;   ///< offset of the last held record; 0: none
    uint32_t uHeldEnd = 0;    ///< end of the chain = start of what is left of the gap
    uint64_t uDropsDue = 0;   ///< drops that no record of kind 0xFFFE speaks for yet
    trace_origin lastDropped; ///< origin of the latest of them; compId unused
    uint64_t uNextAsk = 0;    ///< earliest time to ask for the lock, ms

    trace_writer_counts totals;
};
