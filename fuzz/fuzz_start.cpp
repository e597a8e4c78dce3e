// The -s argument, in the POSIX locale and UTC.
#include "fuzz_target.h"
#include "hostile_harness.h"

#include "start.h"

#include <string>

int LLVMFuzzerTestOneInput(const uint8_t* pData, size_t uSize) {
    const std::string text(reinterpret_cast<const char*>(pData), uSize);
    anchor.startOptions = START_NONE;
    anchor.startSeconds = 0;
    anchor.startNanoSeconds = 0;
    anchor.startRecords = 0;
    const bool bValid = parse_start(text.c_str()) == 0;
    hostile_check(bValid == (anchor.startOptions != START_NONE),
                  "a valid start argument, and no other, sets the start");
    hostile_check(anchor.startOptions >= START_NONE && anchor.startOptions <= START_TIME,
                  "the start is of a known kind");
    hostile_check(anchor.startNanoSeconds >= 0 && anchor.startNanoSeconds < 1'000'000'000,
                  "nanoseconds stay below a second");
    return 0;
}
