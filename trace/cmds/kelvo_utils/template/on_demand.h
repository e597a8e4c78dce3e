// Templates that are searched and read when their component is first met: the
// list anchor.pFirstTemplate. Loading itself is load_template_file (store.h).
// Main thread only.
#pragma once

#include "kelvo.h"

/// The template of the component (4 characters) if it was loaded, else null.
template_file* find_loaded_template(const char* compId);

/// Releases every template of the list.
void free_loaded_templates();
