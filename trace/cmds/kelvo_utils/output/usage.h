#pragma once

/// Writes the usage text to standard output. Main thread.
void output_usage();
