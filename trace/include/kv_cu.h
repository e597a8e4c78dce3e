// Common utilities of the tracing system: the time base of a trace file, the
// error block of an error record, and the functions that turn both into what a
// person reads.
//
// Ownership: nothing here keeps a pointer that it is given. The one block that
// is handed out is the text of cu_get_errmsg_1, released by cu_rel_errmsg_1.
// All functions may be called from any thread.
#pragma once

#include <cstdint>
#include <ctime>

/// Time base of a trace file: what a raw time stamp is relative to.
/// Both words zero: raw stamps are nanoseconds since the epoch.
struct cu_timeinfo {
    uint64_t timeinfo1; ///< time of day at calibration, nanoseconds since the epoch
    uint64_t timeinfo2; ///< raw time stamp of the writer's clock at that moment, nanoseconds

    friend bool operator==(const cu_timeinfo&, const cu_timeinfo&) = default;
};
static_assert(sizeof(cu_timeinfo) == 16);

/// Signed 128-bit nanoseconds: no sum of a base and a raw stamp can wrap.
__extension__ typedef __int128 cu_nanoseconds;
inline constexpr cu_nanoseconds CU_NANOSECONDS_MAX =
    (static_cast<cu_nanoseconds>(INT64_MAX) << 64) | static_cast<cu_nanoseconds>(UINT64_MAX);

/// Exact time of the raw stamp `timeStamp` under `base`, in nanoseconds since
/// the epoch (negative before it). Rises with `timeStamp` for a fixed base.
constexpr cu_nanoseconds cu_time_ns(uint64_t timeStamp, const cu_timeinfo& base) {
    return static_cast<cu_nanoseconds>(base.timeinfo1) + static_cast<cu_nanoseconds>(timeStamp) -
           static_cast<cu_nanoseconds>(base.timeinfo2);
}

/// Converts a raw time stamp into seconds since the epoch and nanoseconds
/// (0 <= tv_nsec < 1000000000, also before the epoch). `platform` is the
/// writer's platform code; all of them count nanoseconds. Returns 0.
int cu_cvt_time_platform_1(uint64_t timeStamp, const cu_timeinfo* pTimeInfo, timespec* pResult,
                           unsigned int platform);

/// Type codes of cu_error_arg_t.
enum cu_error_arg_type : int32_t {
    CU_ERROR_ARG_INT = 0,
    CU_ERROR_ARG_LONG = 1,
    CU_ERROR_ARG_LONG_LONG = 2,
    CU_ERROR_ARG_DOUBLE = 3,
    CU_ERROR_ARG_RESERVED = 4,
    CU_ERROR_ARG_CHAR_STR = 5,
    CU_ERROR_ARG_VOID_PTR = 6,
};

/// One argument of an error message, as it also stands in an error record.
struct cu_error_arg_t {
    int32_t cu_arg_type; ///< a cu_error_arg_type
    int32_t cu_arg_pad;  ///< not interpreted
    union {
        int32_t cu_arg_int;
        int64_t cu_arg_long;
        int64_t cu_arg_long_long;
        double cu_arg_double;
        const char* cu_arg_char_str; ///< in memory; in a record: offset of the string in the record
        void* cu_arg_void_ptr;
    } cu_arg_value;
};
static_assert(sizeof(cu_error_arg_t) == 16);

/// An error as the traced program saw it. Text pointers may be null.
struct cu_error_t {
    int32_t cu_error_id;
    char* cu_ffdc_id;
    char* cu_msg_cat;     ///< name of the message catalogue
    int32_t cu_msg_set;   ///< set in the catalogue
    int32_t cu_msg_num;   ///< message in the set
    char* cu_msg_default; ///< printf-style text used when the catalogue has none
    uint32_t cu_arg_cnt;
    cu_error_arg_t* cu_args; ///< cu_arg_cnt elements; may be null when that is 0
};

/// Builds the message text of an error block: the catalogue's text, else the
/// default text, with the arguments inserted by their own types. Stores the
/// text, or null when there is none or memory ran out, through `message`.
/// Returns 0 when there is a text, else -1. The caller releases the text with
/// cu_rel_errmsg_1. `errorBlk` and the texts behind it must stay valid only
/// during the call.
int cu_get_errmsg_1(const cu_error_t* errorBlk, char** message);

/// Releases a text of cu_get_errmsg_1; null is allowed. Returns 0.
int cu_rel_errmsg_1(char* pMessage);
