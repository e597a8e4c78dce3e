// Finds parameters that are packed one behind the other, each at a multiple of
// its alignment counted from the first.
#pragma once

#include "parms.h"

#include <algorithm>

/// How a packed parameter lies in its run.
struct packed_shape {
    uint8_t uAlignment;
    uint8_t uSize;
};

/// By base type. Strings and the rest have no fixed size; a long has the shape
/// of an int in a 32-bit file.
inline constexpr packed_shape packedShapes[PARM_BASE_MASK + 1] = {
    {1, 0},  // 0
    {1, 1},  // PARM_CHAR
    {2, 2},  // PARM_SHORT
    {4, 4},  // PARM_INT
    {8, 8},  // PARM_LONG
    {8, 8},  // PARM_LONGLONG
    {8, 8},  // PARM_DOUBLE
    {8, 8},  // PARM_LONGDOUBLE
    {1, 0},  // PARM_STRING
    {4, 20}, // PARM_RESOURCE_HANDLE
    {4, 4},  // PARM_FLOAT
    {1, 0},  // PARM_REST
    {4, 4},  // PARM_TRACE_ID
    {1, 0},  // unused codes
    {1, 0},  {1, 0},
};

/// Takes the parameters off a run of bytes in their order.
class packed_parms {
public:
    /// `bAddr64`: the traced program ran in 64-bit mode.
    packed_parms(trace_bytes run, int bAddr64) : m_run(run), m_bAddr64(bAddr64) {}

    /// Finds the next parameter. Returns false, and takes nothing, when it does
    /// not lie wholly inside the run.
    bool take(parm_type_t type, parm_ref* pParm) {
        const parm_type_t base = base_type(type);
        const bool bShortLong = base == PARM_LONG && !m_bAddr64;
        const packed_shape& shape = bShortLong ? packedShapes[PARM_INT] : packedShapes[base];
        const size_t uMask = shape.uAlignment - size_t{1};
        const size_t uStart = (m_uUsed + uMask) & ~uMask;
        const trace_bytes rest = load_run(m_run, uStart);
        size_t uSize = shape.uSize;
        if (base == PARM_STRING)
            uSize = string_size(rest);
        else if (base == PARM_REST)
            uSize = rest.size();
        if (!lies_inside(m_run, uStart, uSize))
            return false;
        pParm->bytes = rest;
        pParm->uStringLimit = static_cast<uint32_t>(uSize);
        m_uUsed = uStart + uSize;
        return true;
    }

    /// The bytes behind the last parameter taken.
    trace_bytes rest() const {
        return load_run(m_run, m_uUsed);
    }

private:
    /// Bytes that a string takes with its NUL; without one, more than there are.
    static size_t string_size(trace_bytes bytes) {
        if (bytes.empty())
            return 1;
        return strnlen(reinterpret_cast<const char*>(bytes.data()), bytes.size()) + 1;
    }

    trace_bytes m_run;
    int m_bAddr64;
    size_t m_uUsed = 0;
};
