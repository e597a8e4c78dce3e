// Signals of the run. Terminating signals end it with status 0 through the jump
// point anchor.sigbuf; fault signals end it through their previous disposition.
//
// A terminating signal never interrupts the allocator or the output stream: the
// handler jumps only while the main thread waits (main_thread_sleep), otherwise
// it leaves a note that take_pending_signal acts on.
#pragma once

#include <csignal>
#include <cstdint>

/// The handler of every signal that the run handles.
void sighandler(int signo, siginfo_t* pInfo, void* pContext);

/// Installs sighandler and keeps the previous dispositions of the fault signals.
void install_signal_handlers();

/// Blocks (`how` SIG_BLOCK) or unblocks every signal but SIGTRAP and SIGABRT in
/// the main thread. Returns 0, or -1 after message 2625-150.
int change_signal_mask(int how);

/// Jumps to anchor.sigbuf when a terminating signal has arrived. Main thread,
/// outside allocator and stream.
void take_pending_signal();

/// Sleeps at most `microseconds`, ended at once by a terminating signal. In
/// follow mode also watches standard output: when the reader of its pipe has
/// gone the run ends as by SIGPIPE. Main thread, no mutex held.
void main_thread_sleep(int64_t microseconds);
