// Which file a path or a descriptor stands for, and the accepted files of the run by
// that.
#pragma once

#include "kelvo.h"

#include <sys/types.h>

struct file_status {
    file_identity identity;
    uint64_t uSize;
    bool bRegular; ///< what is not has no size that counts
};

/// The inode of a file that is removed may be given to the next one that is made; the
/// time of birth, where it is known, tells the two apart.
bool is_same_file(const file_identity& a, const file_identity& b);

/// Of what the path names; nothing is opened. False with errno.
bool status_of_path(const char* pName, file_status* pStatus);

/// Of what is open as `fd`. False with errno.
bool status_of_descriptor(int fd, file_status* pStatus);

// The table of accepted files. Main thread only; looking a file up costs the same
// however many there are.

/// The first accepted file of that identity that is not released yet, or null.
trace_file* find_accepted_file(const file_identity& identity);

/// Enters a file whose identity no file of the table has.
void enter_accepted_file(trace_file* pTraceFile);

/// Takes the file out of the table if it is there.
void forget_accepted_file(trace_file* pTraceFile);
