#pragma once

#include "trace_load.h"

/// Writes a hex dump of `data`, 16 bytes to a line, starting on a fresh line.
void format_hex(trace_bytes data);
