#include "opening.h"

#include "first_record.h"
#include "identity.h"
#include "raw_trace.h"
#include "reader_words.h"
#include "stdout_stream.h"
#include "temp_dir.h"
#include "walk.h"

#include <algorithm>
#include <csignal>
#include <cstdlib>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <filesystem>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

using testing::EndsWith;
using testing::HasSubstr;
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
        const trace_bytes name = std::as_bytes(std::span(path));
        return std::search(maps.begin(), maps.end(), name.begin(), name.end()) != maps.end();
    }

    opened open_file(int bPrBaseProgName = 0, unsigned int total_files = 1,
                     unsigned int fileIndex = 0) {
        return open_path(path, bPrBaseProgName, total_files, fileIndex);
    }

    static opened open_path(const std::string& name, int bPrBaseProgName = 0,
                            unsigned int total_files = 1, unsigned int fileIndex = 0) {
        opened result;
        CaptureStdout();
        CaptureStderr();
        result.iResult = open_trace_file(name.c_str(), &result.pFile, &result.elem, bPrBaseProgName,
                                         total_files, fileIndex);
        stdout_flush();
        result.out = GetCapturedStdout();
        result.err = GetCapturedStderr();
        return result;
    }

    /// Makes the file anew before.
    opened open_file(const raw_trace& raw, int bPrBaseProgName = 0, unsigned int total_files = 1,
                     unsigned int fileIndex = 0) {
        EXPECT_TRUE(raw.write(path));
        return open_file(bPrBaseProgName, total_files, fileIndex);
    }

    static void end(const opened& file) {
        ASSERT_EQ(file.iResult, 0) << file.err;
        close_trace_file(file.pFile);
        close_trace_file(file.pFile); // harmless
        release_trace_file(file.pFile);
    }

    /// A small sound file of one record and the gap.
    static raw_trace sound_trace() {
        raw_trace raw(400);
        raw.header.timeInfo = {.timeinfo1 = 1'700'000'000'123'456'789, .timeinfo2 = 0};
        raw.add({.seqNumber = 6, .timeStamp = 1000});
        raw.header.uOldestRecordOffset = raw.add_rest();
        return raw;
    }

    timespec modification_time() const {
        struct stat status {};
        EXPECT_EQ(stat(path.c_str(), &status), 0);
        return status.st_mtim;
    }

    /// Whether this process holds a lock on the file, as another one sees it.
    bool is_locked() const {
        const pid_t asker = fork();
        if (asker == 0) {
            struct flock lock {};
            lock.l_type = F_WRLCK;
            fcntl(open(path.c_str(), O_RDWR), F_GETLK, &lock);
            _exit(lock.l_type != F_UNLCK);
        }
        int state = -1;
        EXPECT_EQ(waitpid(asker, &state, 0), asker);
        return state != 0;
    }

    /// Walks to the end and says how many records there were.
    static int read_all(trace_file* pFile) {
        trace_record_header header;
        int iRecords = 0;
        walk_result here = is_last_record(pFile, &header);
        for (; here == WALK_RECORD; here = step_and_judge(pFile, &header))
            iRecords += header.function != TRC_FUNC_FILLER;
        EXPECT_EQ(is_last_record(pFile, &header), WALK_NO_RECORD);
        return iRecords;
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
    const std::string name =
        path + "\n\tProgram Name: " + std::string(48, 'p') + "\n\tProperties: ";
    const std::string ids = "\tNode Number: 3\n\tProcess Id: 4711\n\tMachine Id: 0x0000beef\n";
    const std::string level = "\tTrace Library Build Level: " + std::string(32, 'b') + "\n";
    const opened file = open_file(raw);
    EXPECT_EQ(file.out, "Filename: " + name +
                            "Little Endian, 64-bit mode\n\tPlatform: Linux x86-64\n"
                            "\tFileVersion: 4\n" +
                            ids + "\tNode ID:    0xabcdef0123\n" + level);
    EXPECT_EQ(file.err, "");
    EXPECT_EQ(file.elem.header.timeStamp, 1000U);
    EXPECT_EQ(file.pFile->addrMode64, 1);
    EXPECT_TRUE(file.elem.bOldestKnown);
    EXPECT_TRUE(file.elem.oldestTime == 1'700'000'000'123'457'789);
    end(file);

    raw.header.uVersion = 1;
    raw.header.uProperties = 0;
    raw.header.uPlatform = 9;
    const opened bigEndian = open_file(raw, 0, 2, 1);
    EXPECT_EQ(bigEndian.out, "[01] Filename: " + name +
                                 "Big Endian, 32-bit mode\n\tPlatform: Linux ARM64\n"
                                 "\tFileVersion: 1\n" +
                                 ids);
    EXPECT_EQ(bigEndian.pFile->addrMode64, 0);
    end(bigEndian);

    raw.header.uVersion = 3;
    const opened older = open_file(raw);
    EXPECT_THAT(older.out, EndsWith("\tFileVersion: 3\n" + ids + level));
    end(older);
}

TEST_F(Open, lists_base_program_names_and_nothing_else) {
    raw_trace raw = sound_trace();
    memset(raw.header.baseProgName, 'n', sizeof(raw.header.baseProgName));
    raw.header.uNode_ID = UINT64_MAX; // no NUL behind it either
    raw.header.uVersion = 5;
    const opened file = open_file(raw, 1);
    EXPECT_EQ(file.iResult, 0);
    EXPECT_EQ(file.pFile, nullptr);
    EXPECT_EQ(file.out, std::string(48, 'n') + "\n");
    EXPECT_TRUE(read_file(path) == raw.bytes());

    raw.header.uVersion = 4;
    const opened older = open_file(raw, 1, 3, 2);
    EXPECT_EQ(older.iResult, -1);
    EXPECT_EQ(older.out + older.err, "[02] Filename: " + path + "\n");
}

/// Every value of every byte of the header is tried by the hostile tests.
TEST_F(Open, refuses_what_is_no_trace_file_and_leaves_it_alone) {
    const std::string small = "2625-105 File \"" + path + "\" is too small to be a trace file.\n\n";
    const std::string invalid = "2625-107 File \"" + path + "\" is not a valid trace file.\n\n";
    raw_trace tooNew = sound_trace(), noRoom = sound_trace();
    tooNew.header.uVersion = 7;
    noRoom.header.uOffset = 373;
    anchor.bStartRecOpt = 1; // not looked at
    for (const auto& [raw, message] : {std::pair{raw_trace(0), small},
                                       {raw_trace(199), small},
                                       {raw_trace(200), invalid},
                                       {tooNew, invalid},
                                       {noRoom, invalid}}) {
        ASSERT_TRUE(raw.write(path));
        const timespec longAgo[2] = {{1'000'000'000, 5000}, {1'000'000'000, 5000}};
        ASSERT_EQ(utimensat(AT_FDCWD, path.c_str(), longAgo, 0), 0);
        const opened file = open_file();
        EXPECT_EQ(file.iResult, -1);
        EXPECT_EQ(file.pFile, nullptr);
        EXPECT_EQ(file.out, "");
        EXPECT_EQ(file.err, "kelvo: " + message);
        EXPECT_TRUE(read_file(path) == raw.bytes());
        EXPECT_EQ(modification_time().tv_sec, 1'000'000'000);
    }
    anchor.bStartRecOpt = 0;
}

TEST_F(Open, refuses_what_is_no_file_without_waiting) {
    const std::string error = "kelvo: 2625-102 Error opening file \"" + path + "\", ";
    EXPECT_EQ(open_file().err, error + "No such file or directory\n");
    ASSERT_EQ(mkdir(path.c_str(), 0700), 0);
    EXPECT_EQ(open_file().err, error + "Is a directory\n");
    ASSERT_EQ(rmdir(path.c_str()), 0);
    ASSERT_EQ(mkfifo(path.c_str(), 0600), 0);
    const opened fifo = open_file(0, 2, 0);
    EXPECT_EQ(fifo.out, "[00] Filename: " + path + "\n");
    EXPECT_THAT(fifo.err, HasSubstr("2625-105"));
}

TEST_F(Open, refuses_a_file_that_another_process_reads_unless_told_not_to_lock) {
    ASSERT_TRUE(sound_trace().write(path));
    const pid_t other = fork();
    ASSERT_GE(other, 0);
    if (other == 0) {
        trace_file file{};
        file.pName = const_cast<char*>(path.c_str());
        raise(open_lock_map_trace_file(&file) == 0 ? SIGSTOP : SIGKILL);
        _exit(1);
    }
    int state = 0;
    ASSERT_EQ(waitpid(other, &state, WUNTRACED), other);
    ASSERT_TRUE(WIFSTOPPED(state)) << "it holds the lock";

    const opened file = open_file();
    EXPECT_EQ(file.iResult, -1);
    EXPECT_EQ(file.out, "kelvo: 2625-161 Trace file \"" + path + "\" is already in use.\n");
    EXPECT_EQ(file.err, "");
    EXPECT_TRUE(read_file(path) == sound_trace().bytes());
    anchor.bNoFileLocking = 1;
    end(open_file());

    kill(other, SIGKILL);
    EXPECT_EQ(waitpid(other, nullptr, 0), other);
}

TEST_F(Open, parks_the_file_until_its_turn_and_closes_it_with_its_times) {
    const raw_trace raw = sound_trace();
    const opened file = open_file(raw);
    trace_file* const pFile = file.pFile;
    ASSERT_EQ(file.iResult, 0);
    EXPECT_EQ(pFile->fd, -1);
    EXPECT_FALSE(is_mapped());
    EXPECT_TRUE(read_file(path) == raw.bytes());

    ASSERT_EQ(open_lock_map_trace_file(pFile), 0);
    EXPECT_TRUE(is_mapped());
    request_tail(pFile);
    EXPECT_EQ(pFile->pHeader->uTailReq, TRC_TAIL_REQUESTED);
    EXPECT_EQ(find_first_record(pFile), 0);
    EXPECT_EQ(pFile->pHeader->uSeqLock, 6U);
    pFile->timeStampIsValid = 1;
    pFile->modTime = {1'234'567'890, 987'654'321};
    end(file);
    EXPECT_TRUE(read_file(path) == raw.bytes()) << "no reader, no request";
    EXPECT_EQ(modification_time().tv_sec, 1'234'567'890);
    EXPECT_EQ(modification_time().tv_nsec, 987'654'000);
}

TEST_F(Open, reads_a_parked_file_that_has_shrunk_within_its_bounds) {
    for (const off_t iSize : {off_t{100}, off_t{210}, off_t{230}}) {
        const opened file = open_file(sound_trace());
        ASSERT_EQ(truncate(path.c_str(), iSize), 0);
        CaptureStderr();
        if (open_lock_map_trace_file(file.pFile) == 0) {
            EXPECT_EQ(find_first_record(file.pFile), -1);
        }
        EXPECT_THAT(GetCapturedStderr(),
                    HasSubstr(iSize < 200 ? "2625-105" : "pCurRec out of bounds"));
        end(file);
    }
}

TEST_F(Open, of_twins_shares_one_lock_and_keeps_the_words_of_the_slowest) {
    raw_trace raw(10000);
    for (uint32_t uNumber = 6; uNumber < 6 + 2 * 200; uNumber += 2)
        raw.add({.seqNumber = uNumber, .body = raw_bytes(7U)});
    raw.header.uOldestRecordOffset = raw.add_rest();
    ASSERT_TRUE(raw.write(path));
    ASSERT_EQ(link(path.c_str(), dir.file("b.trc").c_str()), 0);
    const size_t uClosed = count_descriptors();
    const opened twins[] = {open_file(), open_path(dir.file("b.trc")), open_file()};
    trace_file* const pFirst = twins[0].pFile;
    trace_file* const pLast = twins[2].pFile;
    for (const opened& twin : twins) {
        ASSERT_EQ(open_lock_map_trace_file(twin.pFile), 0);
        request_tail(twin.pFile);
        ASSERT_EQ(find_first_record(twin.pFile), 0);
    }
    EXPECT_EQ(count_descriptors(), uClosed + 1);
    const trace_file_header& header = *pFirst->pHeader;
    release_tail(pFirst);
    release_tail(pLast);
    EXPECT_EQ(header.uTailReq, TRC_TAIL_REQUESTED);
    close_trace_file(twins[1].pFile); // it never reads
    EXPECT_EQ(header.uTailReq, 0U);

    EXPECT_EQ(read_all(pLast), 200);
    EXPECT_EQ(header.uSeqLock, 6U) << "the other one has not moved";
    EXPECT_EQ(read_all(pFirst), 200);
    EXPECT_EQ(header.uSeqLock, 406U);
    pLast->timeStampIsValid = 1;
    pLast->modTime = {1'234'567'890, 0};
    end(twins[2]);
    EXPECT_TRUE(is_locked()) << "by the one that is left";
    EXPECT_EQ(header.uSeqLock, 406U);
    end(twins[0]);
    EXPECT_FALSE(is_locked());
    end(twins[1]);
    EXPECT_TRUE(read_file(path) == raw.bytes());
    EXPECT_EQ(modification_time().tv_sec, 1'234'567'890) << "the latest of all";
}

TEST_F(Open, gives_up_a_file_that_was_replaced_and_leaves_the_new_one_alone) {
    const std::string other = dir.file("b.trc");
    for (const bool bIsRead : {false, true}) {
        const opened file = open_file(sound_trace());
        ASSERT_TRUE(sound_trace().write(other));
        const opened reading = open_path(other);
        if (bIsRead) {
            ASSERT_EQ(open_lock_map_trace_file(reading.pFile), 0);
            ASSERT_EQ(unlink(path.c_str()), 0);
            ASSERT_EQ(link(other.c_str(), path.c_str()), 0);
        } else { // the new one may get the inode of the old one
            ASSERT_EQ(unlink(path.c_str()), 0);
            ASSERT_TRUE(sound_trace().write(path));
        }
        const timespec before = modification_time();
        CaptureStderr();
        EXPECT_EQ(open_lock_map_trace_file(file.pFile), -1);
        EXPECT_EQ(GetCapturedStderr(),
                  "kelvo: 2625-164 File \"" + path + "\" was replaced before it was read.\n\n");
        end(file);
        EXPECT_EQ(is_locked(), bIsRead);
        EXPECT_TRUE(read_file(path) == sound_trace().bytes());
        EXPECT_EQ(modification_time().tv_nsec, before.tv_nsec);
        end(reading);
    }
}

TEST_F(Open, follows_one_file_once_and_keeps_its_lock) {
    anchor.bFollow = 1;
    const opened file = open_file(sound_trace());
    const std::string other = dir.file("b.trc");
    ASSERT_EQ(symlink(path.c_str(), other.c_str()), 0);
    const opened again = open_path(other);
    EXPECT_EQ(again.iResult, -1);
    EXPECT_EQ(again.out, "kelvo: 2625-161 Trace file \"" + other + "\" is already in use.\n");
    EXPECT_TRUE(is_locked());
    end(file);
}

TEST_F(Open, stores_nothing_in_a_file_that_is_only_read) {
    const raw_trace raw = sound_trace();
    ASSERT_TRUE(raw.write(path));
    const timespec before = modification_time();
    trace_file_ptr pFile;
    trace_file_header header;
    TrcPreProcHdrElem elem{};
    ASSERT_EQ(open_checked_file(path.c_str(), true, &pFile, &header).eOutcome, OPEN_OK);
    ASSERT_EQ(accept_trace_file(pFile.get(), header, &elem).eOutcome, OPEN_OK);
    EXPECT_FALSE(is_locked());
    request_tail(pFile.get());
    EXPECT_EQ(find_first_record(pFile.get()), 0);
    EXPECT_EQ(read_all(pFile.get()), 1);
    pFile->pHeader->uSeqLock = 4711; // whoever stores all the same
    pFile->timeStampIsValid = 1;
    pFile = nullptr;
    EXPECT_TRUE(read_file(path) == raw.bytes());
    EXPECT_EQ(modification_time().tv_nsec, before.tv_nsec);
}

TEST_F(Open, waits_for_a_lease_that_is_called_back) {
    ASSERT_TRUE(sound_trace().write(path));
    const pid_t holder = fork();
    ASSERT_GE(holder, 0);
    if (holder == 0) {
        sigset_t called;
        sigemptyset(&called);
        sigaddset(&called, SIGIO);
        sigprocmask(SIG_BLOCK, &called, nullptr);
        const int fd = open(path.c_str(), O_RDWR);
        if (fcntl(fd, F_SETLEASE, F_WRLCK) != 0)
            _exit(1);
        raise(SIGSTOP);
        sigwaitinfo(&called, nullptr);
        usleep(20'000);
        _exit(0);
    }
    int state = 0;
    ASSERT_EQ(waitpid(holder, &state, WUNTRACED), holder);
    if (!WIFSTOPPED(state))
        GTEST_SKIP() << "no leases here";
    kill(holder, SIGCONT);
    end(open_file());
    EXPECT_EQ(waitpid(holder, &state, 0), holder);
    EXPECT_EQ(state, 0) << "it was asked";
}

TEST(Identity, finds_each_of_many_files) {
    std::vector<trace_file> files(1000);
    for (size_t i = 0; i < files.size(); ++i) {
        files[i].identity = {i % 3, i * 64, 0, 0};
        EXPECT_EQ(find_accepted_file(files[i].identity), nullptr);
        enter_accepted_file(&files[i]);
    }
    for (trace_file& file : files) {
        EXPECT_EQ(find_accepted_file(file.identity), &file);
        forget_accepted_file(&file);
        forget_accepted_file(&file); // harmless
        EXPECT_EQ(find_accepted_file(file.identity), nullptr);
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
        end(file);
    }
}

TEST_F(Open, of_the_first_file_sets_the_time_zone_and_the_start) {
    std::string sRefused = "+r";
    anchor.pStartRecordOptArg = sRefused.data();
    static constexpr char UNCHANGED[] = "EST5";
    const struct {
        int32_t tz_offset;
        const char* pZone;
        bool bLocalTZ = false;
        unsigned int fileIndex = 0;
        uint32_t uOffset = 200;
    } cases[] = {
        {300, "UTC05:00"},
        {-330, "UTC-5:30"},
        {0, "UTC00:00"},
        {-59, "UTC-0:59"},
        {-60, "UTC-1:00"},
        {INT32_MAX, "UTC35791394:07"},
        {INT32_MIN, "UTC-35791394:08"},
        {-1, UNCHANGED},
        {300, UNCHANGED, true},
        {300, UNCHANGED, false, 1},
        {300, UNCHANGED, false, 0, 196},
    };
    for (const auto& test : cases) {
        raw_trace raw = sound_trace();
        raw.header.tz_offset = test.tz_offset;
        raw.header.uOffset = test.uOffset;
        setenv("TZ", UNCHANGED, 1);
        anchor.bHostTZ = 0;
        anchor.bLocalTZ = test.bLocalTZ;
        anchor.bStartRecOpt = test.fileIndex != 0; // when no file was first
        end(open_file(raw, 0, 2, test.fileIndex));
        EXPECT_STREQ(getenv("TZ"), test.pZone);
        EXPECT_EQ(anchor.bHostTZ, test.pZone != UNCHANGED);
    }
    anchor.bStartRecOpt = 0;
    anchor.pStartRecordOptArg = nullptr;
}

} // namespace
