// The in-memory records of the command and its process-wide state.
//
// Ownership in one place:
// - trace_file records belong to the list anchor.pFirstFile from the moment the
//   run adds them; clean-up releases them at the end of the run.
// - trace_queue_element blocks are made by a reader task, belong to the output
//   queue from their push on, and are released by the main thread.
// - template_file and format_entry blocks, and all output state, belong to the
//   main thread.
#pragma once

#include "kv_cu.h"
#include "trace_file_fmt.h"

#include <atomic>
#include <csetjmp>
#include <csignal>
#include <cstddef>
#include <cstdint>
#include <ctime>
#include <pthread.h>

struct format_index_slot;
struct format_plan;
struct template_file;
struct trace_file;

// ---------------------------------------------------------------- templates

/// Type code of a template parameter: low four bits the base type, plus
/// PARM_UNSIGNED.
using parm_type_t = uint8_t;

enum : parm_type_t {
    PARM_CHAR = 1,
    PARM_SHORT = 2,
    PARM_INT = 3,
    PARM_LONG = 4, ///< 4 or 8 bytes, by the addressing mode of the trace file
    PARM_LONGLONG = 5,
    PARM_DOUBLE = 6,
    PARM_LONGDOUBLE = 7, ///< 8 bytes in the record, written with the L modifier
    PARM_STRING = 8,
    PARM_RESOURCE_HANDLE = 9, ///< 20 bytes
    PARM_FLOAT = 10,
    PARM_REST = 11,     ///< the rest of the data; prints nothing
    PARM_TRACE_ID = 12, ///< prints the format string of that trace id
    PARM_BASE_MASK = 0x0F,
    PARM_UNSIGNED = 0x10,
    PARM_UNREFERENCED = 0xFF, ///< during compilation only
};

/// Most parameters, and most conversions, of one format string.
inline constexpr int MAX_PARMS = 128;

/// Stands for the index of a parameter where there is none.
inline constexpr uint8_t NO_PARM = 255;

/// One conversion of a compiled format string.
struct conv_spec {
    uint8_t parmNum;      ///< index of the parameter that is printed
    uint8_t widthOffset;  ///< characters from '%' to the '*' width; 0: none
    uint8_t widthParmNum; ///< index of the parameter with the '*' width, or NO_PARM
    uint8_t precOffset;   ///< characters from '%' to the '*' precision; 0: none
    uint8_t precParmNum;  ///< index of the parameter with the '*' precision, or NO_PARM
    uint8_t lenConv;      ///< characters from '%' through the conversion letter
    uint16_t offset;      ///< position of the '%' in pString
};

/// Bits of format_entry::properties.
enum : int32_t { FORMAT_NUMBERED_PARMS = 1 };

/// A compiled format string. One allocation holds the entry, its conversions,
/// its parameter types, its string, and the plan by which it is written.
struct format_entry {
    format_entry* pNext;     ///< next entry of the same file, older
    template_file* pFile;    ///< owner; null for an internal format
    int32_t trace_id;        ///< written by the template parser
    int32_t block_id;        ///< -1: the record as a whole
    int32_t properties;      ///< FORMAT_* bits
    int32_t numParms;        ///< highest parameter index used, plus one
    parm_type_t* pParmTypes; ///< numParms type codes
    int32_t numConvs;        ///< conversions, in order of appearance
    conv_spec* pConvSpecs;   ///< numConvs conversions
    char* pString;           ///< the whole format string, NUL-terminated
    format_plan* pPlan;      ///< how it is written, template/format_plan.h
};

/// The formats of one component.
struct template_file {
    template_file* pNext;   ///< on-demand list; null for a preloaded template
    char compId[4];         ///< not terminated
    int32_t lineNumber;     ///< line ends read so far
    format_entry* pFormats; ///< newest first
    char* preload_path;     ///< file found by the preload, heap text; null when loaded on demand

    // What makes looking up quick:
    format_index_slot* pIndex;   ///< pFormats by ids; null for a small template
    size_t uIndexSize;           ///< slots of pIndex
    template_file* pNextInChain; ///< on-demand templates whose ids hash alike
};

// -------------------------------------------------------------- trace files

/// Bytes that processors fetch and take from one another in one piece.
inline constexpr size_t CACHE_LINE = 128;

/// Bits of thread_info::outputFlags.
enum : uint16_t {
    THREAD_BLANK_LINE_AFTER = 0x02, ///< an empty line follows the open record
    THREAD_NEST_AFTER = 0x04,       ///< the level rises when the open record ends
};

/// Output state of one traced thread of one file. Main thread only.
struct thread_info {
    thread_info* pNext;
    uint64_t id;
    uint16_t nestingLevel;
    uint16_t outputFlags;
};

struct trace_queue_element;
struct trace_twins;

/// Which file this is, whatever path names it: see is_same_file.
struct file_identity {
    uint64_t uDevice;
    uint64_t uInode;
    int64_t iBornSeconds; ///< 0 where the file system does not know
    uint32_t uBornNanoSeconds;
};

/// One trace file of the run. Made in one block with its path, all zero but fd.
///
/// Who may touch what once the file's reader runs:
/// - the reader task: mapping pointers, fd, uSize, start state, walk state;
/// - the main thread: timeInfo, pThreadInfo and modTime from the first queued record
///   on until the reader closes the file, which it does only when none of its records
///   is queued or being formatted;
/// - under priorityQmutex: numRecPushed;
/// - under the mutex of its twins, while they run: its links and its place among them.
///
/// What the reader writes at every record, what the main thread writes at every
/// record, and what both only read lie in cache lines apart.
struct trace_file {
    trace_file* pNext;            ///< next file of anchor.pFirstFile
    char* pName;                  ///< path as given; lies in the same block
    trace_file_header* pHeader;   ///< start of the mapping; null when not mapped
    trace_record_header* pMapEnd; ///< end of the mapping; null when not mapped
    trace_record_header* pWrap;   ///< start of the record area; null when not mapped
    alignas(CACHE_LINE) trace_record_header* pCurRec; ///< where the reader stands
    uint32_t uExpectedSeq;      ///< number of the next record in sequence, uSeqLock for the writer
    uint32_t uStepsToTell;      ///< with bTellsSeldom: steps until uSeqLock is stored again
    bool bTellsSeldom;          ///< uSeqLock is not stored at every step, or never
    alignas(CACHE_LINE) int fd; ///< -1 when closed
    uint32_t uSize;             ///< bytes mapped
    int index;                  ///< position among the file arguments, from 0
    cu_timeinfo timeInfo;       ///< time base in force
    int addrMode64;             ///< the writer ran in 64-bit mode
    int recordNumber;           ///< records counted while the start is sought
    int startOptions;           ///< FILE_START_*
    int32_t startSeconds;
    int32_t startNanoSeconds;
    int32_t startRecords;
    std::atomic<int> bDone;               ///< reading is over; set last by the reader
    std::atomic<pthread_t> threadId;      ///< pool thread that runs the reader; 0: none
    alignas(CACHE_LINE) timespec modTime; ///< latest record time seen
    int timeStampIsValid;                 ///< modTime holds a time
    thread_info* pThreadInfo;
    alignas(CACHE_LINE) uint32_t numRecPushed; ///< records in the output queue or being formatted
    uint32_t index2;                           ///< position in the sorted pre-processing list
    std::atomic<int> bErrorProcessing;         ///< reading could not be started

    // Not part of the format of the record, but kept beside it:
    alignas(CACHE_LINE) uint8_t uPlatform; ///< the writer's platform code, taken at open
    int bAccepted;            ///< the header was validated: the two reader words may be stored
    size_t uMappedSize;       ///< bytes mapped at pHeader; uSize is its low 32 bits
    bool bReadOnly;           ///< opened for reading, without a lock; nothing is stored in the file
    file_identity identity;   ///< of what was opened first
    trace_file* pNextInTable; ///< of the table of accepted files
    trace_twins* pTwins;      ///< null: no other argument names the same file
    trace_file* pNextTwin;    ///< next running twin
    trace_file* pPrevTwin;
    uint32_t uToldSeq; ///< the number it waits for, as the twins know it
    bool bAmongTwins;  ///< it runs and shares what is open
    bool bTold;        ///< uToldSeq holds a number
    bool bAsks;        ///< it wants uTailReq raised
};

/// trace_file::startOptions.
enum : int {
    FILE_START_ALL = 0,    ///< every record is output
    FILE_START_TIME = 1,   ///< from a time on
    FILE_START_RECORD = 2, ///< from a record number on
};

/// anchor.startOptions.
enum : int32_t {
    START_NONE = 0,
    START_RECORD_FROM_BEGIN = 1,
    START_SECONDS_FROM_BEGIN = 2,
    START_RECORDS_FROM_END = 3,
    START_SECONDS_FROM_END = 4,
    START_TIME = 5,
};

// -------------------------------------------------------------------- merge

/// One queued record: these fields, then a copy of the record from its header
/// on, in one block of `length` bytes.
struct trace_queue_element {
    trace_queue_element* pNext; ///< empty
    trace_queue_element* pPrev; ///< empty
    trace_file* pFile;
    uint64_t pushSeqn; ///< unique and increasing over all files
    uint32_t offset;   ///< of the record in its file
    uint32_t length;   ///< of this block: the record's length + QUEUE_ELEMENT_OVERHEAD
    trace_record_header header;
};
static_assert(offsetof(trace_queue_element, header) == 40);

/// What a queue element adds to the length of its record.
inline constexpr uint32_t QUEUE_ELEMENT_OVERHEAD = 44;
static_assert(sizeof(trace_queue_element) == sizeof(trace_record_header) + QUEUE_ELEMENT_OVERHEAD);

/// One file of the pre-processing list.
struct TrcPreProcHdrElem {
    int32_t isOpenned; ///< the file's reader was started; under priorityQmutex
    trace_file* pTrcFile;
    trace_record_header header; ///< first record of the record area; orders the list
    bool bOldestKnown;
    cu_nanoseconds oldestTime;   ///< converted time of the file's oldest record
    cu_nanoseconds earliestFrom; ///< earliest oldestTime of this element and all behind it
};

/// Shared state of the merge.
struct TrcFmtngProcCtrl {
    pthread_mutex_t priorityQmutex;   ///< recursive; guards what readers push and all below
    std::atomic<uint32_t> queueDepth; ///< elements pushed and not yet formatted; written under it
    uint64_t PushSeqn;                ///< for the next push
    std::atomic<uint32_t>
        uNextUnOpenFileIdx;         ///< list elements started or tried; written under the mutex
    uint32_t uTrcPreProcHdrListLen; ///< elements allocated
    TrcPreProcHdrElem* pTrcPreProcHdrList; ///< outside follow mode only
};

// ------------------------------------------------------------------ globals

/// Bits of kelvo_globals_opts::outputFlags.
enum : uint8_t {
    OUTPUT_START_PENDING = 0x01, ///< prefix written, first body character not yet seen
};

/// Options and process-wide state; `anchor` is the only instance. Written by
/// the main thread; what reader tasks read of it does not change while they run.
struct kelvo_globals_opts {
    trace_file* pFirstFile;
    int32_t iNumberFiles;
    int32_t bFollow;
    int32_t bMicroSec;
    int32_t bBrief;
    int32_t bRaw;
    int32_t bNoFileLocking;
    int32_t bStartRecOpt;
    int32_t bLocalTZ;
    int32_t bHostTZ;
    char* pTemplatePath; ///< heap text unless it is pDefTemplatePath
    template_file* pFirstTemplate;
    const char* pProgName;
    char outputOptions[8];
    int32_t startOptions; ///< START_*
    int32_t startSeconds;
    int32_t startNanoSeconds;
    int32_t startRecords;
    char* pStartRecordOptArg; ///< heap copy of the -s argument; may be null
    trace_file* pCurFile;
    thread_info* pCurThread;
    int16_t curColumn;
    char firstChar;
    uint8_t outputFlags; ///< OUTPUT_* bits
    int16_t headerIndent;
    int16_t currentIndent;
    int32_t lenFormatBuffer;
    char* pFormatBuffer;
    int32_t tz_offset;  ///< minutes west of UTC
    pthread_t threadId; ///< main thread
    sigjmp_buf sigbuf;
    struct sigaction origAction[66];
};

extern kelvo_globals_opts anchor;
extern TrcFmtngProcCtrl Glbl_TrcFmtngProcCtrl;

extern char pDefTemplatePath[]; ///< compared by identity, never written or released
extern int32_t memory_is_restricted;
extern int32_t queue_limit_enabled;
extern int32_t bShowProgress;
extern uint32_t total_tf_count;
