// The on-disk format of trace files, shared by the library that writes them and
// by the readers.
//
// A file is a trace_file_header followed by a record area that runs to the end
// of the file. The area is a ring of variable-length records, back to back;
// every record starts with a trace_record_header. All fields are in the byte
// order of the writing platform. Offsets and sizes are in bytes; a file is
// smaller than 4 GiB.
//
// Records need not be aligned, so trace_record_header and the record bodies are
// declared packed; code that reads them from a mapping goes through
// trace_load.h, which knows where the record ends.
#pragma once

#include "kv_cu.h"

#include <cstddef>
#include <cstdint>

/// Bits of trace_file_header::uProperties. All other bits must be zero.
enum : uint8_t {
    TRC_PROP_LITTLE_ENDIAN = 0x80, ///< written on a little-endian platform
    TRC_PROP_ADDR_64 = 0x40,       ///< the writer ran in 64-bit mode
    TRC_PROP_RESERVED = 0x3F,
};

/// Bit of trace_file_header::uFlags: the writer has seen uTailReq and leaves
/// the oldest record where it is.
inline constexpr uint16_t TRC_FLAG_TAIL_ACK = 0x8000;

/// uTailReq while a reader looks for its first record; 0 otherwise.
inline constexpr uint32_t TRC_TAIL_REQUESTED = 0x3FFFFFFF;

/// uSeqLock while no reader has the file open.
inline constexpr uint32_t TRC_SEQ_NO_READER = 0xFFFFFFFF;

/// seqNumber of a filler (function 0) that does not count in the sequence.
inline constexpr uint32_t TRC_SEQ_FILLER = 0xFFF;

/// Newest file format version that is understood.
inline constexpr uint16_t TRC_MAX_VERSION = 6;

/// uOffset from which on the header holds tz_offset.
inline constexpr uint32_t MIN_HDR_SIZE_FOR_TZ = 200;

/// tz_offset of a writer that recorded no time zone.
inline constexpr int32_t TRC_TZ_NOT_RECORDED = -1;

#pragma pack(push, 4)
/// The first 200 bytes of a trace file.
struct trace_file_header {
    uint8_t uProperties;          ///< TRC_PROP_* bits
    uint8_t uPlatform;            ///< platform code of the writer
    uint16_t uVersion;            ///< file format version, 0 to TRC_MAX_VERSION
    uint16_t uFlags;              ///< writer's flags; only TRC_FLAG_TAIL_ACK is read
    uint16_t uNodeNumber;         ///< displayed only
    uint32_t uOffset;             ///< offset of the record area = size of the header as written
    uint32_t uSeqLock;            ///< reader: sequence number it expects where it stands
    uint32_t uTailReq;            ///< reader: TRC_TAIL_REQUESTED or 0
    uint32_t uActualFileSize;     ///< size of the whole file, bytes
    cu_timeinfo timeInfo;         ///< time base of the file's first records
    uint32_t machineId;           ///< displayed only
    uint32_t uOldestRecordOffset; ///< writer, at any time: where the oldest data begins
    uint32_t uPid;                ///< process id of the writer
    char program[48];             ///< name of the traced program, NUL-terminated unless full
    char buildName[32];           ///< build level of the tracing library; from version 2
    char baseProgName[48];        ///< base name of the traced program; from version 5
    uint64_t uNode_ID;            ///< node id; from version 4
    uint32_t sp_reuse_tm;         ///< not interpreted by readers
    uint8_t sp_flags;             ///< not interpreted by readers
    uint8_t padding[3];
    int32_t tz_offset; ///< minutes west of UTC; needs uOffset >= MIN_HDR_SIZE_FOR_TZ
};
#pragma pack(pop)

static_assert(sizeof(trace_file_header) == 200);
static_assert(offsetof(trace_file_header, uProperties) == 0);
static_assert(offsetof(trace_file_header, uPlatform) == 1);
static_assert(offsetof(trace_file_header, uVersion) == 2);
static_assert(offsetof(trace_file_header, uFlags) == 4);
static_assert(offsetof(trace_file_header, uNodeNumber) == 6);
static_assert(offsetof(trace_file_header, uOffset) == 8);
static_assert(offsetof(trace_file_header, uSeqLock) == 12);
static_assert(offsetof(trace_file_header, uTailReq) == 16);
static_assert(offsetof(trace_file_header, uActualFileSize) == 20);
static_assert(offsetof(trace_file_header, timeInfo) == 24);
static_assert(offsetof(trace_file_header, machineId) == 40);
static_assert(offsetof(trace_file_header, uOldestRecordOffset) == 44);
static_assert(offsetof(trace_file_header, uPid) == 48);
static_assert(offsetof(trace_file_header, program) == 52);
static_assert(offsetof(trace_file_header, buildName) == 100);
static_assert(offsetof(trace_file_header, baseProgName) == 132);
static_assert(offsetof(trace_file_header, uNode_ID) == 180);
static_assert(offsetof(trace_file_header, sp_reuse_tm) == 188);
static_assert(offsetof(trace_file_header, sp_flags) == 192);
static_assert(offsetof(trace_file_header, tz_offset) == 196);

/// Record kinds: trace_record_header::function.
enum trace_function : uint16_t {
    TRC_FUNC_FILLER = 0,            ///< no record: pads the ring
    TRC_FUNC_ID = 1,                ///< trace_record_id
    TRC_FUNC_STRING = 2,            ///< trace_record_string
    TRC_FUNC_DATA = 3,              ///< trace_record_data and trace_data blocks
    TRC_FUNC_INT32 = 4,             ///< trace_record_int32
    TRC_FUNC_INT32_2 = 5,           ///< trace_record_int32_2
    TRC_FUNC_UINT32 = 6,            ///< trace_record_uint32
    TRC_FUNC_UINT32_2 = 7,          ///< trace_record_uint32_2
    TRC_FUNC_INT64 = 8,             ///< trace_record_int64
    TRC_FUNC_INT64_2 = 9,           ///< trace_record_int64_2
    TRC_FUNC_UINT64 = 10,           ///< trace_record_uint64
    TRC_FUNC_UINT64_2 = 11,         ///< trace_record_uint64_2
    TRC_FUNC_VALUES = 12,           ///< trace_record_values, 4-byte elements
    TRC_FUNC_VALUES64 = 13,         ///< trace_record_values, 8-byte elements
    TRC_FUNC_ERROR = 14,            ///< trace_record_error, arguments, strings
    TRC_FUNC_STRINGS = 15,          ///< trace_record_strings and the string area
    TRC_FUNC_START = 16,            ///< trace_record_start
    TRC_FUNC_TIME_CALIBRATION = 17, ///< time_calibration
    TRC_FUNC_RESTART = 19,          ///< trace_record_start and a string
    TRC_FUNC_DISCARDED = 0xFFFE,    ///< header only: the writer gave records up here
    TRC_FUNC_WRITING = 0xFFFF,      ///< not yet a record; skipped at the oldest position
};

/// What holds of a kind of record.
enum trc_kind_bit : uint8_t {
    TRC_KIND_VALID = 0x01,     ///< may stand in a file; any other function is damage
    TRC_KIND_COMPONENT = 0x02, ///< compId names a component: four printable characters
    TRC_KIND_OUTPUT = 0x04,    ///< handed on for output; readers step over the others
    TRC_KIND_OWN_BASE = 0x08,  ///< its own time stamp is converted by the base in its body
    TRC_KIND_NEW_BASE = 0x10,  ///< its body brings the time base of what follows it
    TRC_KIND_TRACED = TRC_KIND_VALID | TRC_KIND_COMPONENT | TRC_KIND_OUTPUT,
};

struct trc_kind {
    uint16_t function; ///< a trace_function
    const char* pName;
    uint8_t uBits; ///< TRC_KIND_*
};

/// All kinds, and what every reader and writer has to know about them.
inline constexpr trc_kind TRC_KINDS[] = {
    {TRC_FUNC_FILLER, "FILLER", TRC_KIND_VALID},
    {TRC_FUNC_ID, "ID", TRC_KIND_TRACED},
    {TRC_FUNC_STRING, "STRING", TRC_KIND_TRACED},
    {TRC_FUNC_DATA, "DATA", TRC_KIND_TRACED},
    {TRC_FUNC_INT32, "INT32", TRC_KIND_TRACED},
    {TRC_FUNC_INT32_2, "INT32_2", TRC_KIND_TRACED},
    {TRC_FUNC_UINT32, "UINT32", TRC_KIND_TRACED},
    {TRC_FUNC_UINT32_2, "UINT32_2", TRC_KIND_TRACED},
    {TRC_FUNC_INT64, "INT64", TRC_KIND_TRACED},
    {TRC_FUNC_INT64_2, "INT64_2", TRC_KIND_TRACED},
    {TRC_FUNC_UINT64, "UINT64", TRC_KIND_TRACED},
    {TRC_FUNC_UINT64_2, "UINT64_2", TRC_KIND_TRACED},
    {TRC_FUNC_VALUES, "VALUES", TRC_KIND_TRACED},
    {TRC_FUNC_VALUES64, "VALUES64", TRC_KIND_TRACED},
    {TRC_FUNC_ERROR, "ERROR", TRC_KIND_TRACED},
    {TRC_FUNC_STRINGS, "STRINGS", TRC_KIND_TRACED},
    {TRC_FUNC_START, "START", TRC_KIND_TRACED | TRC_KIND_OWN_BASE | TRC_KIND_NEW_BASE},
    {TRC_FUNC_TIME_CALIBRATION, "TIME_CALIBRATION",
     TRC_KIND_VALID | TRC_KIND_OUTPUT | TRC_KIND_NEW_BASE},
    {TRC_FUNC_RESTART, "RESTART", TRC_KIND_VALID | TRC_KIND_NEW_BASE},
    {TRC_FUNC_DISCARDED, "DISCARDED", TRC_KIND_VALID},
    {TRC_FUNC_WRITING, "WRITING", 0},
};

/// Place of a function in a word of bits; the two highest come first, where 16
/// bits bring them by themselves.
constexpr uint16_t trc_kind_place(uint16_t function) {
    return static_cast<uint16_t>(function + 2);
}

/// Whether there is a kind of that function, and the bit holds of it. Asked for
/// every record that is read: no more than a comparison and a shift.
template <trc_kind_bit BIT> constexpr bool trc_kind_has(uint16_t function) {
    constexpr uint32_t MASK = [] {
        uint32_t uMask = 0;
        for (const trc_kind& kind : TRC_KINDS) // a place beyond the word does not compile
            uMask |= uint32_t{(kind.uBits & BIT) != 0} << trc_kind_place(kind.function);
        return uMask;
    }();
    const uint16_t uPlace = trc_kind_place(function);
    return uPlace < 32 && (MASK >> uPlace & 1) != 0;
}

constexpr bool trc_kind_is_valid(uint16_t function) {
    return trc_kind_has<TRC_KIND_VALID>(function);
}
constexpr bool trc_kind_has_component(uint16_t function) {
    return trc_kind_has<TRC_KIND_COMPONENT>(function);
}
constexpr bool trc_kind_is_output(uint16_t function) {
    return trc_kind_has<TRC_KIND_OUTPUT>(function);
}
constexpr bool trc_kind_has_own_base(uint16_t function) {
    return trc_kind_has<TRC_KIND_OWN_BASE>(function);
}
constexpr bool trc_kind_changes_time_base(uint16_t function) {
    return trc_kind_has<TRC_KIND_NEW_BASE>(function);
}

/// Component id of the tracing library's own records.
inline constexpr char TRC_COMP_INTERNAL[] = "____";

/// The first 28 bytes of every record.
struct [[gnu::packed]] trace_record_header {
    uint32_t length;    ///< size of the whole record, this header included
    uint16_t function;  ///< a trace_function
    uint16_t reserved;  ///< not interpreted
    uint32_t seqNumber; ///< steps by 2 from record to record
    char compId[4];     ///< four printable characters, no terminator
    uint32_t threadId;  ///< writing thread
    uint64_t timeStamp; ///< raw; see cu_cvt_time_platform_1
};
inline constexpr uint32_t TRC_MIN_RECORD = 28; ///< no record is shorter
static_assert(sizeof(trace_record_header) == TRC_MIN_RECORD);
static_assert(offsetof(trace_record_header, length) == 0);
static_assert(offsetof(trace_record_header, function) == 4);
static_assert(offsetof(trace_record_header, reserved) == 6);
static_assert(offsetof(trace_record_header, seqNumber) == 8);
static_assert(offsetof(trace_record_header, compId) == 12);
static_assert(offsetof(trace_record_header, threadId) == 16);
static_assert(offsetof(trace_record_header, timeStamp) == 20);

struct [[gnu::packed]] trace_record_id {
    trace_record_header header;
    uint32_t id; ///< trace id
};
static_assert(sizeof(trace_record_id) == 32);
static_assert(offsetof(trace_record_id, id) == 28);

struct [[gnu::packed]] trace_record_string {
    trace_record_header header;
    char string[1]; ///< NUL-terminated, runs to the end of the record
};
static_assert(sizeof(trace_record_string) == 29);
static_assert(offsetof(trace_record_string, string) == 28);

struct [[gnu::packed]] trace_record_data {
    trace_record_header header;
    uint32_t trace_id;
    uint32_t n_blocks; ///< trace_data blocks that follow, back to back
};
static_assert(sizeof(trace_record_data) == 36);
static_assert(offsetof(trace_record_data, trace_id) == 28);
static_assert(offsetof(trace_record_data, n_blocks) == 32);

/// A block of a data record. `length` bytes of data follow; the next block
/// begins 4 + length bytes after this one, rounded up to a multiple of 4.
struct [[gnu::packed]] trace_data {
    int32_t length;
};
static_assert(sizeof(trace_data) == 4);

struct [[gnu::packed]] trace_record_int32 {
    trace_record_header header;
    uint32_t trace_id;
    int32_t value;
};
static_assert(sizeof(trace_record_int32) == 36);
static_assert(offsetof(trace_record_int32, value) == 32);

struct [[gnu::packed]] trace_record_uint32 {
    trace_record_header header;
    uint32_t trace_id;
    uint32_t value;
};
static_assert(sizeof(trace_record_uint32) == 36);
static_assert(offsetof(trace_record_uint32, value) == 32);

struct [[gnu::packed]] trace_record_int32_2 {
    trace_record_header header;
    uint32_t trace_id;
    int32_t value1;
    int32_t value2;
};
static_assert(sizeof(trace_record_int32_2) == 40);
static_assert(offsetof(trace_record_int32_2, value1) == 32);
static_assert(offsetof(trace_record_int32_2, value2) == 36);

struct [[gnu::packed]] trace_record_uint32_2 {
    trace_record_header header;
    uint32_t trace_id;
    uint32_t value1;
    uint32_t value2;
};
static_assert(sizeof(trace_record_uint32_2) == 40);
static_assert(offsetof(trace_record_uint32_2, value1) == 32);
static_assert(offsetof(trace_record_uint32_2, value2) == 36);

struct [[gnu::packed]] trace_record_int64 {
    trace_record_header header;
    uint32_t trace_id;
    int64_t value;
};
static_assert(sizeof(trace_record_int64) == 40);
static_assert(offsetof(trace_record_int64, value) == 32);

struct [[gnu::packed]] trace_record_uint64 {
    trace_record_header header;
    uint32_t trace_id;
    uint64_t value;
};
static_assert(sizeof(trace_record_uint64) == 40);
static_assert(offsetof(trace_record_uint64, value) == 32);

struct [[gnu::packed]] trace_record_int64_2 {
    trace_record_header header;
    uint32_t trace_id;
    int64_t value1;
    int64_t value2;
};
static_assert(sizeof(trace_record_int64_2) == 48);
static_assert(offsetof(trace_record_int64_2, value1) == 32);
static_assert(offsetof(trace_record_int64_2, value2) == 40);

struct [[gnu::packed]] trace_record_uint64_2 {
    trace_record_header header;
    uint32_t trace_id;
    uint64_t value1;
    uint64_t value2;
};
static_assert(sizeof(trace_record_uint64_2) == 48);
static_assert(offsetof(trace_record_uint64_2, value1) == 32);
static_assert(offsetof(trace_record_uint64_2, value2) == 40);

/// Head of the kinds VALUES (4-byte elements) and VALUES64 (8-byte elements).
struct [[gnu::packed]] trace_record_values {
    trace_record_header header;
    uint32_t id;     ///< trace id
    uint32_t number; ///< elements that follow
};
static_assert(sizeof(trace_record_values) == 36);
static_assert(offsetof(trace_record_values, id) == 28);
static_assert(offsetof(trace_record_values, number) == 32);

struct [[gnu::packed]] trace_record_strings {
    trace_record_header header;
    uint32_t id;          ///< trace id; 0xFFFFFFFF: none
    uint32_t number;      ///< strings that follow
    uint32_t len_strings; ///< size of the string area: NUL-terminated strings back to back
};
static_assert(sizeof(trace_record_strings) == 40);
static_assert(offsetof(trace_record_strings, id) == 28);
static_assert(offsetof(trace_record_strings, number) == 32);
static_assert(offsetof(trace_record_strings, len_strings) == 36);

/// Head of an error record; argCount cu_error_arg_t follow, then the strings.
/// String offsets are counted from the start of the record; 0 means absent.
struct [[gnu::packed]] trace_record_error {
    trace_record_header header;
    uint32_t traceId;
    uint32_t errorId;          ///< error number that was returned
    uint32_t lineNumber;       ///< source line of the failing call
    uint32_t funcNameOffset;   ///< function that returned the error; always present
    uint32_t fileNameOffset;   ///< source file; always present
    uint32_t ffdcIdOffset;     ///< first-failure data capture id
    uint32_t msgSetNumber;     ///< set in the message catalogue
    uint32_t msgNumber;        ///< message in that set
    uint32_t msgCatNameOffset; ///< name of the message catalogue
    uint32_t defMsgOffset;     ///< printf-style default text
    uint32_t argCount;         ///< message arguments, 16 bytes each
};
static_assert(sizeof(trace_record_error) == 72);
static_assert(offsetof(trace_record_error, traceId) == 28);
static_assert(offsetof(trace_record_error, errorId) == 32);
static_assert(offsetof(trace_record_error, lineNumber) == 36);
static_assert(offsetof(trace_record_error, funcNameOffset) == 40);
static_assert(offsetof(trace_record_error, fileNameOffset) == 44);
static_assert(offsetof(trace_record_error, ffdcIdOffset) == 48);
static_assert(offsetof(trace_record_error, msgSetNumber) == 52);
static_assert(offsetof(trace_record_error, msgNumber) == 56);
static_assert(offsetof(trace_record_error, msgCatNameOffset) == 60);
static_assert(offsetof(trace_record_error, defMsgOffset) == 64);
static_assert(offsetof(trace_record_error, argCount) == 68);

/// A start record; a restart record is followed by a NUL-terminated string.
struct [[gnu::packed]] trace_record_start {
    trace_record_header header;
    uint32_t traceId;     ///< not used for the template lookup
    uint32_t pid;         ///< process id of the traced program
    cu_timeinfo timeInfo; ///< time base in force from this record on
};
static_assert(sizeof(trace_record_start) == 52);
static_assert(offsetof(trace_record_start, traceId) == 28);
static_assert(offsetof(trace_record_start, pid) == 32);
static_assert(offsetof(trace_record_start, timeInfo) == 36);

struct [[gnu::packed]] time_calibration {
    trace_record_header header;
    cu_timeinfo reBase; ///< new time base of the file
};
static_assert(sizeof(time_calibration) == 44);
static_assert(offsetof(time_calibration, reBase) == 28);
