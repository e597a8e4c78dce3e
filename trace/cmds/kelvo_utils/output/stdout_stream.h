// The buffered stream to standard output. It belongs to the main thread: no
// other function of the command writes to file descriptor 1.
//
// A stream of our own rather than stdio's: a signal that interrupts a write
// must not lose buffered text, and no character may cost a lock. On a terminal
// every line is shown as soon as it is complete; elsewhere text leaves in
// pieces of the whole buffer, or when the caller flushes. Nothing is written at
// exit: the end of the run flushes.
#pragma once

#include <cstddef>
#include <string_view>

/// Appends one byte; writes the buffer out when it is full.
void stdout_put(char ch);

/// Appends bytes; writes the buffer out when it is full.
void stdout_write(std::string_view text);

/// Appends `ch` `count` times.
void stdout_fill(char ch, size_t count);

/// Room for `count` bytes, at most STDOUT_ROOM, that the caller fills in place
/// and then passes their end to stdout_end_room. No newline may be among them.
inline constexpr size_t STDOUT_ROOM = 4096;
char* stdout_begin_room(size_t count);
void stdout_end_room(const char* pEnd);

/// Writes everything appended so far. Interrupted and partial writes go on
/// where they stopped. After the first failed write the stream drops all text;
/// in follow mode that is reported at once, as stdout_report_loss does.
void stdout_flush();

/// Whether nothing is waiting in the buffer.
bool stdout_is_empty();

/// errno of the first failed write, 0 when none failed.
int stdout_error();

/// Whether text was lost by a failed write; a reader of our pipe that has gone is
/// no loss. The first time also says so, with message 2625-163.
bool stdout_report_loss();

/// Starts afresh on what is descriptor 1 now: buffered text and a remembered
/// error are dropped, and whether it is a terminal is found out anew.
void stdout_reset();
