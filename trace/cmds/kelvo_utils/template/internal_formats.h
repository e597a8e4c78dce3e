// The formats of the tracing library's own records. Main thread only.
#pragma once

#include "kelvo.h"

#include <string_view>

/// The component that the internal formats belong to; it has no template file.
inline constexpr std::string_view INTERNAL_COMPONENT = TRC_COMP_INTERNAL;

struct fmtList {
    format_entry* pEntry; ///< null until first used; kept to the end of the process
    const char* pFormatString;
};

inline constexpr uint32_t numInternalFormats = 2;

/// By trace id.
extern fmtList internalFormats[numInternalFormats];

/// The internal format of `trace_id`, compiled at its first use, or null.
format_entry* get_internal_format(uint32_t trace_id);
