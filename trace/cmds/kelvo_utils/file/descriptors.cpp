#include "descriptors.h"

#include "identity.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/resource.h>
#include <unistd.h>

namespace {

/// A trace file on the number of a standard stream that came closed would be
/// printed into. Returns a number above them for the same file, or -1 with errno.
int above_standard_descriptors(int fd) {
    if (fd < 0 || fd > STDERR_FILENO)
        return fd;
    const int higher = fcntl(fd, F_DUPFD_CLOEXEC, STDERR_FILENO + 1);
    const int savedErrno = errno;
    close(fd);
    errno = savedErrno;
    return higher;
}

bool is_regular_file(const char* pName) {
    file_status status;
    return status_of_path(pName, &status) && status.bRegular;
}

} // namespace

int open_descriptor(const char* pName, int flags) {
    // O_NONBLOCK and O_NOCTTY keep the open of a terminal line or another device from
    // waiting or taking it over. To a regular file the first means that the open fails
    // while a lease is being called back: that is waited for.
    flags |= O_CLOEXEC | O_NOCTTY;
    int fd = open(pName, flags | O_NONBLOCK);
    if (fd < 0 && errno == EWOULDBLOCK && is_regular_file(pName))
        do
            fd = open(pName, flags);
        while (fd < 0 && errno == EINTR);
    return above_standard_descriptors(fd);
}

void raise_descriptor_limit() {
    rlimit limit{};
    if (getrlimit(RLIMIT_NOFILE, &limit) != 0 || limit.rlim_cur == limit.rlim_max)
        return;
    limit.rlim_cur = limit.rlim_max;
    setrlimit(RLIMIT_NOFILE, &limit);
}
