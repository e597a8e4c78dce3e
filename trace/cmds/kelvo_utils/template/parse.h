// Reads a template file: entries of trace id, block id and format string.
#pragma once

#include "kelvo.h"

#include <cstdio>

/// Parses `pFile` into pTemplateFile->pFormats. `pFileName` is for messages.
/// Returns 0 when the file was read to its end (entries may have been skipped
/// with messages), 1 when a format string failed to compile or memory ran out.
/// *p_insufficient_resources is set to 1 only when the format buffer could not
/// grow, else to 0. Main thread; one parse at a time.
int parse_template_file(template_file* pTemplateFile, const char* pFileName, FILE* pFile,
                        int* p_insufficient_resources);
