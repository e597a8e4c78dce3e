// Parameters of a format: where they lie in the bytes of a record. Main thread
// only; nothing is allocated.
#pragma once

#include "kelvo.h"
#include "trace_load.h"

/// Where one parameter lies. Reads go by load(), so a parameter that overruns
/// its record reads as 0.
struct parm_ref {
    trace_bytes bytes;     ///< from the parameter's first byte to the end of what may be read
    uint32_t uStringLimit; ///< a string ends here at the latest, bytes; at its NUL before
};

/// The base of a type code, without PARM_UNSIGNED.
constexpr parm_type_t base_type(parm_type_t type) {
    return type & PARM_BASE_MASK;
}

/// Parameters of one format, found in a record.
struct parm_list {
    parm_ref pParms[MAX_PARMS];
    int numParms; ///< those from here on are missing
};

/// Takes the first block off `*pBlocks`, the bytes from a block's start to the
/// end of the record, and stores its data. Returns false when there is no
/// block: its length does not lie inside. A block whose length is negative or
/// leads beyond the end is the last one and is cut at the end.
bool take_data_block(trace_bytes* pBlocks, trace_bytes* pData);

/// Finds the parameters packed into `*pRun` and moves `*pRun` past the bytes
/// that they took. `bAddr64`: the traced program ran in 64-bit mode.
void bld_parm_list_packed(const format_entry* pFormatEntry, trace_bytes* pRun, int bAddr64,
                          parm_list* pList);

/// Finds the parameters in the blocks of a data record, one per block.
/// `*pBlocks` are the bytes from the first block to the end of the record and
/// is moved past the blocks used; `numBlocks` is the count as written.
/// Integers taken from short blocks are kept in a table that the next call
/// uses anew.
void bld_parm_list_unpacked(const format_entry* pFormatEntry, trace_bytes* pBlocks,
                            uint32_t numBlocks, parm_list* pList);
