// How an attempt to open a trace file ended. Nothing is printed by what returns
// one: report_open_failure says it, once no lock is held.
#pragma once

#include "kelvo.h"

enum open_outcome : int {
    OPEN_OK = 0,
    OPEN_REFUSED, ///< by open
    OPEN_IN_USE,  ///< by another process, or by this one in follow mode
    OPEN_LOCK_FAILED,
    OPEN_NO_STATUS,
    OPEN_TOO_SMALL,    ///< or no regular file
    OPEN_NOT_MAPPABLE, ///< permissions, or a network file system
    OPEN_NO_MEMORY,
    OPEN_NO_TRACE_FILE, ///< the header is not valid, or there is no room for a record
    OPEN_REPLACED,      ///< the path names another file than before
};

struct open_result {
    open_outcome eOutcome = OPEN_OK;
    int iErrno = 0;    ///< of the call that failed
    int64_t iSize = 0; ///< that there was no memory for
};

/// Writes the message of a failure. Any thread.
void report_open_failure(const char* pName, const open_result& result);
