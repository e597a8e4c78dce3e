// Local date and time of day of a record, in the locale's form. The texts of
// the second last asked for are kept, so that a run of records within one
// second costs one conversion. Main thread only.
#pragma once

#include <cstddef>
#include <ctime>
#include <string_view>

/// Bytes that can be read where such a text begins, more than any is long.
inline constexpr size_t TIME_TEXT_ROOM = 40;

/// The local date of `seconds` since the epoch as strftime's " %x"; empty when
/// the calendar does not reach that far or the text has 40 bytes or more. Valid
/// until the next call for another second.
std::string_view date_text(time_t seconds);

/// The same for the local time of day, " %X".
std::string_view time_of_day_text(time_t seconds);

/// Drops what is kept. Needed after a change of TZ or of the locale, but for
/// the change that goes with anchor.tz_offset and anchor.bHostTZ: that one is
/// noticed.
void forget_time_texts();
