#include "open.h"

#include "first_record.h"
#include "raw_trace.h"
#include "stdout_stream.h"
#include "temp_dir.h"
#include "walk.h"

#include <csignal>
#include <cstdlib>
#include <ctime>
#include <fcntl.h>
#include <filesystem>
#include <functional>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using testing::EndsWith;
using testing::HasSubstr;
using testing::Not;
using testing::StartsWith;
using testing::internal::CaptureStderr;
using testing::internal::CaptureStdout;
using testing::internal::GetCapturedStderr;
using testing::internal::GetCapturedStdout;

namespace {

struct opened {
    int iResult = -1;
    trace_file* pFile = nullptr;
    TrcPreProcHdrElem elem{};
    std::string out;
    std::string err;
};

class Open : public testing::Test {
protected:
    Open() : uDescriptors(count_descriptors()) {
        anchor.pProgName = "kelvo";
        setenv("TZ", "UTC0", 1);
        tzset();
    }

    ~Open() override {
        anchor.bFollow = anchor.bNoFileLocking = anchor.bLocalTZ = anchor.bHostTZ = 0;
        anchor.bStartRecOpt = anchor.startOptions = anchor.tz_offset = 0;
        EXPECT_EQ(count_descriptors(), uDescriptors);
        EXPECT_FALSE(is_mapped());
    }

    static size_t count_descriptors() {
        using std::filesystem::directory_iterator;
        return static_cast<size_t>(
            std::distance(directory_iterator("/proc/self/fd"), directory_iterator()));
    }

    /// Whether any part of the test's file is mapped.
    bool is_mapped() const {
        const std::vector<std::byte> maps = read_file("/proc/self/maps");
        const std::string_view text(reinterpret_cast<const char*>(maps.data()), maps.size());
        return text.find(path) != std::string_view::npos;
    }

    opened open_file(int bPrBaseProgName = 0, unsigned int total_files = 1,
                     unsigned int fileIndex = 0) {
        opened result;
        CaptureStdout();
        CaptureStderr();
        result.iResult = open_trace_file(path.c_str(), &result.pFile, &result.elem, bPrBaseProgName,
                                         total_files, fileIndex);
        stdout_flush();
        result.out = GetCapturedStdout();
        result.err = GetCapturedStderr();
        return result;
    }

    static void end(trace_file* pTraceFile) {
        close_trace_file(pTraceFile, 0);
        close_trace_file(pTraceFile, 0); // harmless
        release_trace_file(pTraceFile);
    }

    /// A small sound file of one record and the gap.
    static raw_trace sound_trace() {
        raw_trace raw(400);
        raw.header.timeInfo = {.timeinfo1 = 1'700'000'000'123'456'789, .timeinfo2 = 0};
        raw.add({.seqNumber = 6, .timeStamp = 1000});
        raw.header.uOldestRecordOffset = raw.add_rest();
        return raw;
    }

    static timespec modification_time(const std::string& file) {
        struct stat status {};
        EXPECT_EQ(stat(file.c_str(), &status), 0);
        return status.st_mtim;
    }

    const temp_dir dir;
    const std::string path = dir.file("a.trc");

private:
    const size_t uDescriptors;
};

TEST_F(Open, prints_what_the_header_says) {
    raw_trace raw = sound_trace();
    raw.header.uVersion = 4;
    raw.header.uNodeNumber = 3;
    raw.header.uPid = 4711;
    raw.header.machineId = 0xBEEF;
    raw.header.uNode_ID = 0xABCDEF0123;
    memset(raw.header.program, 'p', sizeof(raw.header.program)); // no NUL
    memset(raw.header.buildName, 'b', sizeof(raw.header.buildName));
    ASSERT_TRUE(raw.write(path));
    opened file = open_file();
    ASSERT_EQ(file.iResult, 0);
    const std::string program(48, 'p');
    EXPECT_EQ(file.out, "Filename: " + path + "\n\tProgram Name: " + program +
                            "\n\tProperties: Little Endian, 64-bit mode\n"
                            "\tPlatform: Linux x86-64\n\tFileVersion: 4\n\tNode Number: 3\n"
                            "\tProcess Id: 4711\n\tMachine Id: 0x0000beef\n"
                            "\tNode ID:    0xabcdef0123\n\tTrace Library Build Level: " +
                            std::string(32, 'b') + "\n");
    EXPECT_EQ(file.err, "");
    EXPECT_EQ(file.pFile->addrMode64, 1);
    EXPECT_EQ(file.elem.header.timeStamp, 1000U);
    EXPECT_TRUE(file.elem.bOldestKnown);
    EXPECT_TRUE(file.elem.oldestTime == 1'700'000'000'123'457'789);
    end(file.pFile);

    raw.header.uVersion = 1;
    raw.header.uProperties = 0;
    raw.header.uPlatform = 9;
    ASSERT_TRUE(raw.write(path));
    file = open_file(0, 2, 1);
    ASSERT_EQ(file.iResult, 0);
    EXPECT_THAT(file.out, StartsWith("[01] Filename: " + path + "\n\tProgram Name: " + program +
                                     "\n\tProperties: Big Endian, 32-bit mode\n"
                                     "\tPlatform: Linux ARM64\n"));
    EXPECT_THAT(file.out, EndsWith("\tMachine Id: 0x0000beef\n"));
    EXPECT_EQ(file.pFile->addrMode64, 0);
    end(file.pFile);

    raw.header.uVersion = 3;
    ASSERT_TRUE(raw.write(path));
    file = open_file();
    EXPECT_THAT(file.out, HasSubstr("Build Level"));
    EXPECT_THAT(file.out, Not(HasSubstr("Node ID")));
    end(file.pFile);
}

TEST_F(Open, lists_base_program_names_and_nothing_else) {
    raw_trace raw = sound_trace();
    memset(raw.header.baseProgName, 'n', sizeof(raw.header.baseProgName));
    raw.header.uVersion = 5;
    ASSERT_TRUE(raw.write(path));
    const std::vector<std::byte> before = read_file(path);
    opened file = open_file(1);
    EXPECT_EQ(file.iResult, 0);
    EXPECT_EQ(file.pFile, nullptr);
    EXPECT_EQ(file.out, std::string(48, 'n') + "\n");
    EXPECT_TRUE(read_file(path) == before);

    raw.header.uVersion = 4;
    ASSERT_TRUE(raw.write(path));
    file = open_file(1, 3, 2);
    EXPECT_EQ(file.iResult, -1);
    EXPECT_EQ(file.out, "[02] Filename: " + path + "\n");
    EXPECT_EQ(file.err, "");
}

TEST_F(Open, refuses_what_is_no_trace_file_and_leaves_it_alone) {
    const std::string invalid = "2625-107 File \"" + path + "\" is not a valid trace file.\n\n";
    const std::string small = "2625-105 File \"" + path + "\" is too small to be a trace file.\n\n";
    const struct {
        std::function<void(raw_trace&)> spoil;
        std::string message;
    } cases[] = {
        {[](raw_trace& raw) { raw = raw_trace(199); }, small},
        {[](raw_trace& raw) { raw = raw_trace(0); }, small},
        {[](raw_trace& raw) { raw = raw_trace(200); }, invalid},
        {[](raw_trace& raw) { raw = raw_trace(227); }, invalid},
        {[](raw_trace& raw) { raw.header.uVersion = 7; }, invalid},
        {[](raw_trace& raw) { raw.header.uProperties |= 0x01; }, invalid},
        {[](raw_trace& raw) { raw.header.uProperties |= 0x20; }, invalid},
        {[](raw_trace& raw) { raw.header.uPlatform = 0; }, invalid},
        {[](raw_trace& raw) { raw.header.uPlatform = 12; }, invalid},
        {[](raw_trace& raw) { raw.header.uActualFileSize = 399; }, invalid},
        {[](raw_trace& raw) { raw.header.uOffset = 373; }, invalid},
        {[](raw_trace& raw) { raw.header.uOffset = 0xFFFFFFFF; }, invalid},
        {[](raw_trace& raw) {
             raw.header.uPlatform = 5;
             raw.header.uVersion = 5;
             raw.header.uOffset = 196;
         },
         invalid},
    };
    for (const auto& test : cases) {
        raw_trace raw = sound_trace();
        test.spoil(raw);
        ASSERT_TRUE(raw.write(path));
        const timespec longAgo[2] = {{1'000'000'000, 5000}, {1'000'000'000, 5000}};
        ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), longAgo, 0), 0);
        const std::vector<std::byte> before = read_file(path);
        anchor.bStartRecOpt = 1; // not looked at
        const opened file = open_file();
        EXPECT_EQ(file.iResult, -1);
        EXPECT_EQ(file.pFile, nullptr);
        EXPECT_EQ(file.out, "");
        EXPECT_EQ(file.err, "kelvo: " + test.message);
        EXPECT_TRUE(read_file(path) == before);
        EXPECT_EQ(modification_time(path).tv_sec, 1'000'000'000);
        EXPECT_FALSE(is_mapped());
    }
}

TEST_F(Open, refuses_what_is_no_file_without_waiting) {
    EXPECT_EQ(open_file().err,
              "kelvo: 2625-102 Error opening file \"" + path + "\", No such file or directory\n");
    ASSERT_EQ(mkdir(path.c_str(), 0700), 0);
    EXPECT_EQ(open_file().err,
              "kelvo: 2625-102 Error opening file \"" + path + "\", Is a directory\n");
    ASSERT_EQ(rmdir(path.c_str()), 0);
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    const opened fifo = open_file(0, 2, 0);
    EXPECT_EQ(fifo.out, "[00] Filename: " + path + "\n");
    EXPECT_EQ(fifo.err,
              "kelvo: 2625-105 File \"" + path + "\" is too small to be a trace file.\n\n");
}

TEST_F(Open, refuses_a_file_that_another_process_reads_unless_told_not_to_lock) {
    ASSERT_TRUE(sound_trace().write(path));
    int ready[2];
    ASSERT_EQ(pipe2(ready, O_CLOEXEC), 0);
    const pid_t other = fork();
    ASSERT_GE(other, 0);
    if (other == 0) {
        trace_file file{};
        file.pName = const_cast<char*>(path.c_str());
        file.fd = -1;
        const char result = open_lock_map_trace_file(&file) == 0 ? '+' : '-';
        (void)!write(ready[1], &result, 1);
        for (;;)
            pause();
    }
    char result = 0;
    EXPECT_EQ(read(ready[0], &result, 1), 1);
    EXPECT_EQ(result, '+');

    const std::vector<std::byte> before = read_file(path);
    const opened file = open_file();
    EXPECT_EQ(file.iResult, -1);
    EXPECT_EQ(file.out, "kelvo: 2625-161 Trace file \"" + path + "\" is already in use.\n");
    EXPECT_EQ(file.err, "");
    EXPECT_TRUE(read_file(path) == before);

    anchor.bNoFileLocking = 1;
    const opened unlocked = open_file();
    EXPECT_EQ(unlocked.iResult, 0);
    end(unlocked.pFile);
    anchor.bNoFileLocking = 0;

    kill(other, SIGKILL);
    EXPECT_EQ(waitpid(other, nullptr, 0), other);
    const opened again = open_file();
    EXPECT_EQ(again.iResult, 0) << "the lock ended with its process";
    end(again.pFile);
    close(ready[0]);
    close(ready[1]);
}

TEST_F(Open, parks_the_file_until_its_turn_and_closes_it_with_its_times) {
    ASSERT_TRUE(sound_trace().write(path));
    const std::vector<std::byte> before = read_file(path);
    const opened file = open_file();
    trace_file* const pFile = file.pFile;
    ASSERT_EQ(file.iResult, 0);
    EXPECT_EQ(pFile->fd, -1);
    EXPECT_EQ(pFile->pMapEnd, nullptr);
    EXPECT_EQ(pFile->pWrap, nullptr);
    EXPECT_EQ(pFile->pHeader->uActualFileSize, 400U);
    EXPECT_FALSE(is_mapped());
    EXPECT_TRUE(read_file(path) == before);

    ASSERT_EQ(open_lock_map_trace_file(pFile), 0);
    EXPECT_TRUE(is_mapped());
    request_tail(pFile);
    EXPECT_EQ(find_first_record(pFile), 0);
    EXPECT_EQ(pFile->pHeader->uSeqLock, 6U);
    pFile->timeStampIsValid = 1;
    pFile->modTime = {1'234'567'890, 987'654'321};
    end(pFile);
    const std::vector<std::byte> after = read_file(path);
    EXPECT_TRUE(after == before) << "no reader, no request";
    EXPECT_EQ(modification_time(path).tv_sec, 1'234'567'890);
    EXPECT_EQ(modification_time(path).tv_nsec, 987'654'000);
}

TEST_F(Open, keeps_a_followed_file_mapped) {
    ASSERT_TRUE(sound_trace().write(path));
    anchor.bFollow = 1;
    const opened file = open_file();
    ASSERT_EQ(file.iResult, 0);
    EXPECT_TRUE(is_mapped());
    EXPECT_GE(file.pFile->fd, 0);
    EXPECT_NE(fcntl(file.pFile->fd, F_GETFD) & FD_CLOEXEC, 0);
    end(file.pFile);
}

TEST_F(Open, reads_a_parked_file_that_has_shrunk_within_its_bounds) {
    for (const off_t iSize : {off_t{100}, off_t{210}, off_t{230}}) {
        ASSERT_TRUE(sound_trace().write(path));
        const opened file = open_file();
        ASSERT_EQ(file.iResult, 0);
        ASSERT_EQ(truncate(path.c_str(), iSize), 0);
        CaptureStderr();
        if (open_lock_map_trace_file(file.pFile) == 0) {
            EXPECT_EQ(find_first_record(file.pFile), -1);
        }
        EXPECT_THAT(GetCapturedStderr(),
                    HasSubstr(iSize < 200 ? "2625-105" : "pCurRec out of bounds"));
        end(file.pFile);
    }
}

TEST_F(Open, gives_all_of_an_oversized_mapping_back) {
    raw_trace raw = sound_trace();
    raw.header.uActualFileSize = 4096; // the low 32 bits of the size
    ASSERT_TRUE(raw.write(path));
    if (truncate(path.c_str(), (off_t{1} << 32) + 4096) != 0)
        GTEST_SKIP() << "no such large files here";
    anchor.bFollow = 1;
    const opened file = open_file();
    if (file.iResult == 0) {
        EXPECT_EQ(file.pFile->uSize, 4096U);
        EXPECT_EQ(get_record_offset(file.pFile, file.pFile->pMapEnd), 4096U);
        end(file.pFile);
    }
    EXPECT_FALSE(is_mapped());
}

TEST_F(Open, of_the_first_file_sets_the_time_zone) {
    const struct {
        int32_t tz_offset;
        const char* pZone; ///< null: TZ stays as it was
        bool bLocalTZ = false;
        unsigned int fileIndex = 0;
        uint32_t uOffset = 200;
    } cases[] = {
        {300, "UTC05:00"},
        {-330, "UTC-5:30"},
        {0, "UTC00:00"},
        {-59, "UTC-0:59"},
        {-2, "UTC-0:02"},
        {-60, "UTC-1:00"},
        {INT32_MAX, "UTC35791394:07"},
        {INT32_MIN, "UTC-35791394:08"},
        {-1, nullptr},
        {300, nullptr, true},
        {300, nullptr, false, 1},
        {300, nullptr, false, 0, 196},
    };
    for (const auto& test : cases) {
        raw_trace raw = sound_trace();
        raw.header.tz_offset = test.tz_offset;
        raw.header.uOffset = test.uOffset;
        ASSERT_TRUE(raw.write(path));
        setenv("TZ", "EST5", 1);
        tzset();
        anchor.bHostTZ = 0;
        anchor.bLocalTZ = test.bLocalTZ;
        const opened file = open_file(0, 2, test.fileIndex);
        ASSERT_EQ(file.iResult, 0);
        EXPECT_STREQ(getenv("TZ"), test.pZone != nullptr ? test.pZone : "EST5");
        EXPECT_EQ(anchor.bHostTZ, test.pZone != nullptr);
        end(file.pFile);
    }
}

TEST_F(Open, of_the_first_file_reads_the_start_argument_in_its_time_zone) {
    raw_trace raw = sound_trace();
    raw.header.tz_offset = 300;
    ASSERT_TRUE(raw.write(path));
    anchor.bStartRecOpt = 1;
    std::string argument = "02/21/99 12:00:00";
    anchor.pStartRecordOptArg = argument.data();
    const opened file = open_file();
    EXPECT_EQ(file.iResult, 0);
    EXPECT_EQ(anchor.startSeconds, 919616400);
    end(file.pFile);

    argument = "+r";
    const opened refused = open_file();
    EXPECT_EQ(refused.iResult, -1);
    EXPECT_EQ(refused.pFile, nullptr);
    EXPECT_THAT(refused.out, HasSubstr("\tMachine Id: "));
    EXPECT_THAT(refused.out, HasSubstr("kelvo [-fhbrl] [-o <dtic>]"));
    EXPECT_THAT(refused.err, HasSubstr("2625-153"));

    const opened second = open_file(0, 2, 1);
    EXPECT_EQ(second.iResult, 0) << "no later file looks at it";
    end(second.pFile);
    anchor.pStartRecordOptArg = nullptr;
}

} // namespace
