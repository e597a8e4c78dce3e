// What opening a file argument adds to opening a trace file: its name and its summary
// on standard output, and of the first one the time zone and the start of output.
// Main thread.
#pragma once

#include "open.h"

/// Opens one file argument: prints its header summary, applies the first file's
/// time zone and start argument, and hands the new record out. Outside follow
/// mode the file comes back parked: unmapped, unlocked and closed.
///
/// `pElem` receives the header of the first record of the record area and,
/// outside follow mode, the converted time of the oldest record (bOldestKnown,
/// oldestTime); its other fields are the caller's. `total_files` is the number
/// of file arguments, `fileIndex` this one's position. With `bPrBaseProgName`
/// only the base program name is printed, the file is closed again untouched,
/// and the record handed out is null.
/// Returns 0, or -1 after a message (with -B perhaps without one); then nothing
/// is handed out and nothing stays open.
int open_trace_file(const char* pName, trace_file** ppTraceFile, TrcPreProcHdrElem* pElem,
                    int bPrBaseProgName, unsigned int total_files, unsigned int fileIndex);

/// Sets TZ from anchor.tz_offset, for all later local-time conversions of the
/// process. While no other thread converts times.
void set_tz();
