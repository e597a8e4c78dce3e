#include "write_all.h"

#include <cerrno>
#include <csignal>
#include <poll.h>
#include <unistd.h>

namespace {

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

int write_all(int fd, std::string_view text) {
    background_write background;
    while (!text.empty()) {
        const ssize_t written = write(fd, text.data(), text.size());
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
