#pragma once

#include "options.h"

/// The run after the command line was read: signals, pool, files, merge,
/// totals. Returns the exit status.
int run(command_line& command);
