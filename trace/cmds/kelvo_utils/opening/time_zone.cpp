#include "opening.h"

#include <cstdio>
#include <cstdlib>
#include <ctime>

void set_tz() {
    const int hours = anchor.tz_offset / 60;
    const int minutes = std::abs(anchor.tz_offset % 60);
    // Less than an hour east of UTC, the hours alone would lose the sign.
    const char* const pFormat = anchor.tz_offset < 0 && hours == 0 ? "UTC-%d:%02d" : "UTC%02d:%02d";
    char text[16];
    snprintf(text, sizeof(text), pFormat, hours, minutes);
    setenv("TZ", text, 1);
    tzset(); // localtime_r alone need not notice
}
