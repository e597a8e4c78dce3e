#include "first_record.h"

#include "memory_trace.h"
#include "walk.h"

#include <gtest/gtest.h>

using testing::internal::CaptureStderr;
using testing::internal::GetCapturedStderr;

namespace {

/// What the search returns, its position, uSeqLock, and what it writes.
using search_result = std::tuple<int, uint64_t, uint32_t, std::string>;

search_result find(memory_trace& trace) {
    CaptureStderr();
    const int iResult = find_first_record(&trace.file);
    return {iResult, trace.offset(), trace.file.pHeader->uSeqLock, GetCapturedStderr()};
}

TEST(FirstRecord, lies_behind_fillers_and_unfinished_records_and_round_the_end) {
    raw_trace raw(400);
    raw.put(340, {.function = 0xFFFF, .seqNumber = 1, .length = 28});
    raw.put(368, {.function = 0, .seqNumber = 3, .length = 0xFFFFFFF0}); // passes the end
    raw.put(200, {.function = 0, .seqNumber = 5, .timeStamp = 1'500'000'000, .length = 100});
    raw.put(300, {.function = 19, .seqNumber = 77, .timeStamp = 2'500'000'000, .length = 40});
    raw.header.uOldestRecordOffset = 340;
    raw.header.timeInfo = {.timeinfo1 = 1'000'000'000, .timeinfo2 = 0};
    memory_trace trace(raw);
    EXPECT_EQ(find(trace), (search_result{0, 300, 77, ""}));
    EXPECT_EQ(trace.file.timeStampIsValid, 1);
    EXPECT_EQ(trace.file.modTime.tv_sec, 3);
    EXPECT_EQ(trace.file.modTime.tv_nsec, 500'000'000);

    raw.header.uOldestRecordOffset = 300;
    memory_trace atOnce(raw);
    EXPECT_EQ(find(atOnce), (search_result{0, 300, 77, ""}));
    EXPECT_EQ(atOnce.file.timeStampIsValid, 0) << "only a step takes a time";
}

TEST(FirstRecord, is_not_the_newest_which_waits_for_its_number) {
    raw_trace raw(400);
    raw.header.timeInfo = {.timeinfo1 = 100, .timeinfo2 = 0};
    raw.put(260, {.seqNumber = TRC_SEQ_FILLER, .timeStamp = 9, .length = 40});
    raw.put(300, {.function = 0, .seqNumber = TRC_SEQ_FILLER, .length = 100});
    raw.put(200, {.seqNumber = 6, .timeStamp = 7, .length = 60});
    raw.header.uOldestRecordOffset = 260;
    memory_trace trace(raw);
    EXPECT_EQ(find(trace), (search_result{0, 200, 6, ""}));
    cu_nanoseconds time = 0;
    EXPECT_TRUE(oldest_record_time(&trace.file, &time) && time == 107);
    trace.put(200, {.function = 0, .seqNumber = TRC_SEQ_FILLER, .length = 60});
    EXPECT_EQ(find(trace), (search_result{0, 260, TRC_SEQ_FILLER, ""})) << "it is the only one";
}

TEST(FirstRecord, search_gives_up_where_the_ring_is_damaged) {
    for (const int iLength : {0, 27}) {
        raw_trace raw(400);
        raw.put(200, {.function = 0, .length = iLength});
        memory_trace trace(raw);
        const std::string found = "length(" + std::to_string(iLength) + ").";
        EXPECT_EQ(find(trace), (search_result{-1, 200, 0, record_warning("length", found)}));
    }
    raw_trace raw(400); // from 228 on the round trip misses the oldest position
    raw.put(228, {.function = 0, .length = 172});
    raw.put(200, {.function = 0, .length = 60});
    raw.put(260, {.function = 0, .length = 40});
    raw.put(300, {.function = 0, .length = 100});
    raw.header.uOldestRecordOffset = 228;
    memory_trace trace(raw);
    EXPECT_EQ(find(trace), (search_result{-1, 260, 0, out_of_bounds_warning(trace.file, 260)}))
        << "once around";
}

TEST(FirstRecord, converted_time_is_found_without_a_trace) {
    const cu_timeinfo own = {.timeinfo1 = 9000, .timeinfo2 = 10};
    const struct {
        raw_record record;
        int iTime; ///< -1: none
    } cases[] = {
        {{.function = 6, .timeStamp = 50}, 150},
        {{.function = 17, .timeStamp = 50}, 150},
        {{.function = 16, .timeStamp = 50, .body = raw_bytes(0U, 0U, own)}, 9040},
        {{.function = 16, .timeStamp = 50, .length = 51}, 150}, // no room for a base of its own
        {{.function = 18, .timeStamp = 50}, -1},
        {{.function = 0, .length = 27}, -1},
        {{.function = 0, .length = 372}, -1}, // nothing behind
    };
    for (const auto& test : cases) {
        raw_trace raw(600);
        raw.header.timeInfo = {.timeinfo1 = 100, .timeinfo2 = 0};
        raw.add_filler(28);
        raw.add({.function = 0xFFFE, .timeStamp = 1});
        raw.put(256, test.record);
        memory_trace trace(raw);
        cu_nanoseconds time = -1;
        CaptureStderr();
        EXPECT_EQ(oldest_record_time(&trace.file, &time), test.iTime >= 0) << test.record.function;
        EXPECT_EQ(GetCapturedStderr(), "");
        EXPECT_TRUE(time == test.iTime) << test.record.function;
    }
}

} // namespace
