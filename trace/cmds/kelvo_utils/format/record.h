// Turns one queued record into text. Main thread only.
#pragma once

#include "kelvo.h"

/// Writes the record. Returns 0, or 1 when memory ran out; the output record
/// may then be open, and the next one ends its line.
int format_record(trace_queue_element* pProcessThisElement);
