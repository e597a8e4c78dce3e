#include "sink.h"

#include "kelvo.h"
#include "stdout_stream.h"

#include <gtest/gtest.h>

#include <random>
#include <string>

using testing::internal::CaptureStdout;
using testing::internal::GetCapturedStdout;

namespace {

// The sink's state, and what one way of writing makes of it.
struct sink_state {
    int16_t curColumn;
    int16_t currentIndent;
    int16_t headerIndent;
    char firstChar;
    uint8_t outputFlags;
    uint16_t nestingLevel;
    uint16_t threadFlags;

    bool operator==(const sink_state&) const = default;
};

template <class Write> std::string write_from(sink_state* pState, Write write) {
    thread_info thread{nullptr, 1, pState->nestingLevel, pState->threadFlags};
    anchor.pCurThread = &thread;
    anchor.curColumn = pState->curColumn;
    anchor.currentIndent = pState->currentIndent;
    anchor.headerIndent = pState->headerIndent;
    anchor.firstChar = pState->firstChar;
    anchor.outputFlags = pState->outputFlags;
    CaptureStdout();
    write();
    stdout_flush();
    *pState = {anchor.curColumn,   anchor.currentIndent, anchor.headerIndent, anchor.firstChar,
               anchor.outputFlags, thread.nestingLevel,  thread.outputFlags};
    output_abandon_rec();
    stdout_reset();
    return GetCapturedStdout();
}

// Runs of any text, in any state, give what its characters give one by one.
TEST(Sink, WritesTextAsItWritesItsCharacters) {
    std::mt19937 random(20240229);
    const auto below = [&random](unsigned limit) {
        return static_cast<unsigned>(random() % limit);
    };
    for (int round = 0; round < 500; round++) {
        std::string text;
        for (unsigned i = below(12); i > 0; i--)
            text += "ab\n\n><  \0x"[below(10)];
        const bool bPending = below(2) != 0;
        const sink_state start{
            static_cast<int16_t>(bPending ? 4 : below(2) * 6),
            static_cast<int16_t>(below(3) * 3),
            5,
            bPending ? "\0<>"[below(3)] : '\0',
            static_cast<uint8_t>(bPending ? OUTPUT_START_PENDING : 0),
            static_cast<uint16_t>(below(3)),
            0,
        };
        sink_state inRuns = start;
        sink_state oneByOne = start;
        const std::string written = write_from(&inRuns, [&] { output_text(text); });
        const std::string expected = write_from(&oneByOne, [&] {
            for (const char ch : text)
                output_char(ch);
        });
        ASSERT_EQ(written, expected) << text;
        ASSERT_EQ(inRuns, oneByOne) << text;
    }
}

} // namespace
