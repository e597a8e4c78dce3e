// Most formats begin with some text and numbers, and that is most of what is
// written at all. Where the parameters of such numbers lie in a packed run is the
// same for every record, so it is worked out once for a format. The numbers are
// then written in one go, straight to where the stream collects its bytes. Main
// thread only.
#pragma once

#include "kelvo.h"
#include "trace_load.h"

/// Writes the leading numbers of a format that uses its parameters in order, with
/// the text before each. Returns how many conversions are done with that, and
/// stores how many bytes of `run` they took: both 0, and nothing written, where
/// the run is too short for all of them.
size_t write_leading_numbers(const format_entry& entry, trace_bytes run, int bAddr64,
                             size_t* puUsed);
