#include "broken_pipe.h"

#include <cerrno>
#include <ctime>
#include <unistd.h>

broken_pipe_guard::broken_pipe_guard() {
    sigset_t pending;
    sigpending(&pending);
    m_bPendingBefore = sigismember(&pending, SIGPIPE) == 1;
    sigemptyset(&m_pipe);
    sigaddset(&m_pipe, SIGPIPE);
    pthread_sigmask(SIG_BLOCK, &m_pipe, &m_previousMask);
}

broken_pipe_guard::~broken_pipe_guard() {
    const int savedErrno = errno;
    const timespec atOnce{};
    siginfo_t info;
    // A thread's own signals are taken before those of the process.
    if (!m_bPendingBefore && sigtimedwait(&m_pipe, &info, &atOnce) == SIGPIPE &&
        info.si_pid != getpid())
        kill(getpid(), SIGPIPE);
    pthread_sigmask(SIG_SETMASK, &m_previousMask, nullptr);
    errno = savedErrno;
}
