// The way of the usual conversions: a number, character or string with at most
// a width and zeros to fill it. Which conversions can go this way is found out
// once for each; they give the same text as the long way by conversion.h and
// field.h. Main thread only.
#pragma once

#include "conversion.h"
#include "kelvo.h"
#include "text_run.h"
#include "trace_load.h"

/// Settles how `conv`, which takes no width or precision from a parameter, is
/// written for a parameter of type `type`.
void choose_direct_writer(format_piece* pPiece, const conversion& conv, parm_type_t type);

/// Writes a number or a character whose writer is neither DIRECT_NONE nor
/// DIRECT_STRING.
void write_direct(text_run& out, const format_piece& piece, parm_type_t type, trace_bytes bytes,
                  int bAddr64);
