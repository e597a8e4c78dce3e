#include "messages.h"
#include "narrow.h"
#include "start.h"

#include <cstdlib>
#include <cstring>
#include <ctime>
#include <sys/time.h>

namespace {

constexpr size_t NANO_DIGITS = 9;

const char* skip_white_space(const char* pText) {
    return pText + strspn(pText, " \t\n\v\f\r");
}

int delta_is_invalid() {
    output_err_message("%s: 2625-153 Delta start time or record number is invalid.\n",
                       anchor.pProgName);
    return -1;
}

int time_is_invalid() {
    output_err_message("%s: 2625-154 Start time is invalid.\n", anchor.pProgName);
    return -1;
}

/// "+" or "-", a number, "r" or "s".
int parse_delta(const char* pText) {
    const bool bFromBegin = *pText++ == '+';
    char* pUnit = nullptr;
    const int32_t number = nearest_int32(strtol(pText, &pUnit, 10));
    const bool bRecords = *pUnit == 'r';
    if (pUnit == pText || (!bRecords && *pUnit != 's') || pUnit[1] != '\0')
        return delta_is_invalid();
    if (bRecords) {
        anchor.startOptions = bFromBegin ? START_RECORD_FROM_BEGIN : START_RECORDS_FROM_END;
        anchor.startRecords = number;
    } else {
        anchor.startOptions = bFromBegin ? START_SECONDS_FROM_BEGIN : START_SECONDS_FROM_END;
        anchor.startSeconds = number;
        anchor.startNanoSeconds = 0;
    }
    return 0;
}

void start_now() {
    timeval now{};
    gettimeofday(&now, nullptr);
    anchor.startOptions = START_TIME;
    anchor.startSeconds = nearest_int32(now.tv_sec);
    anchor.startNanoSeconds = static_cast<int32_t>(now.tv_usec * 1000);
}

/// The digits behind the point, all of which must be digits; those after the
/// ninth do not count. Returns false when something else stands among them.
bool parse_fraction(const char* pDigits, int32_t* pNanoSeconds) {
    int32_t nanoSeconds = 0;
    size_t uDigits = 0;
    for (; *pDigits >= '0' && *pDigits <= '9'; ++pDigits)
        if (uDigits < NANO_DIGITS) {
            nanoSeconds = nanoSeconds * 10 + (*pDigits - '0');
            ++uDigits;
        }
    for (; uDigits < NANO_DIGITS; ++uDigits)
        nanoSeconds *= 10;
    *pNanoSeconds = nanoSeconds;
    return *pDigits == '\0';
}

/// An optional date and a time in the locale's formats. What the text does not
/// give is that of now.
int parse_date_and_time(const char* pText) {
    const time_t now = time(nullptr);
    tm start{};
    localtime_r(&now, &start);

    // A parse that fails half-way leaves its fields changed, hence the copies.
    tm attempt = start;
    if (const char* const pBehindDate = strptime(pText, "%x", &attempt)) {
        start = attempt;
        pText = pBehindDate;
    }
    attempt = start;
    const char* const pBehindTime = strptime(pText, "%X", &attempt);
    if (pBehindTime == nullptr)
        return time_is_invalid();

    // Whether summer time is in force at that date and time, not whether it is now.
    attempt.tm_isdst = -1;
    int32_t nanoSeconds = 0;
    if (*pBehindTime == '.' && !parse_fraction(pBehindTime + 1, &nanoSeconds))
        return time_is_invalid();
    anchor.startOptions = START_TIME;
    anchor.startSeconds = nearest_int32(mktime(&attempt));
    anchor.startNanoSeconds = nanoSeconds;
    return 0;
}

} // namespace

int parse_start(const char* pText) {
    pText = skip_white_space(pText != nullptr ? pText : "");
    if (*pText == '+' || *pText == '-')
        return parse_delta(pText);
    if (*pText == '\0') {
        start_now();
        return 0;
    }
    return parse_date_and_time(pText);
}
