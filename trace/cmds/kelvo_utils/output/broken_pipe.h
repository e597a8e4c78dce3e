// Writing to a pipe whose reader may have gone, without the signal.
#pragma once

#include <csignal>

/// While it lives, SIGPIPE is blocked in this thread, and one that a write of this
/// thread has caused is taken back at the end. One that somebody has sent keeps
/// its effect. Any thread.
class broken_pipe_guard {
public:
    broken_pipe_guard();
    broken_pipe_guard(const broken_pipe_guard&) = delete;
    broken_pipe_guard& operator=(const broken_pipe_guard&) = delete;
    ~broken_pipe_guard();

private:
    sigset_t m_pipe;
    sigset_t m_previousMask;
    bool m_bPendingBefore;
};
