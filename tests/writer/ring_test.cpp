// The ring of a file that nobody reads: after every append it is sound, and its
// records are the newest ones that were appended.
#include "raw_trace.h"
#include "reference_reader.h"
#include "temp_dir.h"
#include "trace_writer.h"

#include <deque>
#include <gtest/gtest.h>
#include <random>
#include <unistd.h>

namespace {

constexpr uint32_t HEADER = sizeof(trace_file_header);

/// A writer and what its file must hold: every appended body, oldest first.
class checked_writer {
public:
    checked_writer(const std::string& path, uint32_t uArea) {
        trace_writer_options options;
        options.uFileSize = HEADER + uArea;
        EXPECT_EQ(writer.create(path.c_str(), options), TRACE_WRITER_OK);
    }

    /// Appends a record of `uLength` bytes and checks the ring.
    void append(uint32_t uLength) {
        std::vector<std::byte> body(uLength - sizeof(trace_record_header), std::byte(uNumber & 63));
        ASSERT_EQ(writer.append(TRC_FUNC_DATA, {"_TST", 7, uNumber}, body), TRACE_WRITER_OK);
        body.resize((body.size() + 3) & ~size_t{3});
        expected.push_back({uNumber++, std::move(body)});
        check();
    }

    trace_writer writer;

private:
    struct appended {
        uint64_t uNumber;
        std::vector<std::byte> body;
    };

    void check() {
        const ring_listing ring = list_ring(writer.mapping());
        ASSERT_EQ(ring.problem, "");
        const ring_element& gap = ring.elements.front();
        ASSERT_TRUE(gap.is_filler() && !gap.counts());
        const std::vector<ring_element> records = ring.records();
        ASSERT_FALSE(records.empty());
        ASSERT_LE(records.size(), expected.size());
        while (expected.size() > records.size())
            expected.pop_front();
        for (size_t i = 0; i < records.size(); ++i) {
            ASSERT_EQ(uint64_t{records[i].header.timeStamp}, expected[i].uNumber);
            ASSERT_EQ(uint32_t{records[i].header.seqNumber}, 2 + 2 * expected[i].uNumber);
            ASSERT_EQ(records[i].body, expected[i].body);
        }
        ASSERT_EQ(writer.counts().uGivenUp, uNumber - records.size());
    }

    std::deque<appended> expected;
    uint64_t uNumber = 0;
};

TEST(trace_ring, holds_the_newest_records_after_random_appends) {
    const temp_dir dir;
    std::mt19937 engine(4711);
    const auto random = [&engine] { return static_cast<uint32_t>(engine()); };
    std::vector<uint32_t> areas{1000, 4096};
    for (uint32_t uArea = 56; uArea <= 180; uArea += 4)
        areas.push_back(uArea);
    for (const uint32_t uArea : areas) {
        SCOPED_TRACE(uArea);
        checked_writer writer(dir.file("ring"), uArea);
        const uint32_t uMax = writer.writer.max_record_length();
        for (int i = 0; i < 1500 && !testing::Test::HasFatalFailure(); ++i) {
            const uint32_t uLongest = random() % 8 == 0 ? uMax : std::min(uMax, 100U);
            writer.append(28 + random() % (uLongest - 28 + 1));
        }
    }
}

TEST(trace_ring, refuses_what_no_file_can_hold) {
    const temp_dir dir;
    const std::string path = dir.file("trace");
    trace_writer writer;
    EXPECT_EQ(writer.append_id({"_TST"}, 1), TRACE_WRITER_INVALID);
    EXPECT_EQ(writer.poll(), TRACE_WRITER_INVALID);
    const auto create = [&](uint32_t uSize, uint32_t uOffset, uint32_t uSeq) {
        trace_writer_options options;
        options.uFileSize = uSize;
        options.uOffset = uOffset;
        options.uFirstSeqNumber = uSeq;
        return writer.create(path.c_str(), options);
    };
    EXPECT_EQ(create(255, 200, 2), TRACE_WRITER_INVALID);
    EXPECT_EQ(create(252, 200, 2), TRACE_WRITER_INVALID);
    EXPECT_EQ(create(1000, 198, 2), TRACE_WRITER_INVALID);
    EXPECT_EQ(create(1000, 48, 2), TRACE_WRITER_INVALID);
    EXPECT_EQ(create(1000, 2000, 2), TRACE_WRITER_INVALID);
    EXPECT_EQ(create(1000, 200, 3), TRACE_WRITER_INVALID);
    EXPECT_EQ(writer.create((path + "/none").c_str()), TRACE_WRITER_SYSTEM);

    ASSERT_EQ(create(1000, 200, 2), TRACE_WRITER_OK);
    const std::vector<std::byte> body(800);
    const auto append = [&](uint16_t function, std::string_view compId, size_t uBody) {
        return writer.append(function, {compId}, trace_bytes(body).first(uBody));
    };
    for (const uint16_t function : std::initializer_list<uint16_t>{0, 18, 20, 0xFFFD, 0xFFFF})
        EXPECT_EQ(append(function, "_TST", 0), TRACE_WRITER_INVALID) << function;
    for (const std::string_view compId : {"", "_TS", "_TSTX", "a\tbc", "abc\x7f", "abc\xff"})
        EXPECT_EQ(append(TRC_FUNC_ID, compId, 4), TRACE_WRITER_INVALID) << compId;
    EXPECT_EQ(append(TRC_FUNC_DATA, "_TST", 745), TRACE_WRITER_TOO_LONG);
    EXPECT_EQ(writer.counts().uAppended, 0U);
    EXPECT_TRUE(list_ring(writer.mapping()).records().empty());
    EXPECT_EQ(append(TRC_FUNC_DATA, "_TST", 744), TRACE_WRITER_OK);
    EXPECT_EQ(append(TRC_FUNC_TIME_CALIBRATION, {"\0\0\0\0", 4}, 16), TRACE_WRITER_OK);
    EXPECT_EQ(list_ring(writer.mapping()).problem, "");

    // A ring that somebody else has overwritten is left alone.
    std::fill(writer.mapping().begin() + 200, writer.mapping().end(), std::byte{0});
    EXPECT_EQ(append(TRC_FUNC_DATA, "_TST", 744), TRACE_WRITER_DAMAGED);
    EXPECT_EQ(writer.counts().uDropped, 0U);
}

TEST(trace_ring, is_closed_for_a_short_handshake_with_the_header_that_was_asked_for) {
    const temp_dir dir;
    const std::string path = dir.file("trace");
    trace_writer_options options;
    options.uFileSize = 300;
    options.uOffset = 196;
    options.uPlatform = 9;
    options.uNodeNumber = 12;
    options.timeInfo = {77, 88};
    options.program = "0123456789012345678901234567890123456789012345678901234567890";
    options.baseProgName = "base";
    options.uNode_ID = 0x123456789ABCDEF0;
    options.tz_offset = 60;
    trace_writer writer;
    ASSERT_EQ(writer.create(path.c_str(), options), TRACE_WRITER_OK);
    ASSERT_EQ(writer.append_id({"_TST", 1, 99}, 5), TRACE_WRITER_OK);
    EXPECT_EQ(load<trace_file_header>(writer.mapping(), 0).uFlags, 0);
    writer.close();

    const std::vector<std::byte> file = read_file(path);
    const auto header = load<trace_file_header>(file, 0);
    EXPECT_EQ(header.uProperties, 0xC0);
    EXPECT_EQ(header.uPlatform, 9);
    EXPECT_EQ(header.uVersion, 6);
    EXPECT_EQ(header.uFlags, 0x8000);
    EXPECT_EQ(header.uNodeNumber, 12);
    EXPECT_EQ(header.uSeqLock, 0xFFFFFFFF);
    EXPECT_EQ(header.uTailReq, 0U);
    EXPECT_EQ(header.uActualFileSize, 300U);
    EXPECT_TRUE(cu_timeinfo{header.timeInfo} == (cu_timeinfo{77, 88}));
    EXPECT_EQ(header.uPid, static_cast<uint32_t>(getpid()));
    EXPECT_EQ(std::string_view(header.program, 48), options.program.substr(0, 48));
    EXPECT_STREQ(header.baseProgName, "base");
    EXPECT_EQ(uint64_t{header.uNode_ID}, options.uNode_ID);
    EXPECT_NE(header.tz_offset, 60) << "the record area begins before this field";
    const ring_listing ring = list_ring(file);
    EXPECT_EQ(ring.problem, "");
    ASSERT_EQ(ring.records().size(), 1U);
    EXPECT_EQ(ring.records()[0].uAt, 196U);
}

TEST(trace_ring, reaches_up_to_four_gibibytes) {
    const temp_dir dir;
    trace_writer_options options;
    options.uFileSize = 0xFFFFFFFC;
    trace_writer writer;
    if (writer.create(dir.file("large").c_str(), options) == TRACE_WRITER_SYSTEM)
        GTEST_SKIP() << "no room for a sparse file of 4 GiB";
    ASSERT_EQ(writer.append_id({"_TST"}, 1), TRACE_WRITER_OK);
    EXPECT_EQ(load<trace_file_header>(writer.mapping(), 0).uOldestRecordOffset, 232U);
    const auto gap = load<trace_record_header>(writer.mapping(), 232);
    EXPECT_EQ(uint32_t{gap.length}, 0xFFFFFFFC - 232);
    const trace_bytes tooLong(writer.mapping().data(), writer.max_record_length() - 27);
    EXPECT_EQ(writer.append(TRC_FUNC_DATA, {"_TST"}, tooLong), TRACE_WRITER_TOO_LONG);
}

} // namespace
