// Finds, loads, caches and releases templates. Main thread only, no locks.
#pragma once

#include "kelvo.h"

/// The format of `compId` (4 characters, not terminated), `trace_id` and
/// `block_id` (-1: the record as a whole), or null. The entry stays valid until
/// free_template_info. *p_insufficient_resources: 1 when the answer is null
/// because memory ran out, else 0.
format_entry* get_format_from_file(trace_file* pTraceFile, const char* compId, uint32_t trace_id,
                                   int block_id, int* p_insufficient_resources);

/// Searches the path for the component's file, reads it and puts the template
/// at the head of the on-demand list. Returns it (perhaps empty), or null when
/// the file was refused or memory ran out (then the flag is 1).
template_file* load_template_file(const char* compId, int* p_insufficient_resources);

/// Reads every template file on the path and answers only from them from then on.
void load_all_template_files();

/// Releases every template and its entries, in whichever mode is active.
void free_template_info();
