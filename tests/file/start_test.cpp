#include "start.h"

#include "first_record.h"
#include "memory_trace.h"
#include "walk.h"

#include <array>
#include <cstdlib>
#include <gmock/gmock.h>
#include <gtest/gtest.h>

using testing::HasSubstr;
using testing::internal::CaptureStderr;
using testing::internal::GetCapturedStderr;

namespace {

// ------------------------------------------------------------ the -s argument

/// startOptions, startSeconds, startNanoSeconds and startRecords.
using settings = std::array<int32_t, 4>;

/// The settings that a valid argument leaves; fields it does not set are -9.
settings parse(const char* pText, const char* pZone = "UTC0") {
    setenv("TZ", pZone, 1);
    tzset();
    anchor.startOptions = anchor.startSeconds = anchor.startNanoSeconds = anchor.startRecords = -9;
    EXPECT_EQ(parse_start(pText), 0) << pText;
    return {anchor.startOptions, anchor.startSeconds, anchor.startNanoSeconds, anchor.startRecords};
}

TEST(Start, argument_counts_records_or_seconds_from_either_end) {
    EXPECT_EQ(parse("+3r"), (settings{START_RECORD_FROM_BEGIN, -9, -9, 3}));
    EXPECT_EQ(parse(" \t\n\v\f\r+10s"), (settings{START_SECONDS_FROM_BEGIN, 10, 0, -9}));
    EXPECT_EQ(parse("+ 3r"), (settings{START_RECORD_FROM_BEGIN, -9, -9, 3}));
    EXPECT_EQ(parse("+-3r"), (settings{START_RECORD_FROM_BEGIN, -9, -9, -3}));
    EXPECT_EQ(parse("-5r"), (settings{START_RECORDS_FROM_END, -9, -9, 5}));
    EXPECT_EQ(parse("- -5s"), (settings{START_SECONDS_FROM_END, -5, 0, -9}));
    EXPECT_EQ(parse("+99999999999r"), (settings{START_RECORD_FROM_BEGIN, -9, -9, INT32_MAX}));
    EXPECT_EQ(parse("--99999999999999999999s"),
              (settings{START_SECONDS_FROM_END, INT32_MIN, 0, -9}));
}

TEST(Start, argument_is_a_date_and_time) {
    constexpr int32_t NOON = 919598400; // in UTC
    EXPECT_EQ(parse(" 02/21/99 \t 12:00:00"), (settings{START_TIME, NOON, 0, -9}));
    EXPECT_EQ(parse("02/21/99 12:00:00.25"), (settings{START_TIME, NOON, 250'000'000, -9}));
    EXPECT_EQ(parse("02/21/99 12:00:00.000001"), (settings{START_TIME, NOON, 1000, -9}));
    EXPECT_EQ(parse("02/21/99 12:00:00."), (settings{START_TIME, NOON, 0, -9}));
    EXPECT_EQ(parse("02/21/99 12:00:00.1234567899999999999999"),
              (settings{START_TIME, NOON, 123'456'789, -9}));
    EXPECT_EQ(parse("02/21/99 12:00:00 x.5"), (settings{START_TIME, NOON, 0, -9}));
    EXPECT_EQ(parse("01/19/68 03:14:08")[1], INT32_MAX) << "2068 does not fit";

    // Summer time or not by the date given, not by today.
    EXPECT_EQ(parse("02/21/99 12:00:00", "EST5EDT,M3.2.0,M11.1.0")[1], NOON + 5 * 3600);
    EXPECT_EQ(parse("07/04/99 12:00:00", "EST5EDT,M3.2.0,M11.1.0")[1], 931104000);
}

TEST(Start, argument_without_a_date_means_today_and_an_empty_one_now) {
    const time_t before = time(nullptr);
    const auto [options, seconds, nanoSeconds, records] = parse("  ");
    EXPECT_EQ(options, START_TIME);
    EXPECT_GE(seconds, before);
    EXPECT_LE(seconds, parse(nullptr)[1]);
    EXPECT_EQ(nanoSeconds % 1000, 0);
    const settings noon = parse("12:00:00.5");
    EXPECT_EQ(noon[1] % 86400, 12 * 3600);
    EXPECT_LE(std::abs(noon[1] - before), 86400);
    EXPECT_EQ(noon[2], 500'000'000);
}

TEST(Start, argument_that_is_neither_is_refused) {
    const struct {
        std::vector<const char*> texts;
        const char* pMessage;
    } cases[] = {
        {{"+5", "+5rs", "+r", "-", "+5 r", "+5R", "+s5", "-5r ", "+5.5s", "+x5r"},
         "kelvo: 2625-153 Delta start time or record number is invalid.\n\n"},
        {{"02/21/99", "02/21/99 ", "x", "12:00", "25:00:00", "12:00:00.25x", "12:00:00.5 ",
          "12:00:00.-5", "12:00:00. 5", "13/13/99 12:00:00", "21.02.1999 12:00:00"},
         "kelvo: 2625-154 Start time is invalid.\n\n"},
    };
    anchor.pProgName = "kelvo";
    for (const auto& test : cases)
        for (const char* const pText : test.texts) {
            CaptureStderr();
            EXPECT_EQ(parse_start(pText), -1) << pText;
            EXPECT_EQ(GetCapturedStderr(), test.pMessage) << pText;
        }
}

// --------------------------------------------------------------- in one file

constexpr uint64_t SECOND = 1'000'000'000;

/// Records 1 to `uRecords` at 100.5, 101.5, ... seconds, a restart record that
/// is never output behind the second one, and a filler. With `bGap` the filler
/// is the oldest position, as in a live ring, otherwise the first record is.
raw_trace ring_of(uint32_t uRecords, bool bGap) {
    raw_trace raw(200 + 32 * 64);
    for (uint32_t i = 1; i <= uRecords; ++i) {
        raw.add({.seqNumber = 2 * i, .threadId = i, .timeStamp = (99 + i) * SECOND + SECOND / 2});
        if (i == 2)
            raw.add({.function = 19, .seqNumber = 5, .timeStamp = 1});
    }
    const uint32_t uGap = raw.add_rest();
    if (bGap)
        raw.header.uOldestRecordOffset = uGap;
    return raw;
}

/// Numbers of the first and last record that are output, and how many are.
std::vector<uint32_t> output_of(const raw_trace& raw, int32_t startOptions, int32_t number) {
    anchor.startOptions = startOptions;
    anchor.startRecords = anchor.startSeconds = number;
    anchor.startNanoSeconds = 0;
    memory_trace trace(raw);
    EXPECT_EQ(find_first_record(&trace.file), 0);
    EXPECT_EQ(set_file_start(&trace.file), 0);
    std::vector<uint32_t> numbers;
    trace_record_header header;
    while (is_last_record(&trace.file, &header) == WALK_RECORD) {
        if (trc_kind_is_output(header.function) && start_is_reached(&trace.file, header))
            numbers.push_back(header.threadId);
        if (step_to_next_record(&trace.file, header) != WALK_RECORD)
            break;
    }
    if (numbers.empty())
        return {};
    return {numbers.front(), numbers.back(), static_cast<uint32_t>(numbers.size())};
}

TEST(Start, of_a_file_is_where_the_option_says) {
    const std::vector<uint32_t> all = {1, 20, 20};
    const std::vector<uint32_t> none;
    const struct {
        bool bGap;
        int32_t startOptions;
        int32_t number;
        std::vector<uint32_t> expected;
    } cases[] = {
        {true, START_NONE, 7, all},
        {true, START_RECORD_FROM_BEGIN, 1, all},
        {true, START_RECORD_FROM_BEGIN, 3, {3, 20, 18}},
        {true, START_RECORD_FROM_BEGIN, 21, none},
        {true, START_SECONDS_FROM_BEGIN, 0, {2, 20, 19}}, // the very time is not after it
        {true, START_SECONDS_FROM_BEGIN, 5, {7, 20, 14}},
        {true, START_SECONDS_FROM_BEGIN, -5, all},
        {true, START_SECONDS_FROM_BEGIN, INT32_MAX, none},
        {true, START_RECORDS_FROM_END, 5, {16, 20, 5}}, // the restart record is counted: 21 - 5
        {true, START_RECORDS_FROM_END, 20, all},
        {true, START_RECORDS_FROM_END, 21, none}, // the count itself, which no output reaches
        {true, START_RECORDS_FROM_END, INT32_MIN, none},
        {true, START_SECONDS_FROM_END, 5, {16, 20, 5}},
        {true, START_SECONDS_FROM_END, 119, all}, // of 119.5
        {true, START_SECONDS_FROM_END, 120, all},
        {true, START_TIME, 103, {4, 20, 17}},
        // The oldest position holds a record: nothing is counted, the first is the newest.
        {false, START_RECORDS_FROM_END, 5, all},
        {false, START_SECONDS_FROM_END, 10, all},
        {false, START_SECONDS_FROM_END, -5, {7, 20, 14}},
    };
    for (const auto& [bGap, startOptions, number, expected] : cases)
        EXPECT_EQ(output_of(ring_of(20, bGap), startOptions, number), expected)
            << startOptions << ' ' << number;
    EXPECT_EQ(output_of(ring_of(1, true), START_RECORDS_FROM_END, 5),
              (std::vector<uint32_t>{1, 1, 1}));
}

TEST(Start, search_for_the_newest_record_gives_up_where_the_ring_is_damaged) {
    const struct {
        int64_t iLength;
        uint64_t uBadOffset; ///< 0: the length is what is bad
    } cases[] = {{0, 0}, {27, 0}, {141, 401}, {0xFFFFFFFF, 0x1'0000'0103}, {120, 380}, {100, 260}};
    for (const auto& test : cases) {
        raw_trace raw(400);
        raw.add({.length = 60});
        raw.put(260, {.length = test.iLength});
        raw.put(360, {.length = 40});
        raw.header.uOldestRecordOffset = 300; // between two records: never met
        memory_trace trace(raw);
        anchor.startOptions = START_RECORDS_FROM_END;
        CaptureStderr();
        EXPECT_EQ(set_file_start(&trace.stand_on(260).file), -1);
        EXPECT_THAT(GetCapturedStderr(),
                    HasSubstr(test.uBadOffset != 0
                                  ? out_of_bounds_warning(trace.file, test.uBadOffset)
                                  : "invalid record length"));
    }
}

} // namespace
