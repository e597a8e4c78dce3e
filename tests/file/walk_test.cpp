#include "walk.h"

#include "first_record.h"
#include "memory_trace.h"

#include <gtest/gtest.h>

using testing::internal::CaptureStderr;
using testing::internal::GetCapturedStderr;

namespace {

const std::string GIVING_UP =
    "WARNING: Irrecoverable corruption detected (giving up on the rest of this file): ";

/// What is_last_record says at the position, and what it writes.
std::pair<walk_result, std::string> ask(memory_trace& trace, uint64_t uOffset) {
    trace_record_header header;
    CaptureStderr();
    const walk_result result = is_last_record(&trace.stand_on(uOffset).file, &header);
    return {result, GetCapturedStderr()};
}

std::pair<walk_result, std::string> step(memory_trace& trace) {
    CaptureStderr();
    const walk_result result = get_next_record(&trace.file);
    return {result, GetCapturedStderr()};
}

using answer = std::pair<walk_result, std::string>;

TEST(Walk, judges_records_by_function_component_and_length) {
    const struct {
        raw_record record;
        const char* pWarning;
    } cases[] = {
        {{.function = 18},
         "invalid record function type: file(ring.trc) "
         "record_offset(0x000000c8) function(18).\n"},
        {{.function = 20, .compId = "", .length = 0},
         "invalid record function type: file(ring.trc) record_offset(0x000000c8) "
         "function(20).\n"},
        {{.function = 0xFFFD},
         "invalid record function type: file(ring.trc) "
         "record_offset(0x000000c8) function(65533).\n"},
        {{.function = 0xFFFF},
         "invalid record function type: file(ring.trc) "
         "record_offset(0x000000c8) function(65535).\n"},
        {{.function = 1, .compId = "A\tB\x7F", .length = 0},
         "invalid record compId: file(ring.trc) record_offset(0x000000c8) "
         "compId[0-3][0x419427f])\n"},
        {{.function = 16, .compId = "\xFF"},
         "invalid record compId: file(ring.trc) record_offset(0x000000c8) "
         "compId[0-3][0xff000])\n"},
        {{.function = 1, .length = 27},
         "invalid record length: file(ring.trc) record_offset(0x000000c8) length(27).\n"},
        {{.function = 0, .compId = "", .length = 0},
         "invalid record length: file(ring.trc) record_offset(0x000000c8) length(0).\n"},
        {{.function = 1, .compId = " ~_9"}, nullptr},
        {{.function = 0, .compId = ""}, nullptr},
        {{.function = 17, .compId = ""}, nullptr},
        {{.function = 19, .compId = ""}, nullptr},
        {{.function = 0xFFFE, .compId = ""}, nullptr},
    };
    for (const auto& test : cases) {
        raw_trace raw(300);
        raw.put(200, test.record);
        raw.header.uSeqLock = 0;
        memory_trace trace(raw);
        const answer expected = test.pWarning != nullptr
                                    ? answer{WALK_CORRUPT, GIVING_UP + test.pWarning}
                                    : answer{WALK_RECORD, ""};
        EXPECT_EQ(ask(trace, 200), expected) << test.record.function;
    }
}

TEST(Walk, positions_without_a_whole_header_are_out_of_bounds) {
    raw_trace raw(300);
    raw.put(200, {.seqNumber = 2});
    for (const uint64_t uOffset : {0ULL, 199ULL, 273ULL, 300ULL, 301ULL, 0x1'0000'00C8ULL, ~0ULL}) {
        memory_trace trace(raw);
        EXPECT_EQ(ask(trace, uOffset),
                  (answer{WALK_CORRUPT, out_of_bounds_warning(trace.file, uOffset)}));
    }
    raw.header.uSeqLock = 2;
    for (const uint32_t uOldest : {0U, 199U, 273U, 300U, 0xFFFFFFFFU}) {
        raw.header.uOldestRecordOffset = uOldest;
        memory_trace trace(raw);
        EXPECT_EQ(ask(trace, 200),
                  (answer{WALK_CORRUPT, out_of_bounds_warning(trace.file, uOldest)}));
    }
}

TEST(Walk, no_record_stands_on_the_words_that_the_reader_writes) {
    raw_trace raw(400);
    raw.header.uOffset = offsetof(trace_file_header, uSeqLock); // a filler of uSeqLock bytes
    raw.header.uSeqLock = 100;
    raw.header.uOldestRecordOffset = 200;
    raw.put(200, {.seqNumber = 100, .length = 200});
    memory_trace trace(raw);
    EXPECT_EQ(step(trace.stand_on(200)),
              (answer{WALK_CORRUPT, out_of_bounds_warning(trace.file, raw.header.uOffset)}));
    EXPECT_EQ(trace.file.pHeader->uSeqLock, 100U) << "not passed";

    raw.header.uOffset = offsetof(trace_file_header, uTailReq) + sizeof(uint32_t);
    raw.uHeaderBytes = raw.header.uOffset; // the record's time stamp ends in uOldestRecordOffset
    raw.put(raw.header.uOffset, {.timeStamp = 200ULL << 32, .length = 100});
    memory_trace behind(raw);
    EXPECT_EQ(ask(behind, raw.header.uOffset), (answer{WALK_RECORD, ""}));
}

TEST(Walk, knows_that_it_has_caught_up_and_says_when_the_ring_is_inconsistent) {
    raw_trace raw(400);
    raw.header.uSeqLock = 10;
    raw.add({.seqNumber = 10, .body = std::vector<std::byte>(4)});
    raw.add({.seqNumber = 12, .body = std::vector<std::byte>(4)});
    raw.add_rest();
    memory_trace trace(raw);
    trace_file_header& header = *trace.file.pHeader;
    EXPECT_EQ(ask(trace, 200), (answer{WALK_RECORD, ""})) << "the next one in sequence";
    header.uSeqLock = 8;
    EXPECT_EQ(ask(trace, 200), (answer{WALK_NO_RECORD, ""})) << "another one";
    EXPECT_EQ(ask(trace, 232), (answer{WALK_RECORD, ""})) << "not on the oldest position";

    header.uActualFileSize = 231;
    EXPECT_EQ(ask(trace, 232), (answer{WALK_NO_RECORD, "Bad trace file, last record extends beyond "
                                                       "end of file, offset = 232 (0xe8).\n"}));
    header.uActualFileSize = 232;
    EXPECT_EQ(ask(trace, 232), (answer{WALK_RECORD, ""}));

    header.uOldestRecordOffset = 263;
    EXPECT_EQ(ask(trace, 232),
              (answer{WALK_NO_RECORD,
                      "Bad trace file, last record length is not correct. offset=232 (0xe8), "
                      "length=32, function=1, seqNumber=12 (0xc)\n"}));
    EXPECT_EQ(step(trace).first, WALK_NO_RECORD);
    EXPECT_EQ(trace.offset(), 232U) << "no step";
    header.uOldestRecordOffset = 264;
    EXPECT_EQ(ask(trace, 232), (answer{WALK_RECORD, ""}));
}

TEST(Walk, steps_round_the_end_and_counts_what_takes_part_in_the_sequence) {
    raw_trace raw(400);
    raw.header.uSeqLock = 4092;
    raw.header.uOldestRecordOffset = 340;
    raw.put(200, {.function = 1, .seqNumber = 7, .length = 140});
    raw.put(340, {.function = 0, .seqNumber = 4092, .length = 60});
    memory_trace trace(raw);
    const auto walk = [&trace](uint64_t uOffset) {
        const answer result = step(trace.stand_on(uOffset));
        EXPECT_EQ(result, (answer{WALK_RECORD, ""}));
        return std::pair{trace.offset(), trace.file.pHeader->uSeqLock};
    };
    EXPECT_EQ(walk(340), (std::pair{uint64_t{200}, 4094U})) << "ends exactly at the end";
    EXPECT_EQ(walk(200), (std::pair{uint64_t{340}, 4096U}));

    trace.file.pHeader->uSeqLock = TRC_SEQ_FILLER;
    trace.put(340, {.function = 0, .seqNumber = TRC_SEQ_FILLER, .length = 60});
    EXPECT_EQ(walk(340), (std::pair{uint64_t{200}, TRC_SEQ_FILLER})) << "does not count";

    for (const int64_t iLength : {61LL, 0xFFFFFF00LL, 0xFFFFFFFFLL}) {
        trace.file.pHeader->uSeqLock = 2;
        trace.put(340, {.seqNumber = 2, .length = iLength});
        const uint64_t uNext = 340 + static_cast<uint64_t>(iLength);
        EXPECT_EQ(step(trace.stand_on(340)),
                  (answer{WALK_CORRUPT, out_of_bounds_warning(trace.file, uNext)}));
        EXPECT_EQ(trace.file.pHeader->uSeqLock, 2U) << "not passed";
    }
    EXPECT_EQ(record_bytes(&trace.file, ring_position(&trace.file, 340), 0xFFFFFFFF).size(), 60U);
    EXPECT_EQ(record_bytes(&trace.file, trace.file.pMapEnd, 28).size(), 0U);
}

TEST(Walk, waits_for_a_number_only_on_the_newest_record) {
    raw_trace raw(400);
    raw.put(200, {.seqNumber = TRC_SEQ_FILLER, .body = raw_bytes(uint32_t{7})});
    raw.header.uOldestRecordOffset = 232;
    memory_trace trace(raw);
    trace.stand_on(200);
    trace_record_header header;
    ASSERT_EQ(is_last_record(&trace.file, &header), WALK_RECORD);
    EXPECT_FALSE(number_has_come(&trace.file, &header));
    trace.put(200, {.seqNumber = 8, .body = raw_bytes(uint32_t{7})});
    EXPECT_TRUE(number_has_come(&trace.file, &header));
    EXPECT_EQ(header.seqNumber, 8U);
    header.seqNumber = TRC_SEQ_FILLER;
    trace.put(200, {.seqNumber = TRC_SEQ_FILLER, .body = raw_bytes(uint32_t{7})});
    trace.file.pHeader->uOldestRecordOffset = 300; // no record but the newest has none
    EXPECT_TRUE(number_has_come(&trace.file, &header));
}

TEST(Walk, ends_on_a_ring_of_fillers_and_notices_a_writer_that_goes_on) {
    raw_trace raw(400);
    raw.add_filler(100);
    raw.add_filler(100);
    for (const bool bMovesOldest : {false, true}) {
        memory_trace trace(raw);
        ASSERT_EQ(find_first_record(&trace.file), 0);
        EXPECT_EQ(trace.offset(), 200U);
        int iSteps = 0;
        while (iSteps < 10 && get_next_record(&trace.file) == WALK_RECORD)
            ++iSteps;
        EXPECT_EQ(iSteps, 2) << "one turn";
        EXPECT_EQ(ask(trace, 200), (answer{WALK_NO_RECORD, ""})) << "still the same";
        if (bMovesOldest) { // the record goes behind what stands here
            trace.put(300, {.seqNumber = TRC_SEQ_FILLER, .length = 100});
            trace.file.pHeader->uOldestRecordOffset = 300;
            EXPECT_EQ(step(trace), (answer{WALK_RECORD, ""}));
        } else {
            trace.put(200, {.seqNumber = TRC_SEQ_FILLER, .length = 100});
        }
        EXPECT_EQ(step(trace), (answer{WALK_RECORD, ""}));
        EXPECT_EQ(trace.file.pHeader->uSeqLock, TRC_SEQ_FILLER + 2);
        EXPECT_EQ(trace.file.uUncountedBytes, 0U);
    }
}

} // namespace
