#include "walk.h"

#include "first_record.h"
#include "memory_trace.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

using testing::HasSubstr;
using testing::Pair;
using testing::internal::CaptureStderr;
using testing::internal::GetCapturedStderr;

namespace {

/// What a function returns and what it writes.
using answer = std::pair<walk_result, std::string>;

const answer A_RECORD = {WALK_RECORD, ""};
const answer NO_RECORD = {WALK_NO_RECORD, ""};

answer out_of_bounds(const memory_trace& trace, uint64_t uOffset) {
    return {WALK_CORRUPT, out_of_bounds_warning(trace.file, uOffset)};
}

/// What is_last_record says at the position.
answer ask(memory_trace& trace, uint64_t uOffset) {
    trace_record_header header;
    CaptureStderr();
    const walk_result result = is_last_record(&trace.stand_on(uOffset).file, &header);
    return {result, GetCapturedStderr()};
}

answer step(memory_trace& trace) {
    CaptureStderr();
    const walk_result result = get_next_record(&trace.file);
    return {result, GetCapturedStderr()};
}

TEST(Walk, judges_records_by_function_component_and_length) {
    const struct {
        raw_record record;
        const char* pWhat = ""; ///< "": it is a record
        const char* pFound = "";
    } cases[] = {
        {{.function = 18}, "function type", "function(18)."},
        {{.function = 20, .compId = "", .length = 0}, "function type", "function(20)."},
        {{.function = 0xFFFD}, "function type", "function(65533)."},
        {{.function = 0xFFFF}, "function type", "function(65535)."},
        {{.function = 1, .compId = "A\tB\x7F", .length = 0}, "compId", "compId[0-3][0x419427f])"},
        {{.function = 16, .compId = "\xFF"}, "compId", "compId[0-3][0xff000])"},
        {{.function = 1, .length = 27}, "length", "length(27)."},
        {{.function = 0, .compId = "", .length = 0}, "length", "length(0)."},
        {{.function = 1, .compId = " ~_9"}},
        {{.function = 0, .compId = ""}},
        {{.function = 17, .compId = ""}},
        {{.function = 19, .compId = ""}},
        {{.function = 0xFFFE, .compId = ""}},
    };
    for (const auto& [record, pWhat, pFound] : cases) {
        raw_trace raw(300);
        raw.put(200, record);
        raw.header.uSeqLock = 0;
        memory_trace trace(raw);
        const answer expected =
            *pWhat != '\0' ? answer{WALK_CORRUPT, record_warning(pWhat, pFound)} : A_RECORD;
        EXPECT_EQ(ask(trace, 200), expected) << record.function;
    }
}

TEST(Walk, an_oldest_position_without_a_whole_header_is_out_of_bounds) {
    raw_trace raw(300);
    raw.put(200, {.seqNumber = 2});
    raw.header.uSeqLock = 2;
    for (const uint32_t uOldest : {0U, 199U, 273U, 300U, 0xFFFFFFFFU}) {
        raw.header.uOldestRecordOffset = uOldest;
        memory_trace trace(raw);
        EXPECT_EQ(ask(trace, 200), out_of_bounds(trace, uOldest));
    }
}

TEST(Walk, no_record_stands_on_the_words_that_the_reader_writes) {
    raw_trace raw(400);
    raw.header.uOffset = offsetof(trace_file_header, uSeqLock); // a filler of uSeqLock bytes
    raw.header.uSeqLock = 100;
    raw.header.uOldestRecordOffset = 200;
    raw.put(200, {.seqNumber = 100, .length = 200});
    memory_trace trace(raw);
    EXPECT_EQ(step(trace.stand_on(200)), out_of_bounds(trace, raw.header.uOffset));
    EXPECT_EQ(trace.file.pHeader->uSeqLock, 100U) << "not passed";

    raw.header.uOffset = offsetof(trace_file_header, uTailReq) + sizeof(uint32_t);
    raw.uHeaderBytes = raw.header.uOffset; // the record's time stamp ends in uOldestRecordOffset
    raw.put(raw.header.uOffset, {.timeStamp = 200ULL << 32, .length = 100});
    memory_trace behind(raw);
    EXPECT_EQ(ask(behind, raw.header.uOffset), A_RECORD);
}

TEST(Walk, knows_that_it_has_caught_up_and_says_when_the_ring_is_inconsistent) {
    raw_trace raw(400);
    raw.header.uSeqLock = 10;
    raw.add({.seqNumber = 10, .body = std::vector<std::byte>(4)});
    raw.add({.seqNumber = 12, .body = std::vector<std::byte>(4)});
    raw.add_rest();
    memory_trace trace(raw);
    trace_file_header& header = *trace.file.pHeader;
    header.uSeqLock = TRC_SEQ_NO_READER; // somebody else's store
    EXPECT_EQ(ask(trace, 200), A_RECORD) << "the next one in sequence";
    EXPECT_EQ(header.uSeqLock, 10U) << "put right by the look";
    trace.file.uExpectedSeq = 8;
    EXPECT_EQ(ask(trace, 200), NO_RECORD) << "another one";
    EXPECT_EQ(ask(trace, 232), A_RECORD) << "not on the oldest position";

    header.uActualFileSize = 231;
    EXPECT_THAT(ask(trace, 232),
                Pair(WALK_NO_RECORD, HasSubstr("beyond end of file, offset = 232 ")));
    header.uActualFileSize = 232;
    EXPECT_EQ(ask(trace, 232), A_RECORD);

    header.uOldestRecordOffset = 263;
    EXPECT_THAT(ask(trace, 232), Pair(WALK_NO_RECORD, HasSubstr("not correct. offset=232 (0xe8)")));
    EXPECT_EQ(step(trace).first, WALK_NO_RECORD);
    EXPECT_EQ(trace.offset(), 232U) << "no step";
    header.uOldestRecordOffset = 264;
    EXPECT_EQ(ask(trace, 232), A_RECORD);
    header.uSeqLock = 0;
    EXPECT_EQ(step(trace), A_RECORD);
    EXPECT_EQ(header.uSeqLock, 10U) << "put right by the step";
}

TEST(Walk, does_not_pass_a_record_that_ends_beyond_the_file) {
    raw_trace raw(400);
    raw.header.uOldestRecordOffset = 340;
    raw.header.uSeqLock = 2;
    memory_trace trace(raw);
    for (const int64_t iLength : {61LL, 0xFFFFFF00LL, 0xFFFFFFFFLL}) {
        trace.put(340, {.seqNumber = 2, .length = iLength});
        const uint64_t uNext = 340 + static_cast<uint64_t>(iLength);
        EXPECT_EQ(step(trace.stand_on(340)), out_of_bounds(trace, uNext));
        EXPECT_EQ(trace.file.pHeader->uSeqLock, 2U) << "not passed";
    }
    EXPECT_EQ(record_bytes(&trace.file, ring_position(&trace.file, 340), 0xFFFFFFFF).size(), 60U);
    EXPECT_EQ(record_bytes(&trace.file, trace.file.pMapEnd, 28).size(), 0U);
}

TEST(Walk, waits_for_a_number_only_on_the_newest_record) {
    raw_trace raw(400);
    raw.put(200, {.seqNumber = TRC_SEQ_FILLER, .body = raw_bytes(7U)});
    raw.header.uOldestRecordOffset = 232;
    memory_trace trace(raw);
    trace.stand_on(200);
    trace_record_header header;
    ASSERT_EQ(is_last_record(&trace.file, &header), WALK_RECORD);
    EXPECT_FALSE(number_has_come(&trace.file, &header));
    trace.put(200, {.seqNumber = 8, .body = raw_bytes(7U)});
    EXPECT_TRUE(number_has_come(&trace.file, &header));
    EXPECT_EQ(header.seqNumber, 8U);
    header.seqNumber = TRC_SEQ_FILLER;
    trace.put(200, {.seqNumber = TRC_SEQ_FILLER, .body = raw_bytes(7U)});
    trace.file.pHeader->uOldestRecordOffset = 300; // no record but the newest has none
    EXPECT_TRUE(number_has_come(&trace.file, &header));
}

TEST(Walk, takes_no_gap_filler_for_the_next_record) {
    for (const bool bFillersOnly : {false, true}) {
        raw_trace raw(400);
        raw.add_filler(100);
        if (bFillersOnly)
            raw.add_filler(64);
        else
            for (const uint32_t uNumber : {0xFFDU - 2, 0xFFDU})
                raw.add({.seqNumber = uNumber, .body = raw_bytes(7U)});
        raw.add_rest();
        memory_trace trace(raw);
        ASSERT_EQ(find_first_record(&trace.file), 0);
        int iSteps = 0;
        while (iSteps < 10 && get_next_record(&trace.file) == WALK_RECORD)
            ++iSteps;
        EXPECT_EQ(iSteps, bFillersOnly ? 0 : 3) << "once";
        EXPECT_EQ(trace.file.uExpectedSeq, 0xFFFU);
        EXPECT_EQ(ask(trace, 200), NO_RECORD) << "still the same";

        // A writer goes on.
        const uint32_t uNumber = bFillersOnly ? 70 : 0xFFF;
        trace.put(200, {.seqNumber = uNumber, .length = 50});
        trace.put(250, {.function = 0, .seqNumber = TRC_SEQ_FILLER, .length = 50});
        trace.file.pHeader->uOldestRecordOffset = 250;
        EXPECT_EQ(step(trace.stand_on(200)), A_RECORD);
        EXPECT_EQ(trace.file.pHeader->uSeqLock, uNumber + 2) << "known from the first record on";
        EXPECT_EQ(ask(trace, 250), NO_RECORD);
    }
}

} // namespace
