// Prefix, indentation and nesting of records, and the hex dump inside them.
#include "frame.h"

#include "hex.h"
#include "stdout_stream.h"
#include "time_text.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <climits>
#include <cstdlib>
#include <cstring>
#include <random>
#include <string>

using testing::internal::CaptureStdout;
using testing::internal::GetCapturedStdout;

namespace {

class Frame : public testing::Test {
protected:
    void SetUp() override {
        setenv("TZ", "UTC0", 1);
        forget_time_texts();
        set_options("");
        anchor.iNumberFiles = 1;
        file.index = 7;
        CaptureStdout();
    }
    void TearDown() override {
        free_thread_info(&file);
        taken();
        GetCapturedStdout();
    }

    static void set_options(const char* pLetters) {
        std::strncpy(anchor.outputOptions, pLetters, sizeof anchor.outputOptions - 1);
    }

    void start(uint64_t threadId = 0x1a, uint64_t timeStamp = 0, const char* pCompId = "_ZPB") {
        ASSERT_EQ(
            output_start_rec(&file, pCompId, threadId, 6, 0xABC, 0xF0, timeStamp, &file.timeInfo),
            0);
    }
    void record(std::string_view body, uint64_t threadId = 0x1a) {
        start(threadId);
        output_text(body);
        output_end_rec();
    }
    // What was written since the last call.
    static std::string taken() {
        stdout_flush();
        const std::string text = GetCapturedStdout();
        CaptureStdout();
        return text;
    }

    trace_file file{};
};

TEST_F(Frame, WritesEveryPrefixField) {
    constexpr uint64_t SECOND = 1000000000;
    file.timeInfo = {1000000 * SECOND, 5};
    const struct {
        const char* pLetters;
        int numberFiles;
        uint64_t timeStamp;
        uint64_t threadId;
        char compId[5];
        const char* pExpected;
    } cases[] = {
        {"tic", 1, 5 + 42, 0x1a2b, "_ZPB", " 13:46:40.000000042 T(1a2b) _ZPB x\n"},
        {"d", 1, 5, 1, "_ZPB", " 01/12/70 x\n"},
        {"tdt", 1, 4, 1, "_ZPB", " 13:46:39.999999999 01/12/70 13:46:39.999999999 x\n"},
        {"i", 1, 5, 0, "_ZPB", " T(  0) x\n"},
        {"i", 2, 5, 0xFFFFFFFFFFFFFFFF, "_ZPB", "[07] T(ffffffffffffffff) x\n"},
        {"cf", 1, 5, 1, "ab\0d", "   ab  6 x\n"},
        {"so", 1, 5, 1, "_ZPB", " 0x00000abc 0x000000f0 x\n"},
        {"", 2, 5, 1, "_ZPB", "[07] x\n"},
    };
    for (const auto& c : cases) {
        set_options(c.pLetters);
        anchor.iNumberFiles = c.numberFiles;
        start(c.threadId, c.timeStamp, c.compId);
        output_string("x");
        output_end_rec();
        EXPECT_EQ(taken(), c.pExpected);
    }
    EXPECT_EQ(file.modTime.tv_sec, 1000000);
    EXPECT_EQ(file.modTime.tv_nsec, 42);
    EXPECT_EQ(file.timeStampIsValid, 1);
}

TEST_F(Frame, FollowsTheZoneAndCopesWithAbsurdYears) {
    set_options("dt");
    record("a");
    setenv("TZ", "UTC05:00", 1);
    anchor.tz_offset = 300;
    record("b");
    anchor.tz_offset = 0;
    EXPECT_EQ(taken(), " 01/01/70 00:00:00.000000000 a\n 12/31/69 19:00:00.000000000 b\n");
    EXPECT_TRUE(date_text(LONG_MAX).empty());
    EXPECT_TRUE(time_of_day_text(LONG_MIN).empty());
    EXPECT_EQ(time_of_day_text(0), " 19:00:00");
}

TEST_F(Frame, IndentsBodiesAndNestsThreads) {
    set_options("c");
    record("abc\n\ndef\n");
    record(">>enter");
    record("inner\nmore");
    record("other thread", 2);
    record("<<leave\n");
    record("<<unbalanced");
    for (const char* pBody : {">x", "<", "><<y", "<>", ""})
        record(pBody);
    start(); // and never ended
    output_text(">");
    record("next");
    EXPECT_EQ(taken(), " _ZPB abc\n\n      def\n _ZPB enter\n _ZPB   inner\n        more\n"
                       " _ZPB other thread\n _ZPB leave\n\n _ZPB unbalanced\n\n _ZPB >x\n _ZPB\n"
                       " _ZPB ><<y\n _ZPB <>\n _ZPB\n _ZPB\n _ZPB next\n");
    set_options("");
    record("a\nb");
    record("");
    EXPECT_EQ(taken(), " a\n b\n");
}

// Two runs of any text give what their characters give one by one, and leave the
// thread where those leave it.
TEST_F(Frame, WritesTextAsItWritesItsCharacters) {
    std::mt19937 random(20240229);
    for (int round = 0; round < 500; round++) {
        set_options(round % 3 == 0 ? "" : "c");
        std::string text;
        for (size_t i = random() % 12; i > 0; i--)
            text += "ab\n\n><  \0x"[random() % 10];
        const size_t uCut = random() % (text.size() + 1);
        start(1);
        output_text({text.data(), uCut});
        output_text({text.data() + uCut, text.size() - uCut});
        output_end_rec();
        const std::string inRuns = taken();
        start(2);
        for (const char ch : text)
            output_char(ch);
        output_end_rec();
        ASSERT_EQ(inRuns, taken()) << text;
    }
}

TEST_F(Frame, DeepNestingIsIndentedIn16Bits) {
    record("");
    taken();
    const std::pair<int, size_t> columns[] = {{1000, 2001}, {16383, 32767}, {16384, 0},
                                              {32767, 0},   {32768, 1},     {40000, 14465}};
    for (const auto& [level, uColumn] : columns) {
        file.pThreadInfo->nestingLevel = static_cast<uint16_t>(level);
        record(">>x\ny\n");
        const std::string line(uColumn, ' ');
        EXPECT_TRUE(taken() == line + "x\n" + line + "y\n") << level;
        EXPECT_EQ(file.pThreadInfo->nestingLevel, level + 1);
    }
    file.pThreadInfo->nestingLevel = 65535;
    record(">>-\n");
    record(">-\n");
    EXPECT_EQ(taken(), "-\n>-\n");
}

TEST_F(Frame, KeepsThreadsApartHoweverManyThereAre) {
    constexpr uint64_t THREADS = 200000;
    for (uint64_t id = 0; id < THREADS; id++)
        record(id % 1000 == 1 ? ">>" : "", id);
    for (uint64_t id = 0; id < THREADS; id++) {
        const thread_info* pThread = get_thread_info(&file, id);
        ASSERT_EQ(pThread->id, id);
        ASSERT_EQ(pThread->nestingLevel, id % 1000 == 1 ? 1 : 0);
    }
    EXPECT_EQ(file.pThreadInfo->id, THREADS - 1);
}

TEST_F(Frame, DumpsBytes) {
    format_hex(std::as_bytes(std::span(std::string_view("abcdefghijklmnop~\x7F\x80\x81"))));
    format_hex({});
    EXPECT_EQ(taken(), "\n0x00000000: 61626364 65666768 696a6b6c 6d6e6f70 |abcdefghijklmnop|"
                       "\n0x00000010: 7e7f8081                            |~\x7F..            |"
                       "\n\n");
}

} // namespace
