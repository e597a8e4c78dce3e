// What a reader makes of a file whose writer stands still: between any two of
// its stores, and in rings whose numbers come to that of a gap.
#include "live_support.h"
#include "raw_trace.h"
#include "reference_reader.h"
#include "sample_trace.h"
#include "temp_dir.h"

#include <algorithm>
#include <csignal>
#include <cstring>
#include <fcntl.h>
#include <sstream>
#include <sys/mman.h>
#include <sys/prctl.h>
#include <sys/ptrace.h>
#include <sys/wait.h>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace {

using file_bytes = std::vector<std::byte>;
using numbers = std::vector<uint32_t>;

/// The numbers of the records in a ring at rest: strings that begin with them.
numbers numbers_in(const file_bytes& file) {
    numbers result;
    for (const ring_element& element : list_ring(file).records())
        if (element.header.function == TRC_FUNC_STRING)
            result.push_back(static_cast<uint32_t>(
                strtoul(reinterpret_cast<const char*>(element.body.data()), nullptr, 10)));
    return result;
}

/// The numbers that a run prints of each of the files.
std::vector<numbers> printed_numbers(const std::string& sOut, size_t uFiles) {
    std::vector<numbers> result(uFiles);
    std::istringstream lines(sOut);
    for (std::string sLine; std::getline(lines, sLine);) {
        unsigned int uFile, uNumber;
        if (sscanf(sLine.c_str(), "[%u] %u ", &uFile, &uNumber) == 2)
            result.at(uFile).push_back(uNumber);
    }
    return result;
}

// ------------------------------------------------------- between two stores

constexpr uint32_t SIZE = 200 + 600;

/// Appends records of different lengths, three times round the ring, and stops at
/// rest before each. With `bRequests` a reader looks for its first record now and
/// then, while some of them are appended.
[[noreturn]] void write_stopping(const char* pPath, bool bRequests) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    trace_writer writer;
    if (ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) != 0 ||
        writer.create(pPath, {.uFileSize = SIZE, .bForgetDeadReaders = false}) != TRACE_WRITER_OK)
        _exit(1);
    auto* const pHeader = reinterpret_cast<trace_file_header*>(writer.mapping().data());
    std::vector<std::string> texts;
    for (uint32_t i = 1; i <= 40; ++i)
        texts.push_back(std::to_string(i) + ' ' + std::string(i * 13 % 40, '.'));
    for (uint32_t i = 1; const std::string& sText : texts) {
        raise(SIGSTOP);
        if (bRequests && i % 6 == 3)
            pHeader->uTailReq = TRC_TAIL_REQUESTED;
        if (i % 6 == 0)
            pHeader->uTailReq = 0;
        writer.append_string({"_TST", 1, 1}, sText); // of one time: printed as they are read
        ++i;
    }
    raise(SIGSTOP);
    _exit(0);
}

struct stopped_file {
    file_bytes bytes;
    bool bAtRest = false;
};

/// Every content that the file has on the way, in their order.
std::vector<stopped_file> all_contents(const std::string& sPath, bool bRequests) {
    std::vector<stopped_file> files;
    const pid_t pid = fork();
    if (pid == 0)
        write_stopping(sPath.c_str(), bRequests);
    const std::byte* pMap = nullptr;
    int state = 0;
    while (waitpid(pid, &state, 0) == pid && WIFSTOPPED(state)) {
        const bool bAtRest = WSTOPSIG(state) == SIGSTOP;
        if (pMap == nullptr && bAtRest) {
            const int fd = open(sPath.c_str(), O_RDONLY | O_CLOEXEC);
            pMap = static_cast<const std::byte*>(mmap(nullptr, SIZE, PROT_READ, MAP_SHARED, fd, 0));
            close(fd);
        }
        if (files.empty() || memcmp(files.back().bytes.data(), pMap, SIZE) != 0)
            files.push_back({{pMap, pMap + SIZE}});
        files.back().bAtRest |= bAtRest;
        ptrace(PTRACE_SINGLESTEP, pid, nullptr, nullptr);
    }
    munmap(const_cast<std::byte*>(pMap), SIZE);
    return files;
}

class StoppedWriter : public testing::TestWithParam<bool> {};

TEST_P(StoppedWriter, LeavesEveryRecordToBeReadOnce) {
    const temp_dir dir;
    const std::vector<stopped_file> files = all_contents(dir.file("written"), GetParam());
    if (files.empty())
        GTEST_SKIP() << "no process may be stopped here";
    ASSERT_GT(files.size(), 400U);
    std::vector<std::string> arguments{"-o", ""};
    for (size_t i = 0; i < files.size(); ++i) {
        arguments.push_back(dir.file(std::to_string(i)));
        ASSERT_TRUE(write_file(arguments.back(), files[i].bytes));
    }
    const command_result result = run_command(arguments);
    EXPECT_EQ(result.status, 0);
    EXPECT_EQ(result.sErr, "");
    const std::vector<numbers> printed = printed_numbers(result.sOut, files.size());
    numbers before, after;
    for (size_t i = 0, uRest = 0; i < files.size() && !HasFailure(); ++i) {
        if (i == uRest) { // the file is between this content and the next one at rest
            before = numbers_in(files[i].bytes);
            while (uRest + 1 < files.size() && !files[++uRest].bAtRest) {
            }
            after = numbers_in(files[uRest].bytes);
        }
        SCOPED_TRACE(testing::Message()
                     << "content " << i << ", before " << testing::PrintToString(before)
                     << ", after " << testing::PrintToString(after));
        numbers all, both, found = printed[i];
        std::ranges::set_union(before, after, std::back_inserter(all));
        std::ranges::set_intersection(before, after, std::back_inserter(both));
        std::ranges::sort(found);
        // Held records are published from the last to the first.
        EXPECT_TRUE(GetParam() || found == printed[i]) << testing::PrintToString(printed[i]);
        EXPECT_EQ(std::ranges::adjacent_find(found), found.end()) << testing::PrintToString(found);
        EXPECT_TRUE(std::ranges::includes(found, both) && std::ranges::includes(all, found))
            << testing::PrintToString(found);
    }
}

INSTANTIATE_TEST_SUITE_P(Of, StoppedWriter, testing::Bool());

// ---------------------------------------------------- the number of a gap

/// A ring of ten records, of which the next one would have the number of a gap. The
/// gap stands before the record at place `uGap`, another filler before `uFiller`.
file_bytes ring_before_gap_number(uint32_t uGap, uint32_t uFiller) {
    constexpr uint32_t RECORDS = 10;
    raw_trace ring(4096);
    for (uint32_t uPlace = 0; uPlace <= RECORDS; ++uPlace) {
        if (uPlace == uGap)
            ring.header.uOldestRecordOffset = ring.add_filler(100);
        if (uPlace == uFiller)
            ring.add_filler(40);
        const uint32_t i = (uPlace + RECORDS - uGap) % RECORDS;
        if (uPlace < RECORDS)
            ring.add({.function = TRC_FUNC_STRING,
                      .seqNumber = TRC_SEQ_FILLER - 2 * (RECORDS - i),
                      .body = raw_bytes(std::to_string(i), ' ', '\0')});
    }
    ring.add_rest();
    return ring.bytes();
}

TEST(GapNumber, IsNeverTakenForTheNextOne) {
    const temp_dir dir;
    std::vector<std::string> arguments{"-o", ""};
    for (const uint32_t uGap : {0U, 4U, 10U})
        for (const uint32_t uFiller : {0U, 6U, 10U}) {
            arguments.push_back(dir.file(std::to_string(arguments.size())));
            ASSERT_TRUE(write_file(arguments.back(), ring_before_gap_number(uGap, uFiller)));
        }
    const size_t uFiles = arguments.size() - 2;
    const std::vector<numbers> expected(uFiles, numbers{0, 1, 2, 3, 4, 5, 6, 7, 8, 9});
    EXPECT_EQ(printed_numbers(run_command(arguments).sOut, uFiles), expected);

    // One more file shows that each reader has looked for more.
    trace_writer writer;
    arguments.push_back(dir.file("live"));
    ASSERT_EQ(writer.create(arguments.back().c_str()), TRACE_WRITER_OK);
    arguments.insert(arguments.begin(), {"-f", "-s", "+0r"});
    live_command kelvo(arguments);
    wait_for_reader(writer);
    std::string sOut;
    for (uint32_t i = 0; i < 3; ++i) {
        const std::string sText = "look " + std::to_string(i);
        ASSERT_EQ(append_all(writer, {sample_string(1, sText)}), TRACE_WRITER_OK);
        for (std::string sLine; !sLine.ends_with(sText) && !HasFailure(); sOut += sLine + '\n')
            sLine = kelvo.read_line();
    }
    kelvo.send_signal(SIGINT);
    sOut += kelvo.wait().sOut;
    EXPECT_EQ(printed_numbers(sOut, uFiles), expected);
}

} // namespace
