#include "frame.h"

#include "digits.h"
#include "stdout_stream.h"
#include "time_text.h"

#include <algorithm>
#include <cstring>

namespace {

// What the fields of a prefix are made from.
struct prefix_source {
    timespec time;
    uint64_t threadId;
    const char* pCompId;
    uint32_t funcId;
    uint32_t seqNumber;
    uint32_t offset;
};

// Most bytes of one field: a date or time of up to 39 and the nanoseconds.
constexpr size_t FIELD_ROOM = 64;
constexpr size_t PREFIX_ROOM = FIELD_ROOM * sizeof anchor.outputOptions;
static_assert(PREFIX_ROOM <= STDOUT_ROOM);

char* put_text(char* pOut, std::string_view text) {
    return std::copy(text.begin(), text.end(), pOut);
}

// A kept time text is copied with the room behind it: one move, no loop.
char* put_kept(char* pOut, std::string_view text) {
    std::memcpy(pOut, text.data(), TIME_TEXT_ROOM);
    return pOut + text.size();
}

char* put_date(char* pOut, const prefix_source& source) {
    return put_kept(pOut, date_text(source.time.tv_sec));
}

char* put_time(char* pOut, const prefix_source& source) {
    pOut = put_kept(pOut, time_of_day_text(source.time.tv_sec));
    *pOut++ = '.';
    return put_nanoseconds(pOut, static_cast<uint32_t>(source.time.tv_nsec));
}

char* put_thread(char* pOut, const prefix_source& source) {
    pOut = put_text(pOut, " T(");
    const int iDigits = count_hex_digits(source.threadId);
    for (int i = 3; i > iDigits; i--)
        *pOut++ = ' ';
    pOut = put_hex_digits(pOut, source.threadId, iDigits);
    *pOut++ = ')';
    return pOut;
}

// Four columns, right-aligned when a NUL ends the id early.
char* put_component(char* pOut, const prefix_source& source) {
    const auto ends = [&](int i) { return source.pCompId[i] == '\0'; };
    if (!ends(0) && !ends(1) && !ends(2) && !ends(3)) [[likely]] {
        *pOut++ = ' ';
        return put_text(pOut, {source.pCompId, 4});
    }
    const std::string_view text(source.pCompId, strnlen(source.pCompId, 4));
    pOut = std::fill_n(pOut, 1 + 4 - text.size(), ' ');
    return put_text(pOut, text);
}

char* put_function(char* pOut, const prefix_source& source) {
    pOut = put_text(pOut, source.funcId < 10 ? "  " : " ");
    return put_decimal(pOut, source.funcId);
}

char* put_sequence(char* pOut, const prefix_source& source) {
    return put_hex8(put_text(pOut, " 0x"), source.seqNumber);
}

char* put_offset(char* pOut, const prefix_source& source) {
    return put_hex8(put_text(pOut, " 0x"), source.offset);
}

// The fields by their -o letter. Each writes at most FIELD_ROOM bytes at `pOut`
// and returns the position after them.
using put_field = char* (*)(char* pOut, const prefix_source& source);
struct prefix_field {
    char letter;
    put_field pPut;
};
constexpr prefix_field PREFIX_FIELDS[] = {
    {'d', put_date},     {'t', put_time},     {'i', put_thread}, {'c', put_component},
    {'f', put_function}, {'s', put_sequence}, {'o', put_offset},
};

// The fields that anchor.outputOptions asks for, looked up once.
struct {
    char letters[sizeof anchor.outputOptions] = "";
    put_field pPuts[sizeof anchor.outputOptions];
    size_t uCount = 0;
} chosen;

void choose_fields() {
    std::memcpy(chosen.letters, anchor.outputOptions, sizeof chosen.letters);
    chosen.uCount = 0;
    for (const char* pLetter = chosen.letters; *pLetter != '\0'; pLetter++)
        for (const prefix_field& field : PREFIX_FIELDS)
            if (field.letter == *pLetter)
                chosen.pPuts[chosen.uCount++] = field.pPut;
}

char* put_fields(char* pOut, const prefix_source& source) {
    if (std::memcmp(chosen.letters, anchor.outputOptions, sizeof chosen.letters) != 0)
        choose_fields();
    for (size_t i = 0; i < chosen.uCount; i++)
        pOut = chosen.pPuts[i](pOut, source);
    return pOut;
}

// Two digits at least.
char* put_file_index(char* pOut, uint32_t index) {
    if (index >= 100) [[unlikely]]
        return put_decimal(pOut, index);
    *pOut++ = static_cast<char>('0' + index / 10);
    *pOut++ = static_cast<char>('0' + index % 10);
    return pOut;
}

// The file index counts as four columns, also where it takes more.
constexpr int INDEX_COLUMNS = 4;

void write_prefix(const trace_file* pTraceFile, const prefix_source& source) {
    char* pFields = stdout_begin_room(PREFIX_ROOM);
    int columns = 0;
    if (anchor.iNumberFiles > 1) {
        *pFields++ = '[';
        pFields = put_file_index(pFields, static_cast<uint32_t>(pTraceFile->index));
        *pFields++ = ']';
        columns = INDEX_COLUMNS;
    }
    char* pEnd = put_fields(pFields, source);
    columns += static_cast<int>(pEnd - pFields);
    stdout_end_room(pEnd);
    anchor.curColumn = static_cast<int16_t>(columns);
    anchor.headerIndent = static_cast<int16_t>(columns + 1);
}

void keep_latest_time(trace_file* pTraceFile, const timespec& time) {
    const timespec& latest = pTraceFile->modTime;
    if (time.tv_sec < latest.tv_sec ||
        (time.tv_sec == latest.tv_sec && time.tv_nsec <= latest.tv_nsec))
        return;
    // Field by field, as they were stored just now: a copy in one move would have
    // to wait for both stores.
    pTraceFile->modTime.tv_sec = time.tv_sec;
    pTraceFile->modTime.tv_nsec = time.tv_nsec;
    pTraceFile->timeStampIsValid = 1;
}

} // namespace

int output_start_rec(trace_file* pTraceFile, const char* pCompId, uint64_t threadId,
                     uint32_t funcId, uint32_t seqNumber, uint32_t offset, uint64_t timeStamp,
                     const cu_timeinfo* pTimeInfo) {
    output_abandon_rec();
    thread_info* pThread = get_thread_info(pTraceFile, threadId);
    if (pThread == nullptr)
        return 1;
    anchor.outputFlags |= OUTPUT_START_PENDING;
    anchor.pCurFile = pTraceFile;
    anchor.pCurThread = pThread;

    prefix_source source{{}, threadId, pCompId, funcId, seqNumber, offset};
    cu_cvt_time_platform_1(timeStamp, pTimeInfo, &source.time, pTraceFile->uPlatform);
    keep_latest_time(pTraceFile, source.time);
    write_prefix(pTraceFile, source);
    return 0;
}

void output_end_rec() {
    // A state left by an earlier record has no flag set and may belong to a file
    // that its reader has closed since; only an open record's is looked at.
    thread_info* pThread = anchor.pCurFile != nullptr ? anchor.pCurThread : nullptr;
    anchor.outputFlags &= static_cast<uint8_t>(~OUTPUT_START_PENDING);
    anchor.firstChar = 0;
    if (pThread != nullptr && (pThread->outputFlags & THREAD_NEST_AFTER) != 0) {
        if (pThread->nestingLevel < MAX_NESTING_LEVEL)
            pThread->nestingLevel++;
        pThread->outputFlags &= static_cast<uint16_t>(~THREAD_NEST_AFTER);
    }
    if (anchor.curColumn != 0)
        output_char('\n');
    if (pThread != nullptr && (pThread->outputFlags & THREAD_BLANK_LINE_AFTER) != 0) {
        output_char('\n');
        pThread->outputFlags &= static_cast<uint16_t>(~THREAD_BLANK_LINE_AFTER);
    }
    anchor.pCurFile = nullptr;
    anchor.headerIndent = 0;
    anchor.currentIndent = 0;
}
