// Many files through the real command: order, resources, locks, what is left
// in the files afterwards.
#include "raw_trace.h"
#include "reference_reader.h"
#include "run_command.h"
#include "sample_trace.h"
#include "temp_dir.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <map>
#include <random>
#include <set>
#include <sys/stat.h>
#include <unistd.h>

namespace {

using testing::HasSubstr;
using testing::Not;

/// One printed record of kind UINT32 in raw form.
struct printed {
    unsigned int uFile;
    uint64_t uTime; ///< nanoseconds of the day
    uint32_t uValue;
    friend bool operator==(const printed&, const printed&) = default;
};

void PrintTo(const printed& record, std::ostream* pOut) {
    *pOut << '[' << record.uFile << "] " << record.uTime << " val=" << record.uValue;
}

/// The raw records in a command's output that was made with -o t.
std::vector<printed> parse_printed(const std::string& sOut) {
    std::vector<printed> records;
    for (size_t uAt = 0; uAt < sOut.size();) {
        const size_t uEnd = std::min(sOut.find('\n', uAt), sOut.size());
        const std::string sLine = sOut.substr(uAt, uEnd - uAt);
        uAt = uEnd + 1;
        printed record{};
        unsigned int h = 0, m = 0, s = 0, ns = 0, id = 0;
        const char* const pTime =
            sLine.c_str() + (sLine.starts_with('[') ? sLine.find(']') + 1 : 0);
        if (sLine.starts_with('['))
            record.uFile = static_cast<unsigned int>(atoi(sLine.c_str() + 1));
        if (sscanf(pTime, " %u:%u:%u.%u id=0x%x val=0x%x", &h, &m, &s, &ns, &id, &record.uValue) !=
            6)
            continue;
        record.uTime = ((h * 60ULL + m) * 60 + s) * 1'000'000'000 + ns;
        records.push_back(record);
    }
    return records;
}

class Merge : public testing::Test {
protected:
    /// Makes file `uFile` with these records.
    void make(unsigned int uFile, const std::vector<sample_record>& records,
              trace_writer_options options = {}) {
        if (options.uFileSize == trace_writer_options{}.uFileSize)
            options.uFileSize = static_cast<uint32_t>(4096 + records.size() * 64);
        m_paths.push_back(m_dir.file("f" + std::to_string(uFile) + ".trc"));
        ASSERT_EQ(write_sample_trace(m_paths.back(), records, options), TRACE_WRITER_OK);
    }

    command_result run(std::vector<std::string> options = {"-r", "-ot"}) {
        options.insert(options.end(), m_paths.begin(), m_paths.end());
        return run_command(options);
    }

    temp_dir m_dir;
    std::vector<std::string> m_paths;
};

/// Every record of every file once, each file's in their order, and all in time
/// order.
void expect_merged(const std::vector<printed>& records, unsigned int uFiles, uint32_t uPerFile) {
    ASSERT_EQ(records.size(), size_t{uFiles} * uPerFile);
    std::vector<uint32_t> next(uFiles);
    uint64_t uTime = 0;
    for (const printed& record : records) {
        ASSERT_LT(record.uFile, uFiles);
        ASSERT_EQ(record.uValue, next[record.uFile]++);
        ASSERT_GE(record.uTime, uTime);
        uTime = record.uTime;
    }
}

TEST_F(Merge, ThreeInterleavedFilesComeOutInTimeOrderWithTiesKeptPerFile) {
    std::vector<std::vector<sample_record>> files(3);
    for (uint32_t i = 0; i < 100'000; ++i)
        for (uint32_t uFile = 0; uFile < 3; ++uFile)
            files[uFile].push_back(sample_uint32(1000 + i / 4 * (uFile + 1), 1, i));
    for (unsigned int uFile = 0; uFile < 3; ++uFile)
        make(uFile, files[uFile]);
    const command_result result = run();
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.sErr, "");
    expect_merged(parse_printed(result.sOut), 3, 100'000);
}

TEST_F(Merge, SixtyFilesAtOnce) {
    for (uint32_t uFile = 0; uFile < 60; ++uFile) {
        std::vector<sample_record> records;
        for (uint32_t i = 0; i < 1500; ++i)
            records.push_back(sample_uint32(i * 1000 + uFile * 7, 1, i));
        make(uFile, records);
    }
    const command_result result = run();
    EXPECT_EQ(result.status, 0);
    expect_merged(parse_printed(result.sOut), 60, 1500);
}

TEST_F(Merge, FollowModeReadsEveryFileHoweverManyThereAre) {
    constexpr uint32_t FILES = 60;
    for (uint32_t uFile = 0; uFile < FILES; ++uFile)
        make(uFile, {sample_uint32(uFile, 1, 0xF000 + uFile)});
    std::vector<std::string> arguments{"-f", "-r", "-s", "+0r"};
    arguments.insert(arguments.end(), m_paths.begin(), m_paths.end());
    live_command kelvo(arguments);
    std::set<std::string> lines;
    while (lines.size() < FILES) {
        const std::string sLine = kelvo.read_line_with("val=0x0000f0");
        ASSERT_NE(sLine, "");
        lines.insert(sLine);
    }
    kelvo.send_signal(SIGINT);
    EXPECT_EQ(kelvo.wait().status, 0);
}

/// In a wrapped ring the record at the start of the area, by which files are
/// sorted, is not the oldest: here it is even the newest file's that sorts first.
TEST_F(Merge, WrappedRingsAndDifferentTimeBasesComeOutInTimeOrder) {
    constexpr uint64_t S = 1'000'000'000;
    trace_writer_options wrapped;
    wrapped.uFileSize = 8192;
    std::vector<sample_record> longRun;
    for (uint32_t i = 0; i < 1000; ++i)
        longRun.push_back(sample_uint32(1000 * S + i * S, 1, i));
    make(0, longRun, wrapped);

    trace_writer_options otherClock; // raw stamps far above the other files'
    otherClock.timeInfo = {900 * S, 50'000 * S};
    std::vector<sample_record> otherRun;
    for (uint32_t i = 0; i < 1000; ++i)
        otherRun.push_back(sample_uint32(50'000 * S + i * S, 1, i)); // 900 s on
    make(1, otherRun, otherClock);

    trace_writer_options smallClock; // raw stamps far below
    smallClock.timeInfo = {1500 * S, 0};
    std::vector<sample_record> smallRun;
    for (uint32_t i = 0; i < 400; ++i)
        smallRun.push_back(sample_uint32(i * S + 1, 1, i)); // 1500 s on
    make(2, smallRun, smallClock);

    std::sort(m_paths.begin(), m_paths.end());
    do {
        const std::vector<printed> records = parse_printed(run().sOut);
        EXPECT_GT(records.size(), 1500U);
        EXPECT_TRUE(std::is_sorted(records.begin(), records.end(),
                                   [](const printed& first, const printed& second) {
                                       return first.uTime < second.uTime;
                                   }));
    } while (std::next_permutation(m_paths.begin(), m_paths.end()));
}

/// Records behind a calibration are placed, and the next file is started, by
/// the new base, even when the reader is far ahead of the printing.
TEST_F(Merge, ACalibrationMovesTheRecordsBehindItAndStartsFilesInTime) {
    constexpr uint64_t S = 1'000'000'000;
    std::vector<sample_record> jumping;
    for (uint32_t i = 0; i < 100; ++i)
        jumping.push_back(sample_uint32(100 * S + i, 1, i));
    jumping.push_back({.function = TRC_FUNC_TIME_CALIBRATION,
                       .timeStamp = 100 * S + 100,
                       .body = raw_bytes(uint64_t{5000 * S}, uint64_t{100 * S})});
    for (uint32_t i = 100; i < 200; ++i)
        jumping.push_back(sample_uint32(100 * S + i, 1, i)); // 5000 s on
    make(0, jumping);
    std::vector<sample_record> between;
    for (uint32_t i = 0; i < 100; ++i)
        between.push_back(sample_uint32(2000 * S + i, 1, i));
    make(1, between);

    const std::vector<printed> records = parse_printed(run().sOut);
    ASSERT_EQ(records.size(), 300U);
    EXPECT_EQ(records[99], (printed{0, 100 * S + 99, 99}));
    EXPECT_EQ(records[100], (printed{1, 2000 * S, 0}));
    EXPECT_EQ(records[200], (printed{0, 5000 * S + 100, 100}));
}

/// Random rings of all shapes: what is printed is what a slow, separate reader
/// finds in the files, merged by time, each file in its order.
TEST_F(Merge, RandomFilesAgreeWithASlowReader) {
    for (uint32_t uSeed = 0; uSeed < 12; ++uSeed) {
        std::mt19937 engine(uSeed);
        const auto random = [&] { return static_cast<uint32_t>(engine()); };
        m_paths.clear();
        const unsigned int uFiles = 1 + random() % 9;
        std::vector<std::vector<printed>> expected(uFiles);
        for (unsigned int uFile = 0; uFile < uFiles; ++uFile) {
            trace_writer_options options;
            options.uFileSize = 1024 + 4 * (random() % 20'000);
            options.timeInfo = {random() % 1000, 0};
            std::vector<sample_record> records;
            uint64_t uTime = random() % 2000;
            for (uint32_t i = 0, uCount = random() % 3000; i < uCount; ++i) {
                uTime += random() % 3;
                if (random() % 20 == 0)
                    records.push_back(
                        sample_string(uTime, std::string(random() % 100, 'x'))); // not listed
                else
                    records.push_back(sample_uint32(uTime, 1, i));
            }
            make(uFile, records, options);
            for (const ring_element& element : list_ring(read_file(m_paths[uFile])).records())
                if (element.header.function == TRC_FUNC_UINT32)
                    expected[uFile].push_back(
                        {uFile, options.timeInfo.timeinfo1 + element.header.timeStamp,
                         load<uint32_t>(element.body, 4)});
        }
        const command_result result = run();
        EXPECT_EQ(result.status, 0);
        const std::vector<printed> records = parse_printed(result.sOut);
        EXPECT_TRUE(std::is_sorted(
            records.begin(), records.end(),
            [](const printed& first, const printed& second) { return first.uTime < second.uTime; }))
            << "seed " << uSeed;
        std::vector<std::vector<printed>> found(uFiles);
        for (const printed& record : records)
            found.at(record.uFile).push_back(record);
        EXPECT_EQ(found, expected) << "seed " << uSeed;
    }
}

TEST_F(Merge, BaseProgramNamesAreListedAndNothingIsRead) {
    trace_writer_options options;
    options.baseProgName = "first";
    make(0, {sample_uint32(1, 1, 0)}, options);
    options.baseProgName = "second";
    make(1, {sample_uint32(1, 1, 0)}, options);
    const command_result result = run({"-B"});
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.sOut, "[00] Filename: " + m_paths[0] +
                               "\nfirst\n[01] Filename: " + m_paths[1] + "\nsecond\n");
    EXPECT_EQ(result.sErr, "");
}

/// The words of the reader protocol, in a file's bytes.
uint32_t header_word(const std::string& sPath, size_t uOffset) {
    return load<uint32_t>(read_file(sPath), uOffset);
}

TEST_F(Merge, AReadFileKeepsItsBytesAndGetsTheTimeOfItsNewestRecord) {
    make(0, {sample_uint32(5'000'001'234, 1, 0), sample_uint32(7'000'009'999, 1, 1)});
    std::vector<std::byte> expected = read_file(m_paths[0]);
    ASSERT_EQ(run().status, 0);
    EXPECT_EQ(read_file(m_paths[0]), expected);
    EXPECT_EQ(header_word(m_paths[0], offsetof(trace_file_header, uTailReq)), 0U);
    EXPECT_EQ(header_word(m_paths[0], offsetof(trace_file_header, uSeqLock)), TRC_SEQ_NO_READER);
    struct stat status {};
    ASSERT_EQ(stat(m_paths[0].c_str(), &status), 0);
    EXPECT_EQ(status.st_mtim.tv_sec, 7);
    EXPECT_EQ(status.st_mtim.tv_nsec, 9000);
}

} // namespace
