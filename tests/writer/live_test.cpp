// The protocol with the command's own reader, step by step on one thread; a
// reader that dies; and the whole of it with reader and writer on two threads.
#include "first_record.h"
#include "raw_trace.h"
#include "reader_words.h"
#include "reference_reader.h"
#include "ring.h"
#include "shared_words.h"
#include "temp_dir.h"
#include "trace_writer.h"
#include "walk.h"

#include <algorithm>
#include <atomic>
#include <csignal>
#include <fcntl.h>
#include <gtest/gtest.h>
#include <random>
#include <sys/wait.h>
#include <thread>
#include <unistd.h>

namespace {

constexpr uint32_t HEADER = sizeof(trace_file_header);

/// A reader in the mapping of the writer, its steps one by one.
struct live_reader {
    explicit live_reader(std::span<std::byte> mapped) {
        file.pName = name;
        ring_map_over(&file, mapped.data(), mapped.size());
    }

    /// The number in the record that stands in `header`.
    uint32_t number() const {
        return load<uint32_t>(record_bytes(&file, file.pCurRec, header.length), sizeof(header));
    }
    void close() {
        release_tail(&file);
        store_seq_lock(file.pHeader, TRC_SEQ_NO_READER);
    }

    char name[6] = "trace";
    trace_file file{};
    trace_record_header header{};
};

class live_trace : public testing::Test {
protected:
    void make(uint32_t uArea) {
        // The reader is in this process.
        const trace_writer_options options{.uFileSize = HEADER + uArea,
                                           .bForgetDeadReaders = false};
        ASSERT_EQ(writer.create(dir.file("trace").c_str(), options), TRACE_WRITER_OK);
    }

    /// Appends the next number in a record of `uLength` bytes.
    trace_writer_status append(uint32_t uLength = 32) {
        std::vector<std::byte> body = raw_bytes(++uNumber);
        body.resize(uLength - sizeof(trace_record_header));
        const trace_writer_status status = writer.append(TRC_FUNC_ID, {"_TST", 1, uNumber}, body);
        if (bChecksRing) {
            EXPECT_EQ(problem(), "");
        }
        return status;
    }

    /// The whole handshake of a reader, the writer polling.
    void start(live_reader& reader) {
        store_tail_request(reader.file.pHeader, TRC_TAIL_REQUESTED);
        writer.poll();
        ASSERT_TRUE(tail_request_is_acknowledged(reader.file.pHeader));
        ASSERT_EQ(find_first_record(&reader.file), 0);
        release_tail(&reader.file);
        writer.poll();
        ASSERT_FALSE(tail_request_is_acknowledged(reader.file.pHeader));
    }

    /// The numbers that the reader can read now; a record of kind 0xFFFE as 0.
    static std::vector<uint32_t> read(live_reader& reader, size_t uMost = SIZE_MAX) {
        std::vector<uint32_t> numbers;
        while (numbers.size() < uMost) {
            const walk_result result = is_last_record(&reader.file, &reader.header);
            EXPECT_NE(result, WALK_CORRUPT);
            if (result != WALK_RECORD)
                break;
            if (reader.header.function != TRC_FUNC_FILLER)
                numbers.push_back(reader.number());
            step_to_next_record(&reader.file, reader.header);
        }
        return numbers;
    }

    std::string problem() {
        return list_ring(writer.mapping()).problem;
    }

    using numbers = std::vector<uint32_t>;
    const temp_dir dir;
    trace_writer writer;
    uint32_t uNumber = 0;
    bool bChecksRing = true; ///< after each append
};

TEST_F(live_trace, records_are_held_while_the_reader_looks_for_its_first) {
    make(1000);
    ASSERT_EQ(append(), TRACE_WRITER_OK);
    live_reader reader(writer.mapping());
    store_tail_request(reader.file.pHeader, TRC_TAIL_REQUESTED);
    ASSERT_EQ(append(), TRACE_WRITER_OK);
    EXPECT_TRUE(tail_request_is_acknowledged(reader.file.pHeader));
    EXPECT_EQ(load<trace_file_header>(writer.mapping(), 0).uOldestRecordOffset, HEADER + 32U);
    ASSERT_EQ(append(), TRACE_WRITER_OK);
    EXPECT_EQ(writer.counts().uHeld, 2U);
    ASSERT_EQ(find_first_record(&reader.file), 0);
    EXPECT_EQ(ring_offset(&reader.file, reader.file.pCurRec), HEADER);
    while (append() == TRACE_WRITER_OK) // nothing is given up meanwhile
        ASSERT_FALSE(HasFailure());
    const uint32_t uDropped = uNumber;
    release_tail(&reader.file);
    EXPECT_EQ(read(reader), numbers{1}) << "held records are not to be seen yet";
    writer.poll();
    EXPECT_FALSE(tail_request_is_acknowledged(reader.file.pHeader));
    EXPECT_EQ(problem(), "");
    numbers expected;
    for (uint32_t i = 2; i < uDropped; ++i)
        expected.push_back(i);
    EXPECT_EQ(read(reader), expected);
    ASSERT_EQ(append(), TRACE_WRITER_OK);
    EXPECT_EQ(writer.counts().uDiscards, 1U);
    EXPECT_EQ(read(reader), (numbers{0, uNumber}));
}

TEST_F(live_trace, nothing_is_given_up_that_the_reader_has_not_passed) {
    make(28 + 32 * 8);
    for (int i = 0; i < 20; ++i)
        ASSERT_EQ(append(), TRACE_WRITER_OK);
    live_reader reader(writer.mapping());
    start(reader);
    uint32_t uNext = 0;
    for (size_t uStep = 1; uStep <= 3; ++uStep) {
        const numbers passed = read(reader, uStep);
        ASSERT_EQ(passed.size(), uStep);
        // The next one is being copied.
        ASSERT_EQ(is_last_record(&reader.file, &reader.header), WALK_RECORD);
        uNext = passed.back() + 1;
        while (append() == TRACE_WRITER_OK)
            ASSERT_FALSE(HasFailure());
        EXPECT_EQ(append(), TRACE_WRITER_DROPPED);
        const std::vector<ring_element> records = list_ring(writer.mapping()).records();
        EXPECT_EQ(load<uint32_t>(records[0].body, 0), uNext) << "given up, or room left unused";
    }
    EXPECT_EQ(read(reader, 1), numbers{uNext});
    read(reader);
    ASSERT_EQ(append(), TRACE_WRITER_OK);
    EXPECT_EQ(read(reader), (numbers{0, uNumber})) << "0xFFFE speaks for what was dropped";
    reader.close();
    ASSERT_EQ(append(28 + 32 * 8 - 28), TRACE_WRITER_OK) << "no reader, no drops";
}

/// The reader begins on an empty ring.
TEST_F(live_trace, record_longer_than_both_ends_follows_a_reader_round) {
    make(1000);
    live_reader reader(writer.mapping());
    start(reader);
    for (int i = 0; i < 16; ++i)
        ASSERT_EQ(append(), TRACE_WRITER_OK);
    ASSERT_EQ(read(reader), numbers({1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12, 13, 14, 15, 16}));
    // The reader stands on the gap in the middle, which cannot be taken away.
    numbers seen;
    for (int i = 0; i < 3; ++i) {
        append(900);
        const numbers now = read(reader);
        seen.insert(seen.end(), now.begin(), now.end());
    }
    EXPECT_EQ(seen.back(), uNumber);
    EXPECT_LE(writer.counts().uDropped, 2U);
}

TEST_F(live_trace, reader_that_died_does_not_stop_the_writer) {
    const std::string path = dir.file("trace");
    for (const bool bInHandshake : {false, true}) {
        ASSERT_EQ(writer.create(path.c_str(), {.uFileSize = 1000}), TRACE_WRITER_OK);
        ASSERT_EQ(append(), TRACE_WRITER_OK);
        const pid_t pid = fork();
        ASSERT_GE(pid, 0);
        if (pid == 0) {
            struct flock lock {};
            lock.l_type = F_WRLCK;
            const int fd = open(path.c_str(), O_RDWR | O_CLOEXEC);
            live_reader reader(writer.mapping());
            store_tail_request(reader.file.pHeader, TRC_TAIL_REQUESTED);
            const bool bFound =
                fcntl(fd, F_SETLK, &lock) == 0 && find_first_record(&reader.file) == 0;
            if (!bInHandshake)
                release_tail(&reader.file);
            raise(bFound ? SIGSTOP : SIGKILL);
            _exit(1);
        }
        int state = 0;
        ASSERT_EQ(waitpid(pid, &state, WUNTRACED), pid);
        ASSERT_TRUE(WIFSTOPPED(state)) << "it holds the lock and has its place";
        trace_writer_status status = TRACE_WRITER_OK;
        for (int i = 0; i < 100 && status == TRACE_WRITER_OK; ++i)
            status = append();
        usleep(20'000);
        EXPECT_EQ(append(), TRACE_WRITER_DROPPED);
        kill(pid, SIGKILL);
        ASSERT_EQ(waitpid(pid, nullptr, 0), pid);
        for (int i = 0; i < 10'000 && (status = append()) == TRACE_WRITER_DROPPED; ++i)
            usleep(1000);
        EXPECT_EQ(status, TRACE_WRITER_OK);
        const auto header = load<trace_file_header>(writer.mapping(), 0);
        EXPECT_EQ(header.uSeqLock, TRC_SEQ_NO_READER);
        EXPECT_EQ(header.uTailReq, 0U);
        EXPECT_EQ(header.uFlags & TRC_FLAG_TAIL_ACK, 0);
        EXPECT_EQ(writer.counts().uDiscards, 1U);
    }
}

// A writer at full speed and a reader that comes and goes: whatever was not
// dropped is seen by a reader exactly once and in order, from its first record
// to the last one before it leaves.
class live_stress : public live_trace, public testing::WithParamInterface<uint32_t> {
protected:
    static constexpr uint32_t APPENDS = 60'000;

    void write_all(uint32_t uLongest) {
        std::mt19937 engine(uLongest);
        const auto random = [&engine] { return static_cast<uint32_t>(engine()); };
        for (uint32_t i = 0; i < APPENDS; ++i) {
            const uint32_t uLength = random() % 16 == 0 ? uLongest : std::min(uLongest, 64U);
            const trace_writer_status status = append(32 + 4 * (random() % ((uLength - 28) / 4)));
            ASSERT_GE(status, TRACE_WRITER_OK);
            if (status == TRACE_WRITER_OK)
                accepted.push_back(uNumber);
            else
                std::this_thread::yield();
        }
        bWritten = true;
        while (!bReaderDone.load()) { // answer the last reader
            writer.poll();
            std::this_thread::yield();
        }
    }

    /// One reader's session of at most `uMost` records.
    void read_session(uint32_t uMost) {
        live_reader reader(writer.mapping());
        store_tail_request(reader.file.pHeader, TRC_TAIL_REQUESTED);
        while (!tail_request_is_acknowledged(reader.file.pHeader))
            std::this_thread::yield();
        bool bSound = find_first_record(&reader.file) == 0;
        release_tail(&reader.file);
        numbers seen;
        while (bSound && seen.size() < uMost) {
            const walk_result result = is_last_record(&reader.file, &reader.header);
            bSound = result != WALK_CORRUPT;
            if (result == WALK_RECORD) {
                if (reader.header.function == TRC_FUNC_ID)
                    seen.push_back(reader.number());
                step_to_next_record(&reader.file, reader.header);
            } else if (bWritten.load() && result == WALK_NO_RECORD) {
                break;
            } else {
                std::this_thread::yield();
            }
        }
        EXPECT_TRUE(bSound) << "function " << unsigned{reader.header.function} << " length "
                            << uint32_t{reader.header.length} << " at "
                            << ring_offset(&reader.file, reader.file.pCurRec);
        reader.close();
        sessions.push_back(std::move(seen));
    }

    numbers accepted;              // writer's
    std::vector<numbers> sessions; // reader's
    std::atomic<bool> bReaderDone{false};
    std::atomic<bool> bWritten{false};
};

TEST_P(live_stress, reader_sees_every_record_once_and_in_order) {
    make(GetParam());
    bChecksRing = false; // while it is read
    const uint32_t uLongest = std::max(36U, std::min(writer.max_record_length(), 600U));
    testing::internal::CaptureStderr();
    std::thread reading([this] {
        for (int i = 0; i < 40 && !HasFailure(); ++i)
            read_session(i % 2 == 0 ? 50 : 1500);
        bReaderDone = true;
    });
    write_all(uLongest);
    reading.join();
    EXPECT_EQ(testing::internal::GetCapturedStderr(), "");

    EXPECT_EQ(problem(), "");
    size_t uSeen = 0;
    for (const numbers& seen : sessions) {
        uSeen += seen.size();
        if (seen.empty())
            continue;
        const auto pFirst = std::lower_bound(accepted.begin(), accepted.end(), seen.front());
        ASSERT_LE(seen.size(), static_cast<size_t>(accepted.end() - pFirst));
        EXPECT_EQ(numbers(pFirst, pFirst + static_cast<ptrdiff_t>(seen.size())), seen);
    }
    EXPECT_GT(uSeen, 0U); // how many is a matter of scheduling
    EXPECT_EQ(accepted.size() + writer.counts().uDiscards, writer.counts().uAppended);
    EXPECT_EQ(accepted.size() + writer.counts().uDropped, APPENDS);
}

INSTANTIATE_TEST_SUITE_P(areas, live_stress, testing::Values(128, 332, 1000, 5000, 100'000));

} // namespace
