// Parameters of a format: where they lie in the bytes of a record, and what they hold.
// Main thread only; nothing is allocated.
#pragma once

#include "kelvo.h"
#include "parm_types.h"
#include "trace_load.h"

#include <string_view>

/// Where one parameter lies. Trivial, so that a list of them costs nothing to set up.
struct parm_ref {
    const std::byte* pBytes; ///< the parameter's first byte
    uint32_t uSize;          ///< bytes that may be read there
    uint32_t uStringLimit;   ///< a string ends here at the latest, bytes; at its NUL before

    trace_bytes bytes() const {
        return {pBytes, uSize};
    }
};

inline parm_ref make_parm_ref(trace_bytes bytes, size_t uStringLimit) {
    return {bytes.data(), static_cast<uint32_t>(bytes.size()), static_cast<uint32_t>(uStringLimit)};
}

/// Parameters of one format, found in a record.
struct parm_list {
    parm_ref pParms[MAX_PARMS];
    int numParms; ///< those from here on are missing
};

enum value_kind : uint8_t {
    VALUE_SIGNED,
    VALUE_UNSIGNED, ///< also of a character
    VALUE_REAL,
    VALUE_STRING,
    VALUE_BYTES, ///< of a resource handle, or the rest of the data
    VALUE_TRACE_ID,
};

/// What a parameter holds.
struct parm_value {
    value_kind kind;
    uint64_t uInteger =
        0; ///< VALUE_SIGNED, VALUE_UNSIGNED, VALUE_TRACE_ID; with its sign in 64 bits
    double real = 0;
    std::string_view string{};
    trace_bytes bytes{};
};

/// The value of a parameter of type `type`. One that overruns its record is 0.
/// `bAddr64`: the traced program ran in 64-bit mode.
parm_value decode_parm(parm_type_t type, const parm_ref& parm, int bAddr64);

/// The string that a parameter holds.
std::string_view parm_string(const parm_ref& parm);

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
