// What makes a file a trace file that can be read here, and what is taken from
// one that is. Works over plain memory.
#pragma once

#include "kelvo.h"

/// Whether a file of `uSize` bytes with this header is a trace file of a
/// version and a platform that can be read here. Says nothing about its record
/// area.
bool header_is_valid(const trace_file_header& header, uint32_t uSize);

/// Whether the record area of the mapped file has room for one record header.
bool record_area_is_usable(const trace_file* pTraceFile);

/// Takes what the record and the list element keep of the header (`header`, a
/// copy) and of the record area, which must be usable.
void take_header(trace_file* pTraceFile, const trace_file_header& header, TrcPreProcHdrElem* pElem);
