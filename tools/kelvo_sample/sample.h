// A run of kelvo_sample: the directory, its templates, its files, and what is
// said about them.
#pragma once

#include "options.h"

/// Makes what the options ask for. Returns the exit status; a message is
/// printed when it is not 0.
int make_sample(const sample_options& options);
