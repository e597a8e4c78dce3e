// What is known of the types of parameters, the PARM_* of kelvo.h: how each lies in a
// packed run of a record, and as what printf can take it. A new type is one row.
#pragma once

#include "kelvo.h"

#include <array>

/// The base of a type code, without PARM_UNSIGNED.
constexpr parm_type_t base_type(parm_type_t type) {
    return type & PARM_BASE_MASK;
}

/// What kind of argument printf reads for a letter. Characters and short integers
/// are passed as int, which "%c" and "%d" both read.
enum argument_class : uint8_t {
    ARGUMENT_NONE = 0,
    ARGUMENT_INTEGER = 0x01,
    ARGUMENT_CHARACTER = 0x02,
    ARGUMENT_POINTER = 0x04,
    ARGUMENT_REAL = 0x08,
    ARGUMENT_STRING = 0x10,
    ARGUMENT_INT = ARGUMENT_INTEGER | ARGUMENT_CHARACTER,
    ARGUMENT_LONG = ARGUMENT_INTEGER | ARGUMENT_POINTER,
};

struct parm_row {
    uint8_t uAlignment;       ///< of a packed parameter, counted from the first one
    uint8_t uSize;            ///< its bytes; 0: a string, or the rest of the run
    argument_class arguments; ///< as which it can be passed
};

using parm_rows = std::array<parm_row, PARM_BASE_MASK + 1>;

/// By base type, for the traces of 32-bit and of 64-bit programs.
inline constexpr std::array<parm_rows, 2> PARM_ROWS = [] {
    parm_rows rows = {{
        {1, 0, ARGUMENT_NONE},   // 0
        {1, 1, ARGUMENT_INT},    // PARM_CHAR
        {2, 2, ARGUMENT_INT},    // PARM_SHORT
        {4, 4, ARGUMENT_INT},    // PARM_INT
        {8, 8, ARGUMENT_LONG},   // PARM_LONG
        {8, 8, ARGUMENT_LONG},   // PARM_LONGLONG
        {8, 8, ARGUMENT_REAL},   // PARM_DOUBLE
        {8, 8, ARGUMENT_REAL},   // PARM_LONGDOUBLE
        {1, 0, ARGUMENT_STRING}, // PARM_STRING
        {4, 20, ARGUMENT_NONE},  // PARM_RESOURCE_HANDLE
        {4, 4, ARGUMENT_REAL},   // PARM_FLOAT
        {1, 0, ARGUMENT_NONE},   // PARM_REST
        {4, 4, ARGUMENT_NONE},   // PARM_TRACE_ID
        {1, 0, ARGUMENT_NONE},   // unused codes
        {1, 0, ARGUMENT_NONE},
        {1, 0, ARGUMENT_NONE},
    }};
    std::array<parm_rows, 2> both = {rows, rows};
    both[false][PARM_LONG] = {4, 4, ARGUMENT_LONG};
    return both;
}();

/// The rows by base type. `bAddr64`: the traced program ran in 64-bit mode.
constexpr const parm_rows& parm_rows_of(int bAddr64) {
    return PARM_ROWS[bAddr64 != 0];
}

/// Where a parameter that begins at `uFrom` at the earliest is aligned.
constexpr size_t align_parm(size_t uFrom, const parm_row& row) {
    const size_t uMask = row.uAlignment - size_t{1};
    return (uFrom + uMask) & ~uMask;
}

/// How an integer or a character lies in a record.
enum integer_shape : uint8_t {
    INTEGER_CHAR,
    INTEGER_SIGNED_16,
    INTEGER_UNSIGNED_16,
    INTEGER_SIGNED_32,
    INTEGER_UNSIGNED_32,
    INTEGER_64,
};

/// The shape of a parameter of an integer type or of PARM_CHAR.
constexpr integer_shape shape_of_integer(parm_type_t type, int bAddr64) {
    const bool bUnsigned = type & PARM_UNSIGNED;
    switch (parm_rows_of(bAddr64)[base_type(type)].uSize) {
    case 1:
        return INTEGER_CHAR;
    case 2:
        return bUnsigned ? INTEGER_UNSIGNED_16 : INTEGER_SIGNED_16;
    case 4:
        return bUnsigned ? INTEGER_UNSIGNED_32 : INTEGER_SIGNED_32;
    default:
        return INTEGER_64;
    }
}
