// The text of a format with its parameters. Main thread only; nothing is
// allocated.
#pragma once

#include "parms.h"

/// Writes the format's text with its parameters, ending with a newline.
/// `pList` may be null when there are none. `bAddr64`: the traced program ran in
/// 64-bit mode.
void format_parms(const format_entry* pFormatEntry, const parm_list* pList, int bAddr64);

/// The same with the parameters that are packed into `*pRun`; moves `*pRun` past
/// the bytes that they take.
void format_packed_parms(const format_entry* pFormatEntry, trace_bytes* pRun, int bAddr64);
