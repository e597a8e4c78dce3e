// The ring of a file that nobody reads: after every append it is sound, and its
// records are the newest ones that were appended. How the file is made.
#include "raw_trace.h"
#include "reference_reader.h"
#include "temp_dir.h"
#include "trace_writer.h"

#include <algorithm>
#include <cstring>
#include <dlfcn.h>
#include <fcntl.h>
#include <filesystem>
#include <gtest/gtest.h>
#include <random>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

namespace {

/// What the next reservations of space return instead of being made.
std::vector<int> reservationErrors;

} // namespace

/// Stands before the C library's.
int posix_fallocate(int fd, off_t iAt, off_t iSize) {
    static const auto reserve =
        reinterpret_cast<decltype(&posix_fallocate)>(dlsym(RTLD_NEXT, "posix_fallocate"));
    if (reservationErrors.empty())
        return reserve(fd, iAt, iSize);
    const int error = reservationErrors.back();
    reservationErrors.pop_back();
    return error;
}

namespace {

constexpr uint32_t HEADER = sizeof(trace_file_header);

/// The gap and then the newest of the records that were appended: the i-th of
/// them, from 0, has the time i and a body of this size full of i mod 64.
void check_ring(trace_writer& writer, const std::vector<size_t>& bodies) {
    const ring_listing ring = list_ring(writer.mapping());
    ASSERT_EQ(ring.problem, "");
    const ring_element& gap = ring.elements.front();
    ASSERT_TRUE(gap.is_filler() && !gap.counts());
    const std::vector<ring_element> records = ring.records();
    ASSERT_FALSE(records.empty());
    ASSERT_LE(records.size(), bodies.size());
    size_t uNumber = bodies.size() - records.size();
    ASSERT_EQ(writer.counts().uGivenUp, uNumber);
    for (const auto& [uAt, header, body] : records) {
        ASSERT_EQ(header.timeStamp, uNumber);
        ASSERT_EQ(header.seqNumber, 2 + 2 * uNumber);
        std::vector<std::byte> expected(bodies[uNumber], std::byte(uNumber & 63));
        expected.resize((expected.size() + 3) & ~size_t{3});
        ASSERT_EQ(body, expected);
        ++uNumber;
    }
}

TEST(trace_ring, holds_the_newest_records_after_random_appends) {
    const temp_dir dir;
    std::mt19937 random(4711);
    std::vector<uint32_t> areas{1000, 4096};
    for (uint32_t uArea = 56; uArea <= 180; uArea += 4)
        areas.push_back(uArea);
    for (const uint32_t uArea : areas) {
        SCOPED_TRACE(uArea);
        trace_writer writer;
        ASSERT_EQ(writer.create(dir.file("ring").c_str(), {.uFileSize = HEADER + uArea}),
                  TRACE_WRITER_OK);
        const size_t uMost = writer.max_record_length() - sizeof(trace_record_header);
        std::vector<size_t> bodies;
        while (bodies.size() < 1500 && !HasFatalFailure()) {
            const size_t uLongest = random() % 8 == 0 ? uMost : std::min(uMost, size_t{72});
            const auto uNumber = static_cast<uint32_t>(bodies.size());
            bodies.push_back(random() % (uLongest + 1));
            const std::vector<std::byte> body(bodies.back(), std::byte(uNumber & 63));
            ASSERT_EQ(writer.append(TRC_FUNC_DATA, {"_TST", 7, uNumber}, body), TRACE_WRITER_OK);
            check_ring(writer, bodies);
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
        return writer.create(path.c_str(),
                             {.uFileSize = uSize, .uOffset = uOffset, .uFirstSeqNumber = uSeq});
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
    const std::string longName(60, 'p');
    trace_writer writer;
    ASSERT_EQ(writer.create(path.c_str(), {.uFileSize = 300,
                                           .uPlatform = 9,
                                           .uNodeNumber = 12,
                                           .uOffset = 196,
                                           .timeInfo = {77, 88},
                                           .program = longName,
                                           .buildName = "",
                                           .baseProgName = "base",
                                           .uNode_ID = 0x123456789ABCDEF0,
                                           .tz_offset = 60}),
              TRACE_WRITER_OK);
    ASSERT_EQ(writer.append_id({"_TST", 1, 99}, 5), TRACE_WRITER_OK);
    EXPECT_EQ(load<trace_file_header>(writer.mapping(), 0).uFlags, 0);
    writer.close();

    raw_trace expected(300);
    expected.header.uPlatform = 9;
    expected.header.uNodeNumber = 12;
    expected.header.uOffset = 196; // before the time zone
    expected.header.timeInfo = {77, 88};
    expected.header.uPid = static_cast<uint32_t>(getpid());
    longName.copy(expected.header.program, 48);
    strcpy(expected.header.baseProgName, "base");
    expected.header.uNode_ID = 0x123456789ABCDEF0;
    expected.header.uOldestRecordOffset = 196 + 32;
    const std::vector<std::byte> file = read_file(path);
    EXPECT_TRUE(std::equal(file.begin(), file.begin() + 196, expected.bytes().begin()));
    const ring_listing ring = list_ring(file);
    EXPECT_EQ(ring.problem, "");
    EXPECT_EQ(ring.records().size(), 1U);
}

TEST(trace_ring, takes_its_space_from_the_disk_when_it_is_made) {
    const temp_dir dir;
    const std::string path = dir.file("trace");
    constexpr uint32_t SIZE = 9 << 20;
    // Returns 0 or errno.
    const auto create = [&](std::vector<int> errors, bool bReserve = true) {
        reservationErrors = std::move(errors);
        trace_writer writer;
        const auto status =
            writer.create(path.c_str(), {.uFileSize = SIZE, .bReserveSpace = bReserve});
        const int error = status == TRACE_WRITER_SYSTEM ? errno : 0;
        EXPECT_EQ(status == TRACE_WRITER_OK, error == 0);
        EXPECT_EQ(std::filesystem::exists(path), error == 0);
        return error;
    };
    for (const int error : {ENOSPC, EDQUOT, EFBIG}) {
        ASSERT_EQ(create({}), 0);
        EXPECT_EQ(create({error}), error);
    }
    for (const int error : {EOPNOTSUPP, EINVAL, ENOSYS})
        EXPECT_EQ(create({error}), 0) << "this file system cannot reserve";

    const auto allocated = [&path] {
        struct stat status {};
        stat(path.c_str(), &status);
        return status.st_blocks * 512;
    };
    EXPECT_EQ(create({}, false), 0);
    EXPECT_LT(allocated(), SIZE);
    EXPECT_EQ(create({EINTR, EINTR}), 0);
    EXPECT_GE(allocated(), SIZE);

    rlimit before{};
    getrlimit(RLIMIT_FSIZE, &before); // beyond the limit the process would get a signal
    const rlimit limit{SIZE - 1, before.rlim_max};
    ASSERT_EQ(setrlimit(RLIMIT_FSIZE, &limit), 0);
    EXPECT_EQ(create({}), EFBIG);
    setrlimit(RLIMIT_FSIZE, &before);
}

TEST(trace_ring, reaches_up_to_four_gibibytes) {
    const temp_dir dir;
    trace_writer writer;
    if (writer.create(dir.file("large").c_str(),
                      {.uFileSize = 0xFFFFFFFC, .bReserveSpace = false}) == TRACE_WRITER_SYSTEM)
        GTEST_SKIP() << "no room for a sparse file of 4 GiB";
    ASSERT_EQ(writer.append_id({"_TST"}, 1), TRACE_WRITER_OK);
    EXPECT_EQ(load<trace_file_header>(writer.mapping(), 0).uOldestRecordOffset, 232U);
    const auto gap = load<trace_record_header>(writer.mapping(), 232);
    EXPECT_EQ(uint32_t{gap.length}, 0xFFFFFFFC - 232);
    const trace_bytes tooLong(writer.mapping().data(), writer.max_record_length() - 27);
    EXPECT_EQ(writer.append(TRC_FUNC_DATA, {"_TST"}, tooLong), TRACE_WRITER_TOO_LONG);
}

} // namespace
