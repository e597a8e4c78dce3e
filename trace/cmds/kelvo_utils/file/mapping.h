#pragma once

#include "kelvo.h"

/// Gives the mapping back; pHeader, pMapEnd and pWrap become null. The file must
/// be mapped.
void unmap_trace_file(trace_file* pTraceFile);
