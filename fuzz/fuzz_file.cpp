// A whole trace file: the opening's checks, the search for the first record,
// the start selection, the walk, and every record written in all forms.
//
// The options of the run stand in header bytes that no reader looks at, zero in
// usual files, so that an input is a trace file as it is:
//   188-191  N of the start option
//   192      bits 0-2: anchor.startOptions; bit 3: one file of several; bit 4:
//            the kinds that no reader hands on are written too
//   193      -o letters that are left out, by bit
//   194-195  nanoseconds of the start time, in units of 15 microseconds
#include "fuzz_target.h"
#include "hostile_harness.h"

#include <span>

static hostile_options options_in(trace_bytes file) {
    const auto header = load<trace_file_header>(file, 0);
    const auto uUnits = load<uint16_t>(file, offsetof(trace_file_header, padding) + 1);
    hostile_options options;
    options.startOptions = header.sp_flags & 0x07;
    options.startRecords = static_cast<int32_t>(header.sp_reuse_tm);
    options.startSeconds = static_cast<int32_t>(header.sp_reuse_tm);
    options.startNanoSeconds = uUnits * 15'000;
    options.bManyFiles = (header.sp_flags & 0x08) != 0;
    options.bEveryKind = (header.sp_flags & 0x10) != 0;
    options.sLetters.clear();
    for (unsigned int i = 0; const char letter : {'d', 't', 'i', 'c', 'f', 's', 'o'})
        if ((header.padding[0] >> i++ & 1) == 0)
            options.sLetters += letter;
    return options;
}

int LLVMFuzzerTestOneInput(const uint8_t* pData, size_t uSize) {
    const trace_bytes file = std::as_bytes(std::span(pData, uSize));
    (void)read_hostile_file(file, options_in(file));
    return 0;
}
