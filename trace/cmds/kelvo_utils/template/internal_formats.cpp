#include "internal_formats.h"

#include "compile.h"

fmtList internalFormats[numInternalFormats] = {
    {nullptr, " ******************* Trace Started - Pid = %d **********************"},
    {nullptr, " ***** Trace restarting after client core dump -  Pid = %d ***** "},
};

format_entry* get_internal_format(uint32_t trace_id) {
    if (trace_id >= numInternalFormats)
        return nullptr;
    fmtList& row = internalFormats[trace_id];
    if (row.pEntry == nullptr)
        row.pEntry = parse_format_string(row.pFormatString, nullptr);
    return row.pEntry;
}
