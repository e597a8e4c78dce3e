// Templates that were all read in advance (load_all_template_files, store.h)
// and lie in a search tree. It compares the second to fourth characters of a
// component id only: ids that differ in the first share a template.
// Main thread only.
#pragma once

#include "kelvo.h"

/// 1 once the preload has run; then only the tree is asked.
extern int trace_template_files_were_preloaded;

/// Root of the tree of template_file records, for the tsearch family.
extern void* preloaded_template_file_tree;

/// The preloaded template that answers for the component (4 characters), or null.
template_file* find_preloaded_template(const char* compId);

/// Releases the tree with its templates and returns to on-demand mode.
void free_preloaded_templates();
