#include "record_kinds.h"

#include "record_bodies.h"
#include "trace_file_fmt.h"

#include <iterator>

namespace {

constexpr uint32_t ID = offsetof(trace_record_id, id);
constexpr uint32_t VALUE = offsetof(trace_record_int32, value);
constexpr int NO_KEY = TEMPLATE_KEY_NONE;
constexpr int BODY_KEY = TEMPLATE_KEY_OF_BODY;

// The trace ids of the tracing library's own two formats.
constexpr int START_KEY = 0;
constexpr int RESTART_KEY = 1;

constexpr parameter_layout NO_DATA{};
constexpr parameter_layout INT32{VALUE, 4, 1, 0};
constexpr parameter_layout INT32_2{VALUE, 4, 2, 0};
constexpr parameter_layout INT64{VALUE, 8, 1, 0};
constexpr parameter_layout INT64_2{VALUE, 8, 2, 0};
constexpr parameter_layout PID{offsetof(trace_record_start, pid), 4, 1, 0};
constexpr parameter_layout ARRAY32{sizeof(trace_record_values), 4, 0,
                                   offsetof(trace_record_values, number)};
constexpr parameter_layout ARRAY64{sizeof(trace_record_values), 8, 0,
                                   offsetof(trace_record_values, number)};
constexpr parameter_layout STRING_AREA{sizeof(trace_record_strings), 1, 0,
                                       offsetof(trace_record_strings, len_strings)};

// clang-format off
/// Each row stands at its function code.
constexpr record_kind recordKinds[] = {
    {TRC_FUNC_FILLER,           0,  NO_KEY,      nullptr,            NO_DATA},
    {TRC_FUNC_ID,               ID, BODY_KEY,    write_values,       NO_DATA},
    {TRC_FUNC_STRING,           0,  NO_KEY,      write_string,       NO_DATA},
    {TRC_FUNC_DATA,             ID, NO_KEY,      write_data,         NO_DATA},
    {TRC_FUNC_INT32,            ID, BODY_KEY,    write_values,       INT32},
    {TRC_FUNC_INT32_2,          ID, BODY_KEY,    write_values,       INT32_2},
    {TRC_FUNC_UINT32,           ID, BODY_KEY,    write_values,       INT32},
    {TRC_FUNC_UINT32_2,         ID, BODY_KEY,    write_values,       INT32_2},
    {TRC_FUNC_INT64,            ID, BODY_KEY,    write_values,       INT64},
    {TRC_FUNC_INT64_2,          ID, BODY_KEY,    write_values,       INT64_2},
    {TRC_FUNC_UINT64,           ID, BODY_KEY,    write_values,       INT64},
    {TRC_FUNC_UINT64_2,         ID, BODY_KEY,    write_values,       INT64_2},
    {TRC_FUNC_VALUES,           ID, BODY_KEY,    write_value_array,  ARRAY32},
    {TRC_FUNC_VALUES64,         ID, BODY_KEY,    write_value_array,  ARRAY64},
    {TRC_FUNC_ERROR,            ID, BODY_KEY,    write_error,        NO_DATA},
    {TRC_FUNC_STRINGS,          ID, BODY_KEY,    write_string_array, STRING_AREA},
    {TRC_FUNC_START,            ID, START_KEY,   write_start,        PID},
    {TRC_FUNC_TIME_CALIBRATION, 0,  NO_KEY,      nullptr,            NO_DATA},
    {18,                        0,  NO_KEY,      nullptr,            NO_DATA},
    {TRC_FUNC_RESTART,          ID, RESTART_KEY, write_start,        PID},
};
constexpr record_kind discardedKind =
    {TRC_FUNC_DISCARDED,        0,  NO_KEY,      write_discarded,    NO_DATA};
// clang-format on

constexpr bool rows_stand_at_their_code() {
    for (size_t i = 0; i < std::size(recordKinds); i++) {
        if (recordKinds[i].uFunction != i)
            return false;
    }
    return true;
}
static_assert(rows_stand_at_their_code());

constexpr const record_kind* row_of(uint16_t uFunction) {
    if (uFunction < std::size(recordKinds))
        return &recordKinds[uFunction];
    return uFunction == TRC_FUNC_DISCARDED ? &discardedKind : nullptr;
}

constexpr bool every_kind_has_a_row() {
    for (const trc_kind& kind : TRC_KINDS) {
        if (trc_kind_is_valid(kind.function) && row_of(kind.function) == nullptr)
            return false;
    }
    return true;
}
static_assert(every_kind_has_a_row());

// One offset serves all bodies: it is where every kind keeps its trace id.
static_assert(offsetof(trace_record_data, trace_id) == ID &&
              offsetof(trace_record_int32, trace_id) == ID &&
              offsetof(trace_record_values, id) == ID && offsetof(trace_record_strings, id) == ID &&
              offsetof(trace_record_error, traceId) == ID &&
              offsetof(trace_record_start, traceId) == ID);

} // namespace

const record_kind* find_record_kind(uint16_t uFunction) {
    return trc_kind_is_valid(uFunction) ? row_of(uFunction) : nullptr;
}

uint32_t element_count(const record_view& record) {
    const parameter_layout& data = record.pKind->data;
    return data.uCountOffset ? load<uint32_t>(record.bytes, data.uCountOffset) : data.uCount;
}

trace_bytes parameter_data(const record_view& record) {
    const parameter_layout& data = record.pKind->data;
    const uint64_t uSize = uint64_t{data.uElementSize} * element_count(record);
    return load_run(record.bytes, data.uOffset, static_cast<size_t>(uSize));
}
