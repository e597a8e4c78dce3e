#include "open_result.h"

#include "insufficient.h"
#include "messages.h"
#include "print.h"

void report_open_failure(const char* pName, const open_result& result) {
    const char* const pProgram = anchor.pProgName;
    switch (result.eOutcome) {
    case OPEN_OK:
        break;
    case OPEN_REFUSED:
        output_sys_message("%s: 2625-102 Error opening file \"%s\",", result.iErrno, pProgram,
                           pName);
        break;
    case OPEN_IN_USE:
        output_message("%s: 2625-161 Trace file \"%s\" is already in use.\n", pProgram, pName);
        break;
    case OPEN_LOCK_FAILED:
        output_sys_message(
            "%s: 2625-162 Error returned from fcntl() attempting to lock trace file, ",
            result.iErrno, pProgram);
        break;
    case OPEN_NO_STATUS:
        output_sys_message("%s: 2625-104 Error retrieving information about file \"%s\", ",
                           result.iErrno, pProgram, pName);
        break;
    case OPEN_TOO_SMALL:
        output_err_message("%s: 2625-105 File \"%s\" is too small to be a trace file.\n", pProgram,
                           pName);
        break;
    case OPEN_NOT_MAPPABLE:
        output_message("%s: 2625-180 Either file permissions are too restrictive, or the "
                       "trace file must be copied outside of NFS to be used.\n ",
                       pProgram);
        break;
    case OPEN_NO_MEMORY:
        warn_insufficient_resources_during_open(pName, result.iSize);
        break;
    case OPEN_NO_TRACE_FILE:
        output_err_message("%s: 2625-107 File \"%s\" is not a valid trace file.\n", pProgram,
                           pName);
        break;
    case OPEN_REPLACED:
        output_err_message("%s: 2625-164 File \"%s\" was replaced before it was read.\n", pProgram,
                           pName);
        break;
    }
}
