// Many files through the real command: order, resources, locks, what is left
// in the files afterwards.
#include "raw_trace.h"
#include "reference_reader.h"
#include "run_command.h"
#include "sample_trace.h"
#include "temp_dir.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <csignal>
#include <random>
#include <set>
#include <sstream>
#include <sys/stat.h>
#include <tuple>

namespace {

constexpr uint64_t S = 1'000'000'000;

/// One printed record of kind UINT32 in raw form: index of its file, nanoseconds
/// of the day, value.
using printed = std::tuple<unsigned int, uint64_t, uint32_t>;

class Merge : public testing::Test {
protected:
    /// Makes one more file, with these records. What is expected of it are those
    /// that a slow, separate reader finds in its ring.
    void make(const std::vector<sample_record>& records, trace_writer_options options = {}) {
        const auto uFile = static_cast<unsigned int>(m_paths.size());
        if (options.uFileSize == trace_writer_options{}.uFileSize)
            options.uFileSize = static_cast<uint32_t>(4096 + records.size() * 64);
        m_paths.push_back(m_dir.file("f" + std::to_string(uFile) + ".trc"));
        ASSERT_EQ(write_sample_trace(m_paths[uFile], records, options), TRACE_WRITER_OK);
        const auto [uBase, uClock] = options.timeInfo;
        m_expected.emplace_back();
        for (const ring_element& element : list_ring(read_file(m_paths[uFile])).records())
            if (element.header.function == TRC_FUNC_UINT32)
                m_expected[uFile].push_back({uFile, uBase + (element.header.timeStamp - uClock),
                                             load<uint32_t>(element.body, 4)});
    }

    /// The records that a run over all files, two at least, prints.
    std::vector<printed> run() {
        std::vector<std::string> arguments{"-r", "-ot"};
        arguments.insert(arguments.end(), m_paths.begin(), m_paths.end());
        const command_result result = run_command(arguments);
        EXPECT_EQ(result.status, 0);
        EXPECT_EQ(result.sErr, "");
        std::vector<printed> records;
        std::istringstream lines(result.sOut);
        for (std::string sLine; std::getline(lines, sLine);) {
            unsigned int file, h, m, s, ns, value;
            if (sscanf(sLine.c_str(), "[%u] %u:%u:%u.%u id=%*x val=%x", &file, &h, &m, &s, &ns,
                       &value) == 6)
                records.push_back({file, ((h * 60ULL + m) * 60 + s) * S + ns, value});
        }
        return records;
    }

    /// Expects every record of every file once, each file's in their order, and
    /// all in time order.
    void expect_merged() {
        const std::vector<printed> records = run();
        EXPECT_TRUE(std::ranges::is_sorted(records, {},
                                           [](const printed& each) { return std::get<1>(each); }));
        std::vector<std::vector<printed>> found(m_paths.size());
        for (const printed& record : records)
            found.at(std::get<0>(record)).push_back(record);
        EXPECT_EQ(found, m_expected);
    }

    temp_dir m_dir;
    std::vector<std::string> m_paths;
    std::vector<std::vector<printed>> m_expected; ///< per file
};

TEST_F(Merge, ThreeInterleavedFilesComeOutInTimeOrderWithTiesKeptPerFile) {
    for (uint32_t uFile = 0; uFile < 3; ++uFile) {
        std::vector<sample_record> records;
        for (uint32_t i = 0; i < 100'000; ++i)
            records.push_back(sample_uint32(1000 + i / 4 * (uFile + 1), 1, i));
        make(records);
        EXPECT_EQ(m_expected[uFile].size(), 100'000U);
    }
    expect_merged();
}

/// The record by which a wrapped ring is sorted is far from its oldest one. More
/// records than the queue takes lie between them, in a file that is read first.
TEST_F(Merge, AWrappedRingIsReadFromTheTimeOfItsOldestRecordOn) {
    std::vector<sample_record> records;
    for (uint32_t i = 0; i < 205'000; ++i)
        records.push_back(sample_uint32(i, 1, i));
    make(records, {.uFileSize = 200 + 36 * 100'000});
    EXPECT_LT(std::get<1>(m_expected[0].front()), 106'000U);
    make({sample_uint32(190'000, 1, 0)});
    records.erase(records.begin(), records.begin() + 105'000);
    make(records);
    expect_merged();
}

TEST_F(Merge, FollowModeReadsEveryFileHoweverManyThereAre) {
    std::vector<std::string> arguments{"-f", "-r", "-s", "+0r"};
    for (uint32_t uFile = 0; uFile < 60; ++uFile) {
        make({sample_uint32(uFile, 1, 0xF000 + uFile)});
        arguments.push_back(m_paths[uFile]);
    }
    live_command kelvo(arguments);
    std::set<std::string> lines;
    while (lines.size() < m_paths.size()) {
        const std::string sLine = kelvo.read_line_with("val=0x0000f0");
        ASSERT_NE(sLine, "");
        lines.insert(sLine);
    }
    kelvo.send_signal(SIGINT);
    EXPECT_EQ(kelvo.wait().status, 0);
}

/// Records behind a calibration are placed, and the next file is started, by
/// the new base, even when the reader is far ahead of the printing.
TEST_F(Merge, ACalibrationMovesTheRecordsBehindItAndStartsFilesInTime) {
    std::vector<sample_record> jumping, between;
    for (uint32_t i = 0; i < 200; ++i) {
        if (i == 100)
            jumping.push_back({.function = TRC_FUNC_TIME_CALIBRATION,
                               .timeStamp = 100 * S + i,
                               .body = raw_bytes(uint64_t{5000 * S}, uint64_t{100 * S})});
        jumping.push_back(sample_uint32(100 * S + i, 1, i)); // the second half 4900 s on
        between.push_back(sample_uint32(2000 * S + i, 1, i));
    }
    make(jumping);
    make(between);
    const std::vector<printed> records = run();
    ASSERT_EQ(records.size(), 400U);
    EXPECT_EQ(records[99], (printed{0, 100 * S + 99, 99}));
    EXPECT_EQ(records[100], (printed{1, 2000 * S, 0}));
    EXPECT_EQ(records[300], (printed{0, 5000 * S + 100, 100}));
}

/// Random rings of all shapes and clocks, once many at a time.
TEST_F(Merge, RandomFilesAgreeWithASlowReader) {
    for (uint32_t uSeed = 0; uSeed < 12; ++uSeed) {
        SCOPED_TRACE(uSeed);
        std::mt19937 engine(uSeed);
        const auto random = [&] { return static_cast<uint32_t>(engine()); };
        m_paths.clear();
        m_expected.clear();
        for (uint32_t uFiles = uSeed == 0 ? 60 : 2 + random() % 8; uFiles > 0; --uFiles) {
            const uint64_t uClock = random() % 3 * 10'000 * S; // raw stamps far apart
            trace_writer_options options;
            options.uFileSize = 1024 + 4 * (random() % 20'000);
            options.timeInfo = {random() % 1000, uClock};
            std::vector<sample_record> records;
            uint64_t uTime = uClock + random() % 50'000;
            const uint32_t uStep = 1 + random() % 100;
            for (uint32_t i = 0, uCount = random() % 3000; i < uCount; ++i) {
                uTime += random() % uStep;
                if (random() % 20 == 0)
                    records.push_back(
                        sample_string(uTime, std::string(random() % 100, 'x'))); // not listed
                else
                    records.push_back(sample_uint32(uTime, 1, i));
            }
            make(records, options);
        }
        expect_merged();
    }
}

TEST_F(Merge, BaseProgramNamesAreListedAndNothingIsRead) {
    make({sample_uint32(1, 1, 0)}, {.baseProgName = "first"});
    make({sample_uint32(1, 1, 0)}, {.baseProgName = "second"});
    const command_result result = run_command({"-B", m_paths[0], m_paths[1]});
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.sOut, "[00] Filename: " + m_paths[0] +
                               "\nfirst\n[01] Filename: " + m_paths[1] + "\nsecond\n");
    EXPECT_EQ(result.sErr, "");
}

TEST_F(Merge, AReadFileKeepsItsBytesAndGetsTheTimeOfItsNewestRecord) {
    make({sample_uint32(5'000'001'234, 1, 0), sample_uint32(7'000'009'999, 1, 1)});
    const std::vector<std::byte> before = read_file(m_paths[0]);
    ASSERT_EQ(run_command({m_paths[0]}).status, 0);
    EXPECT_EQ(read_file(m_paths[0]), before);
    struct stat status {};
    ASSERT_EQ(stat(m_paths[0].c_str(), &status), 0);
    EXPECT_EQ(status.st_mtim.tv_sec, 7);
    EXPECT_EQ(status.st_mtim.tv_nsec, 9000);
}

} // namespace
