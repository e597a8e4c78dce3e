// Many files through the real command: order, resources, locks, what is left
// in the files afterwards.
#include "raw_trace.h"
#include "reference_reader.h"
#include "run_command.h"
#include "sample_trace.h"
#include "temp_dir.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <fcntl.h>
#include <filesystem>
#include <random>
#include <sstream>
#include <sys/stat.h>
#include <tuple>
#include <unistd.h>

namespace {

constexpr uint64_t S = 1'000'000'000;

/// One printed record of kind UINT32 in raw form: index of its file, nanoseconds
/// of the day, value.
using printed = std::tuple<unsigned int, uint64_t, uint32_t>;

/// What a slow, separate reader finds in a file: its records in their order, each
/// under the time base that is in force there.
struct expected_file {
    std::vector<printed> records{};
    bool bInOrder = true; ///< of time

    expected_file(unsigned int uFile, trace_bytes file) {
        auto base = load<trace_file_header>(file, 0).timeInfo;
        uint64_t uLast = 0;
        for (const ring_element& element : list_ring(file).records()) {
            if (element.header.function == TRC_FUNC_START)
                base = load<cu_timeinfo>(element.body, 8);
            const uint64_t uTime = base.timeinfo1 + (element.header.timeStamp - base.timeinfo2);
            if (element.header.function == TRC_FUNC_TIME_CALIBRATION)
                base = load<cu_timeinfo>(element.body, 0);
            if (element.header.function == TRC_FUNC_UINT32)
                records.push_back({uFile, uTime, load<uint32_t>(element.body, 4)});
            bInOrder &= uTime >= uLast;
            uLast = uTime;
        }
    }
};

std::vector<uint32_t> sorted_values(const std::vector<printed>& records) {
    std::vector<uint32_t> values;
    for (const printed& record : records)
        values.push_back(std::get<2>(record));
    std::ranges::sort(values);
    return values;
}

class Merge : public testing::Test {
protected:
    /// One more file to be read, that may have been named before.
    void add(const std::string& sPath) {
        m_expected.emplace_back(static_cast<unsigned int>(m_paths.size()), read_file(sPath));
        m_paths.push_back(sPath);
    }

    /// Makes one more file, with these records.
    void make(const std::vector<sample_record>& records, trace_writer_options options = {}) {
        const std::string sPath = m_dir.file("f" + std::to_string(m_paths.size()) + ".trc");
        if (options.uFileSize == trace_writer_options{}.uFileSize)
            options.uFileSize = static_cast<uint32_t>(4096 + records.size() * 64);
        ASSERT_EQ(write_sample_trace(sPath, records, options), TRACE_WRITER_OK);
        add(sPath);
    }

    void make_random(std::mt19937& engine, uint32_t uMostRecords);

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

    /// Expects every record of every file once. Files in order of time keep their
    /// order, and so do all of them together. Of the others it is left open what
    /// waits in the queue when a record or a new time base comes too late.
    void expect_merged() {
        std::vector<std::vector<printed>> found(m_paths.size());
        std::vector<printed> inOrder;
        for (const printed& record : run()) {
            found.at(std::get<0>(record)).push_back(record);
            if (m_expected[std::get<0>(record)].bInOrder)
                inOrder.push_back(record);
        }
        EXPECT_TRUE(std::ranges::is_sorted(inOrder, {},
                                           [](const printed& each) { return std::get<1>(each); }));
        for (size_t i = 0; i < m_paths.size() && !HasFailure(); ++i) {
            const auto& [records, bInOrder] = m_expected[i];
            if (bInOrder)
                EXPECT_EQ(found[i], records) << m_paths[i];
            else
                EXPECT_EQ(sorted_values(found[i]), sorted_values(records)) << m_paths[i];
        }
    }

    temp_dir m_dir;
    std::vector<std::string> m_paths;
    std::vector<expected_file> m_expected;
};

/// A record behind which raw stamps count from `base` on.
sample_record sample_base(uint16_t function, uint64_t timeStamp, const cu_timeinfo& base) {
    return {function, "_TST", 1, timeStamp,
            function == TRC_FUNC_START ? raw_bytes(1U, 2U, base) : raw_bytes(base)};
}

/// The ring may have wrapped, records may be out of order, the clock may be one
/// far from the others, and may be changed for another one on the way.
void Merge::make_random(std::mt19937& engine, uint32_t uMostRecords) {
    const auto random = [&](uint32_t uEnd) { return static_cast<uint32_t>(engine() % uEnd); };
    const auto any_clock = [&](uint64_t uNow) {
        return cu_timeinfo{uNow - random(1000), random(3) * 10'000 * S};
    };
    const uint32_t uDisorder = random(4) == 0 ? 1000 : 1, uStep = 1 + random(100);
    const uint32_t uBaseEvery = random(2) == 0 ? 10 + random(100) : UINT32_MAX;
    uint64_t uNow = 30'000 * S + random(50'000);
    cu_timeinfo base = any_clock(uNow);
    const trace_writer_options options{.uFileSize = 1024 + 4 * random(7 * uMostRecords),
                                       .timeInfo = base};
    std::vector<sample_record> records;
    for (uint32_t i = 0, uCount = random(uMostRecords); i < uCount; ++i) {
        uNow += random(uStep);
        const auto raw = [&] { return uNow - base.timeinfo1 + base.timeinfo2; };
        const uint64_t uBefore = raw();
        if (random(20) == 0) {
            records.push_back(sample_string(raw(), std::string(random(100), 'x'))); // not listed
        } else if (random(uBaseEvery) == 0) {
            base = any_clock(uNow);
            records.push_back(random(2) == 0
                                  ? sample_base(TRC_FUNC_START, raw(), base)
                                  : sample_base(TRC_FUNC_TIME_CALIBRATION, uBefore, base));
        } else {
            records.push_back(sample_uint32(raw() + random(uDisorder), 1, i));
        }
    }
    make(records, options);
}

/// The record by which a wrapped ring is sorted is far from its oldest one. More
/// records than the queue takes lie between them, in a file that is read first.
TEST_F(Merge, AWrappedRingIsReadFromTheTimeOfItsOldestRecordOn) {
    std::vector<sample_record> records;
    for (uint32_t i = 0; i < 205'000; ++i)
        records.push_back(sample_uint32(i, 1, i));
    make(records, {.uFileSize = 200 + 36 * 100'000});
    EXPECT_LT(std::get<1>(m_expected[0].records.front()), 106'000U);
    make({sample_uint32(190'000, 1, 0)});
    records.erase(records.begin(), records.begin() + 105'000);
    make(records);
    expect_merged();
}

/// Two clocks far apart, in turn: half of all records are calibrations.
TEST_F(Merge, ClocksMayChangeWithEveryRecord) {
    std::vector<sample_record> changing, between;
    for (uint64_t i = 0; i < 50'000; ++i) {
        const uint64_t uClock = i % 2 * 10'000 * S, uOther = 10'000 * S - uClock;
        changing.push_back(sample_uint32(uClock + 10 * i, 1, static_cast<uint32_t>(i)));
        changing.push_back(
            sample_base(TRC_FUNC_TIME_CALIBRATION, uClock + 10 * i + 1, {1000 * S, uOther}));
        if (i % 50 == 0)
            between.push_back(sample_uint32(1000 * S + 10 * i + 5, 1, static_cast<uint32_t>(i)));
    }
    make(changing, {.timeInfo = {1000 * S, 0}});
    make(between);
    EXPECT_TRUE(m_expected[0].bInOrder);
    expect_merged();
}

TEST_F(Merge, RandomFilesAgreeWithASlowReader) {
    for (const auto& [uFiles, uMostRecords, uTimes] :
         {std::tuple{2U, 3000U, 6U}, {8U, 3000U, 3U}, {30U, 2000U, 2U}, {300U, 200U, 1U}})
        for (uint32_t uSeed = 1; uSeed <= uTimes; ++uSeed) {
            SCOPED_TRACE(testing::Message() << uFiles << " files, " << uSeed);
            std::mt19937 engine(uSeed);
            m_paths.clear();
            m_expected.clear();
            while (m_paths.size() < uFiles)
                make_random(engine, uMostRecords);
            expect_merged();
        }
}

/// Every name is read for itself, in the bounds of one file and its lock. The ring is
/// full: only by the number that it expects a reader knows that it has come round.
TEST_F(Merge, AFileNamedSeveralTimesIsReadWholeEachTime) {
    constexpr uint32_t RECORDS = 2000, OLDEST = 700;
    raw_trace ring(200 + 36 * RECORDS);
    for (uint32_t uPlace = 0; uPlace < RECORDS; ++uPlace) {
        const uint32_t i = (uPlace + RECORDS - OLDEST) % RECORDS;
        const sample_record record = sample_uint32(7 * S + i, 1, i);
        ring.add({record.function, 2 * i + 2, record.compId, 1, record.timeStamp, record.body});
    }
    ring.header.uOldestRecordOffset = 200 + 36 * OLDEST;
    const std::string sPath = m_dir.file("f0.trc"), sLink = m_dir.file("link"),
                      sOther = m_dir.file("other");
    ASSERT_TRUE(ring.write(sPath));
    add(sPath);
    EXPECT_EQ(m_expected[0].records.size(), RECORDS);
    const std::vector<std::byte> before = read_file(sPath);
    ASSERT_EQ(link(sPath.c_str(), sOther.c_str()), 0);
    ASSERT_EQ(symlink(sPath.c_str(), sLink.c_str()), 0);
    for (const std::string& sName : {sPath, sLink, sOther, m_dir.path() + "/./f0.trc"}) {
        add(sName);
        expect_merged();
    }
    while (m_paths.size() < 64)
        add(sPath);
    expect_merged();
    EXPECT_EQ(read_file(sPath), before);
    struct stat status {};
    ASSERT_EQ(stat(sPath.c_str(), &status), 0);
}

/// The output is not read, so 16 files run on and on and no other one's turn comes.
TEST_F(Merge, AFileThatIsReplacedBeforeItsTurnIsGivenUp) {
    constexpr uint32_t FILES = 16, RECORDS = 45'000; // more than the queue takes of any of them
    make(std::vector<sample_record>(RECORDS, sample_uint32(S, 1, 0)));
    while (m_paths.size() < FILES) {
        m_paths.push_back(m_dir.file("copy" + std::to_string(m_paths.size())));
        std::filesystem::copy_file(m_paths[0], m_paths.back());
    }
    make({sample_uint32(2 * S, 1, 0xA)});
    make({sample_uint32(3 * S, 1, 0xB)});
    const std::string sReplaced = m_paths[FILES], sNew = m_dir.file("new");
    ASSERT_EQ(write_sample_trace(sNew, {sample_uint32(2 * S, 1, 0xC)}), TRACE_WRITER_OK);
    const std::vector<std::byte> before = read_file(sNew);
    constexpr timespec LONG_AGO[] = {{1000, 1000}, {2000, 2000}};
    ASSERT_EQ(utimensat(AT_FDCWD, sNew.c_str(), LONG_AGO, 0), 0);

    m_paths.insert(m_paths.begin(), {"-r", "-o", ""});
    live_command kelvo(m_paths);
    kelvo.read_line_with("val="); // now all of them are open
    ASSERT_EQ(rename(sNew.c_str(), sReplaced.c_str()), 0);
    const command_result result = kelvo.wait();
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.sErr, KELVO_PROGRAM ": 2625-164 File \"" + sReplaced +
                               "\" was replaced before it was read.\n\n");
    EXPECT_EQ(std::ranges::count(result.sOut, '\n'), FILES * RECORDS); // all but one and one more
    EXPECT_TRUE(result.sOut.ends_with("val=0x00000000\n[17] id=0x00000001 val=0x0000000b\n"));
    struct stat status {};
    ASSERT_EQ(stat(sReplaced.c_str(), &status), 0);
    EXPECT_EQ(status.st_atim.tv_sec, 1000);
    EXPECT_EQ(status.st_mtim.tv_nsec, 2000);
    EXPECT_EQ(read_file(sReplaced), before);
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

} // namespace
