// Finds parameters that are packed one behind the other, each at a multiple of
// its alignment counted from the first.
#pragma once

#include "parms.h"

#include <cstring>

/// Takes the parameters off a run of bytes in their order.
class packed_parms {
public:
    /// `uUsed`: bytes of the parameters that were taken before.
    packed_parms(trace_bytes run, int bAddr64, size_t uUsed = 0)
        : m_run(run), m_rows(parm_rows_of(bAddr64)), m_uUsed(uUsed) {}

    /// Finds the next parameter. Returns false, and takes nothing, when it does
    /// not lie wholly inside the run.
    bool take(parm_type_t type, parm_ref* pParm) {
        const parm_row& row = m_rows[base_type(type)];
        const size_t uStart = align_parm(m_uUsed, row);
        const size_t uSize = row.uSize != 0 ? row.uSize : unfixed_size(base_type(type));
        if (!lies_inside(m_run, uStart, uSize))
            return false;
        *pParm = make_parm_ref(m_run.subspan(uStart), uSize);
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
    const parm_rows& m_rows;
    size_t m_uUsed;
};
