// The buffered stream to standard output. It belongs to the main thread: no
// other function of the command writes to file descriptor 1.
//
// A stream of our own rather than stdio's: a signal that interrupts a write
// must not lose buffered text, and no character may cost a lock.
#pragma once

#include <string_view>

/// Appends one byte; writes the buffer out when it is full.
void stdout_put(char ch);

/// Appends bytes; writes the buffer out when it is full.
void stdout_write(std::string_view text);

/// Writes everything appended so far. Interrupted and partial writes go on
/// where they stopped. After the first failed write the stream drops all text.
void stdout_flush();

/// Whether nothing is waiting in the buffer.
bool stdout_is_empty();

/// errno of the first failed write, 0 when none failed.
int stdout_error();
