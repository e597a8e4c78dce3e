// Signals of the run. Terminating signals end it with status 0 through the jump
// point anchor.sigbuf; fault signals end the process through their previous
// disposition.
//
// A terminating signal never interrupts the allocator or the output stream: the
// handler jumps only while the main thread waits (main_thread_sleep), otherwise
// it leaves a note that take_pending_signal acts on. Other threads send their
// signals on to the main thread. When a second one comes and nobody takes the
// output that the first one waits for, the process ends at once, with status 0.
//
// anchor.threadId and anchor.sigbuf are set before the handlers are installed,
// and the function that set anchor.sigbuf must not have returned when one of
// the functions here jumps.
#pragma once

#include <csignal>
#include <cstdint>

/// The handler of every signal that the run handles.
void sighandler(int signo, siginfo_t* pInfo, void* pContext);

/// Installs sighandler and keeps the previous dispositions of the fault signals.
void install_signal_handlers();

/// Blocks (`how` SIG_BLOCK) or unblocks (SIG_UNBLOCK) every signal but SIGTRAP
/// and SIGABRT in the calling thread. Returns 0, or -1 after message 2625-150.
int change_signal_mask(int how);

/// The terminating signal that has arrived and was not acted on, or 0.
int pending_signal();

/// Jumps to anchor.sigbuf when a terminating signal has arrived; bReadersMayRun
/// is then set. Main thread, outside allocator and stream, no mutex held.
void take_pending_signal();

/// Sleeps at most `microseconds`, ended at once by a terminating signal, as
/// take_pending_signal. In follow mode also watches standard output: when the
/// reader of its pipe has gone the run ends as by SIGPIPE. Main thread, no mutex
/// held.
void main_thread_sleep(int64_t microseconds);

/// After a jump, which leaves all signals blocked: unblocks the terminating ones,
/// so that a second one ends a run whose last text nobody takes. Does nothing
/// when no signal has ended the run. Main thread, any number of times.
void let_second_signal_through();
