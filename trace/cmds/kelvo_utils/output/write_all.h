#pragma once

#include <string_view>

/// Writes the whole text to the descriptor `fd`, going on after interrupted and
/// partial writes and waiting where `fd` does not block. Returns 0, or the errno
/// of the write that failed. A reader of standard error that has gone causes no
/// SIGPIPE. Any thread.
int write_all(int fd, std::string_view text);

/// From now on the main thread writes only as long as somebody takes the text:
/// when nothing is taken for a tenth of a second the process ends, with status 0
/// and without what is left. That may be here and now. Answers whether the main
/// thread is writing. Main thread, also in a signal handler.
bool write_only_while_output_moves();
