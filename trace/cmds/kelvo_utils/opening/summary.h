// What is printed about a file when it is opened. Main thread.
#pragma once

#include "kelvo.h"

/// Prints the header display. The file is named in it when it is the only one
/// of `total_files`; the others are named before they are opened. Texts of the
/// header are printed as they are, up to their NUL or their width.
void print_file_summary(const char* pName, const trace_file_header& header,
                        unsigned int total_files);

/// Prints the base program name as a line.
void print_base_program_name(const trace_file_header& header);
