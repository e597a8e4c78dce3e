#pragma once

#include <string_view>

/// Writes the whole text to the descriptor `fd`, going on after interrupted and
/// partial writes and waiting where `fd` does not block. Returns 0, or the errno
/// of the write that failed. Any thread.
int write_all(int fd, std::string_view text);
