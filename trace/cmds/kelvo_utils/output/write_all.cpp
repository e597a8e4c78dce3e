#include "write_all.h"

#include "broken_pipe.h"
#include "handover.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <climits>
#include <csignal>
#include <optional>
#include <poll.h>
#include <unistd.h>

namespace {

constexpr int PATIENCE_MS = 100; // an output that takes nothing for so long stands still

std::atomic<int> iMainThreadWritesTo{-1}; // descriptor; -1: it does not write
std::atomic<bool> bOnlyWhileItMoves{false};
static_assert(std::atomic<int>::is_always_lock_free && std::atomic<bool>::is_always_lock_free,
              "used in signal handlers");

// Blocks SIGTTOU in this thread from block() on until the end of its life.
//
// A write to a terminal from a background process is refused with SIGTTOU and
// EINTR. The handler has taken note by then, and the text is still to be shown,
// but an unblocked retry would be refused again for ever. With the signal
// blocked the terminal takes the text.
class background_write {
public:
    background_write() = default;
    background_write(const background_write&) = delete;
    background_write& operator=(const background_write&) = delete;
    ~background_write() {
        if (bBlocked)
            pthread_sigmask(SIG_SETMASK, &previousMask, nullptr);
    }

    void block() {
        if (bBlocked)
            return;
        sigset_t mask;
        sigemptyset(&mask);
        sigaddset(&mask, SIGTTOU);
        bBlocked = pthread_sigmask(SIG_BLOCK, &mask, &previousMask) == 0;
    }

private:
    sigset_t previousMask{};
    bool bBlocked = false;
};

// Lets the signal handler know what the main thread writes to.
class main_thread_write {
public:
    explicit main_thread_write(int fd) : bMainThread(owns_standard_output()) {
        if (bMainThread)
            iMainThreadWritesTo = fd;
    }
    main_thread_write(const main_thread_write&) = delete;
    main_thread_write& operator=(const main_thread_write&) = delete;
    ~main_thread_write() {
        if (bMainThread)
            iMainThreadWritesTo = -1;
    }

    const bool bMainThread;
};

void end_unless_it_moves(int fd) {
    pollfd request{fd, POLLOUT, 0};
    if (poll(&request, 1, PATIENCE_MS) == 0)
        _exit(0);
}

// Waits until `fd` takes text again. Returns 0 or an errno.
int wait_until_writable(int fd) {
    pollfd request{fd, POLLOUT, 0};
    while (poll(&request, 1, -1) < 0) {
        if (errno != EINTR)
            return errno;
    }
    return 0;
}

} // namespace

bool write_only_while_output_moves() {
    // In this order: a write that begins meanwhile sees the one or is seen.
    bOnlyWhileItMoves = true;
    const int fd = iMainThreadWritesTo;
    if (fd < 0)
        return false;
    end_unless_it_moves(fd);
    return true;
}

int write_all(int fd, std::string_view text) {
    const main_thread_write mark(fd);
    background_write background;
    std::optional<broken_pipe_guard> quiet;
    if (fd == STDERR_FILENO)
        quiet.emplace();
    while (!text.empty()) {
        size_t size = text.size();
        if (mark.bMainThread && bOnlyWhileItMoves) {
            end_unless_it_moves(fd);
            size = std::min<size_t>(size, PIPE_BUF); // a pipe that takes any takes this whole
        }
        const ssize_t written = write(fd, text.data(), size);
        if (written > 0) {
            text.remove_prefix(static_cast<size_t>(written));
        } else if (written == 0) {
            return EIO; // a device that takes nothing and says nothing
        } else if (errno == EINTR) {
            background.block();
        } else if (errno == EAGAIN || errno == EWOULDBLOCK) {
            if (const int error = wait_until_writable(fd); error != 0)
                return error;
        } else {
            return errno;
        }
    }
    return 0;
}
