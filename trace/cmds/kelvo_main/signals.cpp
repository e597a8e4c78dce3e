// How a note and a jump share the work. `bMainThreadWaits` is raised before the
// last look at the note and lowered after the wait, so a signal either comes
// before the look, which then finds its note, or later, and its handler jumps.
// In between the main thread is in system calls alone, nothing is half done.
//
// How a fault on a reader thread ends the process. The reader's handler sends
// the signal to the main thread and returns into the same fault, again and
// again. The main thread can take the signal anywhere, also inside a blocked
// write or a mutex; its handler installs the previous disposition, under which
// the next fault ends the process. The handlers need no lock and no memory.
#include "signals.h"

#include "cleanup.h"
#include "kelvo.h"
#include "messages.h"
#include "write_all.h"

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <ctime>
#include <iterator>
#include <poll.h>
#include <unistd.h>

namespace {

constexpr int FAULT_SIGNALS[] = {SIGILL, SIGBUS, SIGFPE, SIGSEGV};
constexpr int TERMINATING_SIGNALS[] = {SIGINT, SIGQUIT, SIGTSTP, SIGTTIN, SIGTTOU, SIGPIPE};

/// How often a reader passes its fault on, a millisecond apart, before it ends
/// the process itself: the main thread, on its way out with all signals blocked,
/// may be waiting for a pipe.
constexpr int MOST_FORWARDED_FAULTS = 500;

/// How old the first terminating signal has to be for a second one to end the
/// process in the middle of its work: the main thread may be waiting for another
/// one, which waits for an output.
constexpr int64_t LONGEST_WORK_MS = 1000;

std::atomic<int> iPendingSignal{0};
std::atomic<int64_t> iFirstSignalMs{0}; // when the first terminating signal came; 0: none has
std::atomic<bool> bJumped{false};
std::atomic<bool> bMainThreadWaits{false};
std::atomic<int> iReaderFault{0}; // signal of a fault that recurs on another thread
std::atomic<int> iForwardedFaults{0};
static_assert(std::atomic<int>::is_always_lock_free && std::atomic<bool>::is_always_lock_free &&
                  std::atomic<int64_t>::is_always_lock_free,
              "used in signal handlers");

bool on_main_thread() {
    return pthread_equal(pthread_self(), anchor.threadId) != 0;
}

[[noreturn]] void jump_to_end(int signo) {
    bMainThreadWaits = false;
    iPendingSignal = 0;
    bJumped = true;
    bReadersMayRun = true;
    siglongjmp(anchor.sigbuf, signo);
}

int64_t now_ms() {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return now.tv_sec * int64_t{1000} + now.tv_nsec / 1'000'000;
}

/// Lets nothing that stands still hold up the end that was asked for again.
void insist_on_end() {
    if (!write_only_while_output_moves() && now_ms() - iFirstSignalMs > LONGEST_WORK_MS)
        _exit(0);
}

void handle_terminating_signal(int signo) {
    if (!on_main_thread()) {
        pthread_kill(anchor.threadId, signo);
        return;
    }
    const bool bFirst = iFirstSignalMs == 0;
    if (bFirst)
        iFirstSignalMs = now_ms();
    if (bMainThreadWaits)
        jump_to_end(signo);
    if (!bJumped)
        iPendingSignal = signo;
    if (!bFirst)
        insist_on_end();
}

/// Whether the signal comes from the instruction that the thread executes, and
/// will come again; otherwise somebody has sent it.
bool recurs(const siginfo_t* pInfo) {
    return pInfo->si_code > 0;
}

/// Lets the signal have the effect that it had before the run. A fault takes it
/// when it recurs, on the thread that is to blame; a signal that was sent is
/// repeated.
void restore_disposition(int signo, const siginfo_t* pInfo) {
    sigaction(signo, &anchor.origAction[signo], nullptr);
    if (!recurs(pInfo) && iReaderFault != signo)
        raise(signo);
}

void end_this_reader() {
    const pthread_t self = pthread_self();
    for (trace_file* pFile = anchor.pFirstFile; pFile != nullptr; pFile = pFile->pNext) {
        if (pFile->threadId == self) {
            pFile->bDone = 1;
            return;
        }
    }
}

void handle_fault(int signo, const siginfo_t* pInfo) {
    if (on_main_thread()) {
        cleanup(1);
        restore_disposition(signo, pInfo);
        return;
    }
    end_this_reader();
    if (recurs(pInfo))
        iReaderFault = signo;
    if (++iForwardedFaults > MOST_FORWARDED_FAULTS) {
        restore_disposition(signo, pInfo);
        return;
    }
    pthread_kill(anchor.threadId, signo);
    poll(nullptr, 0, 1);
}

} // namespace

void sighandler(int signo, siginfo_t* pInfo, void*) {
    const int savedErrno = errno;
    if (std::find(std::begin(FAULT_SIGNALS), std::end(FAULT_SIGNALS), signo) !=
        std::end(FAULT_SIGNALS))
        handle_fault(signo, pInfo);
    else
        handle_terminating_signal(signo);
    errno = savedErrno;
}

void install_signal_handlers() {
    struct sigaction action {};
    action.sa_sigaction = sighandler;
    action.sa_flags = SA_SIGINFO;
    sigemptyset(&action.sa_mask);
    for (const int signo : FAULT_SIGNALS)
        sigaction(signo, &action, &anchor.origAction[signo]);
    for (const int signo : TERMINATING_SIGNALS)
        sigaction(signo, &action, nullptr);
}

int change_signal_mask(int how) {
    sigset_t set;
    sigfillset(&set);
    sigdelset(&set, SIGTRAP);
    sigdelset(&set, SIGABRT);
    const int error = pthread_sigmask(how, &set, nullptr);
    if (error == 0)
        return 0;
    output_sys_message("%s: 2625-150 Error from sigthreadmask(), ", error, anchor.pProgName);
    return -1;
}

int pending_signal() {
    return iPendingSignal;
}

void take_pending_signal() {
    if (const int signo = iPendingSignal; signo != 0)
        jump_to_end(signo);
}

void main_thread_sleep(int64_t microseconds) {
    // A descriptor that is not open would end every sleep at once.
    static bool bOutputIsOpen = true;

    const timespec duration{static_cast<time_t>(microseconds / 1000000),
                            static_cast<long>(microseconds % 1000000) * 1000};
    const bool bWatchOutput = anchor.bFollow && bOutputIsOpen;
    pollfd output{STDOUT_FILENO, 0, 0};
    bMainThreadWaits = true;
    take_pending_signal();
    const int iReady = ppoll(&output, bWatchOutput ? 1 : 0, &duration, nullptr);
    bMainThreadWaits = false;
    if (iReady <= 0)
        return;
    if (output.revents & (POLLERR | POLLHUP))
        jump_to_end(SIGPIPE);
    bOutputIsOpen = false;
}

void let_second_signal_through() {
    if (!bJumped)
        return;
    sigset_t set;
    sigemptyset(&set);
    for (const int signo : TERMINATING_SIGNALS)
        sigaddset(&set, signo);
    pthread_sigmask(SIG_UNBLOCK, &set, nullptr);
}
