// Texts for standard output that other threads than the main one have to say:
// they are kept in order and written by the main thread between two records.
#pragma once

#include <string_view>

/// Whether the calling thread is the one that owns standard output: the main
/// thread, or any thread before anchor.threadId is set.
bool owns_standard_output();

/// Keeps a copy of `text` for the main thread. When memory runs out the text is
/// dropped. Any thread.
void hand_over_output(std::string_view text);

/// Marks in the output that memory ran out.
inline constexpr std::string_view insufficient_resources_warning_message_in_output_header =
    "\t[INSUFFICIENT MEMORY TO PROCESS]\n";

/// Has the main thread write that marker, past the sink and straight to the
/// descriptor. Needs no memory. Any thread.
void hand_over_marker();

/// Writes what was handed over, in order. Main thread, outside a record.
/// Costs one atomic load when there is nothing.
void write_handed_over_output();
