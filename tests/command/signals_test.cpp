// Each case is a small run of its own in a process of its own, which shows what
// became of it by its exit status or by the signal that killed it.
#include "signals.h"

#include "cleanup.h"
#include "kelvo.h"

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

void* fault(void*) {
    usleep(20000);
    void* const pPage = mmap(nullptr, 1, PROT_NONE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
    *static_cast<volatile char*>(pPage) = 1;
    return nullptr;
}

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
    start_thread([](void*) -> void* {
        int fds[2];
        if (pipe(fds) == 0) {
            close(fds[0]);
            (void)!write(fds[1], "", 1);
        }
        return nullptr;
    });
    sleep_long();
}

TEST(Signals, TerminatingSignalsJumpOnlyWhereTheMainThreadWaits) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    const auto by_jump = [](int signo) { return testing::ExitedWithCode(ENDED_BY_JUMP + signo); };
    EXPECT_EXIT(run_armed(interrupted_work), by_jump(SIGTSTP), "");
    EXPECT_EXIT(run_armed(interrupted_record), by_jump(SIGQUIT), "");
    EXPECT_EXIT(run_armed(broken_pipe_elsewhere), by_jump(SIGPIPE), "");
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

/// The main thread is on its way out and stays there.
void fault_while_main_takes_no_signal() {
    start_thread(fault);
    change_signal_mask(SIG_BLOCK);
    pause();
}

void fault_sent_to_thread() {
    start_thread([](void*) -> void* {
        pthread_kill(pthread_self(), SIGBUS);
        return nullptr;
    });
    sleep_long();
}

TEST(Signals, FaultsEndTheProcessByTheirOwnSignal) {
    GTEST_FLAG_SET(death_test_style, "threadsafe");
    using testing::KilledBySignal;
    EXPECT_EXIT(run_armed(fault_while_main_waits_for_a_mutex), KilledBySignal(SIGSEGV), "");
    EXPECT_EXIT(run_armed(fault_while_main_takes_no_signal), KilledBySignal(SIGSEGV), "");
    EXPECT_EXIT(run_armed([] { fault(nullptr); }), KilledBySignal(SIGSEGV), "");
    EXPECT_EXIT(run_armed(fault_sent_to_thread), KilledBySignal(SIGBUS), "");
}

} // namespace
