#pragma once

#include "options.h"

/// The run after the command line was read: signals, templates, pool, files,
/// merge, totals, clean-up. Returns the exit status; what was written to
/// standard output may still be buffered. Main thread.
int run(const command_line& command);
