// Every system call of a run fails once, by strace: the documented message, the
// other file printed whole, no descriptor left open, the trace files untouched.
// Skipped where strace is not installed or processes may not be traced.
#include "faults_support.h"

#include <csignal>
#include <fstream>
#include <map>
#include <unistd.h>

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#ifndef KELVO_STRACE
#define KELVO_STRACE ""
#endif

namespace {

using testing::HasSubstr;

/// strace in the place of the command; the leak checker cannot be traced.
command_setup traced_setup() {
    command_setup setup;
    setup.sProgram = KELVO_STRACE;
    setup.environment = {sanitizer_option("ASAN_OPTIONS", "detect_leaks=0:handle_sigbus=0"),
                         sanitizer_option("TSAN_OPTIONS", "handle_sigbus=0")};
    return setup;
}

/// Its arguments: where it writes its log, its options, then the command with its own.
std::vector<std::string> traced(const std::string& sLog, const std::vector<std::string>& options,
                                const std::vector<std::string>& command) {
    std::vector<std::string> arguments{"-qq", "-o", sLog};
    arguments.insert(arguments.end(), options.begin(), options.end());
    arguments.emplace_back(KELVO_PROGRAM);
    arguments.insert(arguments.end(), command.begin(), command.end());
    return arguments;
}

std::string log_of(const fault_sample& sample) {
    return sample.dir.path() + "/calls";
}

std::vector<std::string> read_lines(const std::string& path) {
    std::ifstream file(path);
    std::vector<std::string> lines;
    for (std::string sLine; std::getline(file, sLine);)
        lines.push_back(sLine);
    return lines;
}

class SystemCall : public testing::Test {
protected:
    void SetUp() override {
        if (*KELVO_STRACE == '\0' ||
            run_command(traced("/dev/null", {}, {"-h"}), traced_setup()).status != 0)
            GTEST_SKIP() << "strace is not there or may not trace";
    }
};

// ---------------------------------------------------- one call on one file

enum part : unsigned { NOTHING = 0, SECOND_FILE = 2, BOTH_FILES = 3 };

/// One failing call on the first trace file, or on the template file.
struct failing_call {
    const char* pCall;
    const char* pError;
    int iWhen; ///< its number among the calls on that file, per thread
    part whole = BOTH_FILES;
    int status = 0;
    const char* pOut = ""; ///< what standard output contains
    const char* pErr = ""; ///< what standard error is; the name of the first file for "FILE"
    bool bTemplate = false;
    std::vector<std::string> options{};
};

constexpr char STAT[] = "?fstat,?newfstatat,?statx";
constexpr char IN_USE[] = "2625-161 Trace file \"FILE\" is already in use.\n";
constexpr char MARKER[] = "\t[INSUFFICIENT MEMORY TO PROCESS]\n";
constexpr char NO_MEMORY[] = "WARNING: Insufficient memory (size=1048576) to process: FILE\n"
                             "Total insufficient memory warning messages: 1\n"
                             "Total insufficient memory warning messages during file open: 1\n";
constexpr char NOT_MAPPED[] = "2625-180 Either file permissions are too restrictive, or the trace "
                              "file must be copied outside of NFS to be used.\n ";

// A second time on the file: when its turn to be read has come.
const failing_call FAILING_CALLS[] = {
    {"?access,?faccessat", "EACCES", 1, NOTHING, 1, "",
     "2625-101 Filename \"FILE\" is not accessible, Permission denied\n"},
    {"openat", "EMFILE", 1, SECOND_FILE, 1, "",
     "2625-102 Error opening file \"FILE\", Too many open files\n"},
    {"openat", "ENOENT", 2, SECOND_FILE, 0, "",
     "2625-102 Error opening file \"FILE\", No such file or directory\n"},
    {"fcntl", "EAGAIN", 1, SECOND_FILE, 1, IN_USE},
    {"fcntl", "EACCES", 2, SECOND_FILE, 0, IN_USE},
    {"fcntl", "ENOLCK", 1, SECOND_FILE, 1, "",
     "2625-162 Error returned from fcntl() attempting to lock trace file,  No locks available\n"},
    {STAT, "EIO", 1, SECOND_FILE, 1, "",
     "2625-104 Error retrieving information about file \"FILE\",  Input/output error\n"},
    {"mmap", "ENOMEM", 1, SECOND_FILE, 1, MARKER, NO_MEMORY},
    {"mmap", "EAGAIN", 2, SECOND_FILE, 0, MARKER, NO_MEMORY},
    {"mmap", "EACCES", 1, SECOND_FILE, 1, NOT_MAPPED},
    {"close", "EIO", 1},
    {"close", "EINTR", 1},
    {"utimensat", "EPERM", 1},
    {"openat", "EMFILE", 1, BOTH_FILES, 0, "", "", true},
    {"openat", "EACCES", 1, BOTH_FILES, 0, "", "", true, {"-l"}},
    {STAT, "EIO", 1, BOTH_FILES, 0, "", "", true},
    {"read", "EIO", 1, BOTH_FILES, 0, "", "", true},
    {"read", "EINTR", 1, BOTH_FILES, 0, "", "", true, {"-l"}},
};

std::string with_name(std::string sText, const std::string& sName) {
    if (const size_t uAt = sText.find("FILE"); uAt != std::string::npos)
        sText.replace(uAt, 4, sName);
    return sText;
}

/// Descriptors opened on the file less those closed; one whose close was made
/// to fail counts as closed.
int left_open(const std::vector<std::string>& log) {
    int iOpen = 0;
    for (const std::string& sLine : log) {
        iOpen += sLine.find("openat(") != sLine.npos && sLine.find(" = -1") == sLine.npos;
        iOpen -= sLine.find("close(") != sLine.npos;
    }
    return iOpen;
}

TEST_F(SystemCall, OnAFileMayFail) {
    sweep_faults(
        std::size(FAILING_CALLS),
        [](size_t uCase, const fault_sample& sample) {
            const failing_call& call = FAILING_CALLS[uCase];
            const std::string sCall = call.pCall;
            const std::string sFile = call.bTemplate ? sample.sTemplates : sample.files[0];
            const std::string sInject =
                "inject=" + sCall + ":error=" + call.pError + ":when=" + std::to_string(call.iWhen);
            return fault_run{
                traced(log_of(sample),
                       {"-f", "-P", sFile, "-e", "trace=openat,close," + sCall, "-e", sInject},
                       sample.arguments(call.options)),
                traced_setup()};
        },
        [](size_t uCase, const fault_sample& sample, const command_result& result) {
            const failing_call& call = FAILING_CALLS[uCase];
            SCOPED_TRACE(std::string(call.pCall) + " " + call.pError + " " +
                         std::to_string(call.iWhen));
            sample.expect_honest(result);
            EXPECT_EQ(result.status, call.status);
            EXPECT_EQ(sample.is_whole(0, result.sOut), (call.whole & 1U) != 0);
            EXPECT_EQ(sample.is_whole(1, result.sOut), (call.whole & 2U) != 0);
            EXPECT_THAT(result.sOut, HasSubstr(with_name(call.pOut, sample.files[0])));
            std::string sErr = with_name(call.pErr, sample.files[0]);
            if (sErr.starts_with("2625-"))
                sErr.insert(0, std::string(KELVO_PROGRAM) + ": ");
            EXPECT_EQ(result.sErr, sErr);

            const std::vector<std::string> log = read_lines(log_of(sample));
            EXPECT_THAT(log, testing::Contains(HasSubstr("INJECTED")));
            EXPECT_EQ(left_open(log), 0) << "a descriptor was left open";
            return true;
        });
}

// ---------------------------------------------------- calls, counted over all

/// A call that fails once: the first, then in the next run the second, and so on,
/// counted from the beginning of the program itself, in each thread. munmap is
/// tried on the two files alone: the C library itself ends a process that cannot
/// release the stack of a thread.
const char* const COUNTED_CALLS[] = {
    "mmap:ENOMEM",         "munmap:ENOMEM",   "mprotect:ENOMEM",
    "brk:ENOMEM",          "clone3:EAGAIN",   "rt_sigprocmask:EINVAL",
    "rt_sigaction:EINVAL", "write:ENOSPC",    "write:EINTR",
    "write:EAGAIN",        "write:EIO",       "ppoll:EINTR",
    "ppoll:ENOMEM",        "poll:EINTR",      "clock_nanosleep:EINTR",
    "getcwd:ENOENT",       "getdents64:EIO",  "newfstatat:EIO",
    "lseek:ESPIPE",        "ioctl:ENOTTY",    "openat:EMFILE",
    "openat:ENFILE",       "openat:EINTR",    "close:EINTR",
    "fcntl:EINTR",         "utimensat:EROFS", "read:EIO",
    "sched_yield:EINVAL",  "madvise:EINVAL",  "prctl:EINVAL"};

struct counted_run {
    std::string sCall;
    std::string sError;
    size_t uNumber;
};

std::vector<counted_run> counted_runs() {
    std::vector<counted_run> runs;
    for (const std::string sEach : COUNTED_CALLS) {
        const std::string sCall = sEach.substr(0, sEach.find(':'));
        for (size_t uNumber = 1; uNumber <= (sCall == "munmap" ? 2U : 5U); ++uNumber)
            runs.push_back({sCall, sEach.substr(sCall.size() + 1), uNumber});
    }
    return runs;
}

/// How often each call is made before `main`, whose first call opens /dev/null.
std::map<std::string, size_t> calls_before_main() {
    const fault_sample sample;
    run_command(traced(log_of(sample), {}, sample.arguments()), traced_setup());
    std::map<std::string, size_t> counts;
    for (const std::string& sLine : read_lines(log_of(sample))) {
        if (sLine.find("\"/dev/null\", O_RDONLY") != sLine.npos)
            return counts;
        ++counts[sLine.substr(0, sLine.find('('))];
    }
    ADD_FAILURE() << "the beginning of main was not found";
    return counts;
}

TEST_F(SystemCall, MayFailOnce) {
    if (SANITIZED)
        GTEST_SKIP() << "a sanitizer makes such calls itself and cannot do without";
    std::map<std::string, size_t> before = calls_before_main();
    const std::vector<counted_run> runs = counted_runs();
    sweep_faults(
        runs.size(),
        [&](size_t uRun, const fault_sample& sample) {
            const auto& [sCall, sError, uNumber] = runs[uRun];
            const std::string sWhen = std::to_string(before[sCall] + uNumber);
            std::vector<std::string> options{"-e", "trace=?" + sCall, "-e",
                                             "inject=?" + sCall + ":error=" + sError +
                                                 ":when=" + sWhen};
            if (sCall != "munmap")
                options.emplace_back("-f");
            command_setup setup = traced_setup();
            // A coverage build's own calls fail too: not on the counters that all runs share.
            setup.environment.push_back("GCOV_PREFIX=" + sample.dir.path());
            // A path of templates on which a relative directory comes first.
            return fault_run{traced("/dev/null", options,
                                    {uRun % 2 == 0 ? "-l" : "-k", "-t", ".:" + sample.dir.path(),
                                     sample.files[0], sample.files[1]}),
                             setup};
        },
        [&](size_t uRun, const fault_sample& sample, const command_result& result) {
            const auto& [sCall, sError, uNumber] = runs[uRun];
            SCOPED_TRACE(sCall + " " + sError + " " + std::to_string(uNumber));
            sample.expect_honest(result);
            if (sError == "EINTR" && sCall != "openat" && sCall != "fcntl") {
                EXPECT_TRUE(sample.is_whole(0, result.sOut) && sample.is_whole(1, result.sOut));
                EXPECT_EQ(result.status, 0);
            }
            return true;
        });
}

/// The main thread looks into a mapping when it opens the file, and only then:
/// it comes back from mapping to a file that has no pages any more.
TEST_F(SystemCall, AFileMayShrinkWhileItIsOpened) {
    for (const char* const pOption : {"-r", "-f", "-B"}) {
        const fault_sample sample;
        command_setup setup = traced_setup();
        setup.sDirectory = sample.dir.path(); // for a core file
        live_command kelvo(traced(log_of(sample),
                                  {"-f", "-P", sample.files[0], "-e", "trace=mmap", "-e",
                                   "inject=mmap:delay_exit=1500000:when=1"},
                                  {pOption, sample.files[0], sample.files[1]}),
                           setup);
        for (int i = 0; i < 60'000 && !is_locked(sample.files[0]); ++i)
            usleep(1000);
        usleep(300'000); // it is mapped right after it is locked
        ASSERT_EQ(truncate(sample.files[0].c_str(), 0), 0);
        const command_result result = kelvo.wait();
        EXPECT_EQ(result.signo, SIGBUS) << pOption << '\n' << result.sErr;
        EXPECT_EQ(result.sErr, "");
    }
}

/// A trace file that got the number of a closed standard output would be printed
/// into; usually /dev/null takes that number first.
TEST_F(SystemCall, ClosedOutputIsNeverATraceFile) {
    const temp_dir dir;
    const auto files = make_samples(dir.path(), {"-n", "1", "-r", "3000", "-p", "strings"});
    ASSERT_EQ(files.size(), 1U);
    const std::vector<std::byte> before = read_file(files[0]);
    const command_result result =
        run_command({"-f", "-qq", "-o", "/dev/null", "-P", "/dev/null", "-e", "trace=openat", "-e",
                     "inject=openat:error=ENOENT", "/bin/sh", "-c", "exec \"$0\" \"$@\" >&-",
                     KELVO_PROGRAM, files[0]},
                    traced_setup());
    expect_sound_end(result);
    EXPECT_EQ(result.status, 1);
    EXPECT_THAT(result.sErr, HasSubstr("2625-163"));
    expect_only_reader_words(before, read_file(files[0]));
}

} // namespace
