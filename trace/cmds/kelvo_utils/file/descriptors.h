// Descriptors of trace files, and how many the process may have.
#pragma once

/// Opens an existing file for `flags`, O_RDWR or O_RDONLY. The descriptor lies above
/// those of the standard streams and is closed in programs that are started. Waits
/// for nothing but the holder of a lease on a regular file, who has to give it back
/// within seconds. Returns -1 with errno. Any thread.
int open_descriptor(const char* pName, int flags);

/// Lets the process have as many descriptors as it may give itself: each running
/// file takes one. At the start of the program; where it fails, fewer files can be
/// open at once.
void raise_descriptor_limit();
