#include "time_text.h"

#include "kelvo.h"

namespace {

// One field of the second that is kept; formatted when first asked for.
struct kept_text {
    bool bFormatted = false;
    size_t uSize = 0;
    char pText[TIME_TEXT_ROOM];
};

struct {
    bool bValid = false;
    time_t seconds = 0;
    int32_t bHostTZ = 0; // with tz_offset: the zone the texts were made in
    int32_t tz_offset = 0;
    bool bCalendar = false; // `local` holds the calendar time
    tm local{};
    kept_text date;
    kept_text timeOfDay;
} kept;

// Makes `kept` hold the calendar time of `seconds`.
void keep_second(time_t seconds) {
    const bool bSameZone =
        kept.bValid && kept.bHostTZ == anchor.bHostTZ && kept.tz_offset == anchor.tz_offset;
    if (bSameZone && kept.seconds == seconds)
        return;
    if (!bSameZone)
        tzset(); // localtime_r need not look at TZ again
    kept.bValid = true;
    kept.seconds = seconds;
    kept.bHostTZ = anchor.bHostTZ;
    kept.tz_offset = anchor.tz_offset;
    kept.bCalendar = localtime_r(&seconds, &kept.local) != nullptr;
    kept.date.bFormatted = false;
    kept.timeOfDay.bFormatted = false;
}

std::string_view text_of(kept_text* pField, const char* pFormat) {
    if (!pField->bFormatted) {
        pField->uSize = kept.bCalendar
                            ? strftime(pField->pText, sizeof pField->pText, pFormat, &kept.local)
                            : 0;
        pField->bFormatted = true;
    }
    return {pField->pText, pField->uSize};
}

} // namespace

std::string_view date_text(time_t seconds) {
    keep_second(seconds);
    return text_of(&kept.date, " %x");
}

std::string_view time_of_day_text(time_t seconds) {
    keep_second(seconds);
    return text_of(&kept.timeOfDay, " %X");
}

void forget_time_texts() {
    kept.bValid = false;
}
