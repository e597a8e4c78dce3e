#include "first_record.h"

#include "memory_trace.h"
#include "walk.h"

#include <gtest/gtest.h>

using testing::internal::CaptureStderr;
using testing::internal::GetCapturedStderr;

namespace {

struct search_result {
    int iResult;
    uint64_t uOffset;
    uint32_t uSeqLock;
    bool operator==(const search_result&) const = default;
};

void PrintTo(const search_result& result, std::ostream* pOut) {
    *pOut << result.iResult << " at " << result.uOffset << ", uSeqLock " << result.uSeqLock;
}

search_result find(memory_trace& trace, std::string* pWarning = nullptr) {
    CaptureStderr();
    const int iResult = find_first_record(&trace.file);
    const std::string warning = GetCapturedStderr();
    if (pWarning != nullptr)
        *pWarning = warning;
    else
        EXPECT_EQ(warning, "");
    return {iResult, trace.offset(), trace.file.pHeader->uSeqLock};
}

TEST(FirstRecord, is_the_one_at_the_oldest_position) {
    raw_trace raw(400);
    raw.add({.seqNumber = 8, .timeStamp = 5});
    memory_trace trace(raw);
    EXPECT_EQ(find(trace), (search_result{0, 200, 8}));
    EXPECT_EQ(trace.file.timeStampIsValid, 0) << "only a step takes a time";
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
    EXPECT_EQ(find(trace), (search_result{0, 300, 77}));
    EXPECT_EQ(trace.file.timeStampIsValid, 1);
    EXPECT_EQ(trace.file.modTime.tv_sec, 3);
    EXPECT_EQ(trace.file.modTime.tv_nsec, 500'000'000);
}

TEST(FirstRecord, of_a_ring_without_records_is_the_oldest_position) {
    raw_trace raw(400);
    raw.add_filler(172);
    raw.add_filler(28, 66);
    memory_trace trace(raw);
    EXPECT_EQ(find(trace), (search_result{0, 200, 66})) << "the number of the record to come";
    trace_record_header header;
    EXPECT_EQ(is_last_record(&trace.file, &header), WALK_NO_RECORD);
    trace.put(200, {.seqNumber = 66, .length = 172});
    EXPECT_EQ(is_last_record(&trace.file, &header), WALK_RECORD);
}

TEST(FirstRecord, search_gives_up_where_the_ring_is_damaged) {
    std::string warning;
    for (const uint32_t uOldest : {0U, 196U, 373U, 400U, 0xFFFFFFFFU}) {
        raw_trace raw(400);
        raw.header.uOldestRecordOffset = uOldest;
        memory_trace trace(raw);
        EXPECT_EQ(find(trace, &warning).iResult, -1);
        EXPECT_EQ(warning, out_of_bounds_warning(trace.file, uOldest));
    }
    for (const uint32_t uLength : {0U, 27U}) {
        raw_trace raw(400);
        raw.put(200, {.function = 0, .length = uLength});
        memory_trace trace(raw);
        EXPECT_EQ(find(trace, &warning).iResult, -1);
        EXPECT_NE(warning.find("invalid record length: file(ring.trc) record_offset(0x000000c8) "
                               "length(" +
                               std::to_string(uLength) + ").\n"),
                  std::string::npos);
    }
    raw_trace raw(400); // from 228 on the round trip misses the oldest position
    raw.put(228, {.function = 0, .length = 172});
    raw.put(200, {.function = 0, .length = 60});
    raw.put(260, {.function = 0, .length = 40});
    raw.put(300, {.function = 0, .length = 100});
    raw.header.uOldestRecordOffset = 228;
    memory_trace trace(raw);
    EXPECT_EQ(find(trace, &warning).iResult, -1);
    EXPECT_EQ(warning, out_of_bounds_warning(trace.file, 260)) << "once around";
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
        const std::vector<std::byte> before = trace.bytes();
        cu_nanoseconds time = -1;
        CaptureStderr();
        EXPECT_EQ(oldest_record_time(&trace.file, &time), test.iTime >= 0) << test.record.function;
        EXPECT_EQ(GetCapturedStderr(), "");
        EXPECT_TRUE(time == test.iTime) << test.record.function;
        EXPECT_TRUE(trace.bytes() == before);
        EXPECT_EQ(trace.offset(), 200U);
    }
}

TEST(FirstRecord, request_is_raised_until_it_is_released) {
    memory_trace trace(raw_trace(300));
    request_tail(&trace.file);
    EXPECT_EQ(trace.file.pHeader->uTailReq, TRC_TAIL_REQUESTED);
    release_tail(&trace.file);
    EXPECT_EQ(trace.file.pHeader->uTailReq, 0U);
}

} // namespace
