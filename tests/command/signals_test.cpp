// Each case is a small run of its own in a process of its own, which shows what
// became of it by its exit status or by the signal that killed it.
#include "signals.h"

#include "cleanup.h"
#include "kelvo.h"

#include <cerrno>
#include <csetjmp>
#include <cstdlib>
#include <pthread.h>
#include <sys/mman.h>
#include <unistd.h>

#include <gtest/gtest.h>

namespace {

constexpr int ENDED_BY_JUMP = 40; ///< plus the number of the signal
constexpr int NOT_ENDED = 1;

/// Arms the signals as the run does, runs `body`, exits.
[[noreturn]] void run_armed(void (*body)()) {
    alarm(60); // a case that hangs is killed by SIGALRM
    for (const int signo : {SIGILL, SIGBUS, SIGFPE, SIGSEGV})
        signal(signo, SIG_DFL); // in place of a sanitizer's own handler
    anchor.pProgName = "kelvo";
    anchor.threadId = pthread_self();
    if (change_signal_mask(SIG_BLOCK) != 0)
        _exit(NOT_ENDED);
    if (const int signo = sigsetjmp(anchor.sigbuf, 1); signo != 0) {
        sigset_t mask;
        pthread_sigmask(SIG_BLOCK, nullptr, &mask);
        const bool bBlocked = sigismember(&mask, SIGINT) == 1 && sigismember(&mask, SIGABRT) == 0;
        _exit(bBlocked && bReadersMayRun ? ENDED_BY_JUMP + signo : NOT_ENDED);
    }
    install_signal_handlers();
    if (change_signal_mask(SIG_UNBLOCK) == 0)
        body();
    _exit(NOT_ENDED);
}

void start_thread(void* (*body)(void*)) {
    pthread_t id;
    pthread_create(&id, nullptr, body, nullptr);
    pthread_detach(id);
}

/// A descriptor to write to on which every write blocks.
int full_pipe() {
    int fds[2];
    if (pipe(fds) != 0)
        _exit(NOT_ENDED);
    return fds[1];
}

void write_for_ever(int fd) {
    const char block[4096] = {};
    for (;;)
        if (write(fd, block, sizeof block) < 0 && errno != EINTR)
            _exit(NOT_ENDED);
}

// What a thread other than the main one does to it.

void* break_pipe(void*) {
    int fds[2];
    if (pipe(fds) == 0) {
        close(fds[0]);
        (void)!write(fds[1], "", 1);
    }
    return nullptr;
}

void* fault(void*) {
    usleep(20000);
    void* const pPage = mmap(nullptr, 1, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    *static_cast<volatile char*>(pPage) = 1;
    return nullptr;
}

/// A fault that was sent to this very thread.
void* take_sent_fault(void*) {
    pthread_kill(pthread_self(), SIGBUS);
    return nullptr;
}

// What the main thread does meanwhile.

void sleep_long() {
    for (;;)
        main_thread_sleep(10000000);
}

/// A signal that comes while the main thread works waits for the next sleep.
void interrupted_work() {
    raise(SIGTSTP);
    if (pending_signal() == SIGTSTP)
        main_thread_sleep(10000000);
}

void interrupted_record() {
    raise(SIGQUIT);
    take_pending_signal();
}

void broken_pipe_elsewhere() {
    start_thread(break_pipe);
    sleep_long();
}

TEST(Signals, TerminatingSignalsJumpOnlyWhereTheMainThreadWaits) {
    const struct {
        void (*body)();
        int signo;
    } cases[] = {
        {interrupted_work, SIGTSTP},
        {interrupted_record, SIGQUIT},
        {broken_pipe_elsewhere, SIGPIPE},
    };
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    for (const auto& [body, signo] : cases)
        EXPECT_EXIT(run_armed(body), testing::ExitedWithCode(ENDED_BY_JUMP + signo), "");
}

void fault_while_main_sleeps() {
    start_thread(fault);
    sleep_long();
}

void fault_while_main_is_blocked_in_a_write() {
    start_thread(fault);
    write_for_ever(full_pipe());
}

void fault_while_main_waits_for_a_mutex() {
    static pthread_mutex_t mutex = PTHREAD_MUTEX_INITIALIZER;
    start_thread([](void*) -> void* {
        pthread_mutex_lock(&mutex);
        return fault(nullptr);
    });
    usleep(10000);
    for (;;) {
        pthread_mutex_lock(&mutex);
        pthread_mutex_unlock(&mutex);
    }
}

/// The main thread is on its way out, all signals blocked, behind a full pipe.
void fault_while_main_takes_no_signal() {
    start_thread(fault);
    change_signal_mask(SIG_BLOCK);
    write_for_ever(full_pipe());
}

void fault_on_main() {
    fault(nullptr);
}

void fault_sent_to_main() {
    raise(SIGFPE);
}

void fault_sent_to_thread() {
    start_thread(take_sent_fault);
    sleep_long();
}

TEST(Signals, FaultsEndTheProcessByTheirOwnSignal) {
    const struct {
        void (*body)();
        int signo;
    } cases[] = {
        {fault_while_main_sleeps, SIGSEGV},
        {fault_while_main_is_blocked_in_a_write, SIGSEGV},
        {fault_while_main_waits_for_a_mutex, SIGSEGV},
        {fault_while_main_takes_no_signal, SIGSEGV},
        {fault_on_main, SIGSEGV},
        {fault_sent_to_main, SIGFPE},
        {fault_sent_to_thread, SIGBUS},
    };
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    for (const auto& [body, signo] : cases)
        EXPECT_EXIT(run_armed(body), testing::KilledBySignal(signo), "");
}

} // namespace
