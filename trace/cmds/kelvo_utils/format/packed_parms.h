// Finds parameters that are packed one behind the other, each at a multiple of
// its alignment counted from the first.
#pragma once

#include "parms.h"

#include <array>
#include <cstring>

/// How a packed parameter lies in its run.
struct packed_shape {
    uint8_t uAlignment;
    uint8_t uSize; ///< 0: a string or the rest of the run
};

/// By base type, for the traces of 64-bit programs.
inline constexpr std::array<packed_shape, PARM_BASE_MASK + 1> packedShapes64 = {{
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
    {1, 0},
    {1, 0},
}};

/// In the traces of 32-bit programs a long has the shape of an int.
inline constexpr std::array<packed_shape, PARM_BASE_MASK + 1> packedShapes32 = [] {
    auto shapes = packedShapes64;
    shapes[PARM_LONG] = shapes[PARM_INT];
    return shapes;
}();

/// The shapes by base type. `bAddr64`: the traced program ran in 64-bit mode.
constexpr const packed_shape* packed_shapes(int bAddr64) {
    return bAddr64 ? packedShapes64.data() : packedShapes32.data();
}

/// Where a parameter that begins at `uFrom` at the earliest is aligned.
constexpr size_t align_parm(size_t uFrom, const packed_shape& shape) {
    const size_t uMask = shape.uAlignment - size_t{1};
    return (uFrom + uMask) & ~uMask;
}

/// Takes the parameters off a run of bytes in their order.
class packed_parms {
public:
    /// `uUsed`: bytes of the parameters that were taken before.
    packed_parms(trace_bytes run, int bAddr64, size_t uUsed = 0)
        : m_run(run), m_pShapes(packed_shapes(bAddr64)), m_uUsed(uUsed) {}

    /// Finds the next parameter. Returns false, and takes nothing, when it does
    /// not lie wholly inside the run.
    bool take(parm_type_t type, parm_ref* pParm) {
        const packed_shape& shape = m_pShapes[base_type(type)];
        const size_t uStart = align_parm(m_uUsed, shape);
        const size_t uSize = shape.uSize != 0 ? shape.uSize : unfixed_size(base_type(type));
        if (!lies_inside(m_run, uStart, uSize))
            return false;
        pParm->bytes = m_run.subspan(uStart);
        pParm->uStringLimit = static_cast<uint32_t>(uSize);
        m_uUsed = uStart + uSize;
        return true;
    }

    /// The bytes behind the last parameter taken.
    trace_bytes rest() const {
        return load_run(m_run, m_uUsed);
    }

private:
    /// Size of a string with its NUL (without one, more than there is), or of the
    /// rest of the run.
    size_t unfixed_size(parm_type_t base) const {
        const trace_bytes left = rest();
        if (base != PARM_STRING)
            return base == PARM_REST ? left.size() : 0;
        if (left.empty())
            return 1;
        return strnlen(reinterpret_cast<const char*>(left.data()), left.size()) + 1;
    }

    trace_bytes m_run;
    const packed_shape* m_pShapes;
    size_t m_uUsed;
};
