// Every system call of a run fails once, by strace: the documented message, the
// other file printed whole, no descriptor left open, the trace files untouched.
// Skipped where strace is not installed or processes may not be traced.
#include "faults_support.h"

#include <fstream>
#include <map>
#include <sstream>

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
    setup.environment = {sanitizer_option("ASAN_OPTIONS", "detect_leaks=0"),
                         sanitizer_option("TSAN_OPTIONS", "atexit_sleep_ms=0")};
    return setup;
}

bool can_trace() {
    if (std::string(KELVO_STRACE).empty())
        return false;
    static const bool bCan =
        run_command({"-qq", "-o", "/dev/null", KELVO_PROGRAM, "-h"}, traced_setup()).status == 0;
    return bCan;
}

std::string log_of(const fault_sample& sample) {
    return sample.directory() + "/calls";
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
        if (!can_trace())
            GTEST_SKIP() << "strace is not there or may not trace";
    }
};

// ---------------------------------------------------- one call on one file

enum class part : char { NOTHING, FIRST_FILE, SECOND_FILE, BOTH_FILES };

/// One failing call on the first trace file, or on the template file.
struct failing_call {
    const char* pCall;
    const char* pError;
    int iWhen; ///< its number among the calls on that file, per thread
    bool bTemplate = false;
    part whole = part::BOTH_FILES;
    int status = 0;
    const char* pOut = ""; ///< what standard output contains
    const char* pErr = ""; ///< what standard error is; the name of the first file for "FILE"
    std::vector<std::string> options{};
};

const failing_call FAILING_CALLS[] = {
    {.pCall = "?access,?faccessat",
     .pError = "EACCES",
     .iWhen = 1,
     .whole = part::NOTHING,
     .status = 1,
     .pErr = "2625-101 Filename \"FILE\" is not accessible, Permission denied\n"},
    {.pCall = "openat",
     .pError = "EMFILE",
     .iWhen = 1,
     .whole = part::SECOND_FILE,
     .status = 1,
     .pErr = "2625-102 Error opening file \"FILE\", Too many open files\n"},
    {.pCall = "openat", // when its turn to be read has come
     .pError = "ENOENT",
     .iWhen = 2,
     .whole = part::SECOND_FILE,
     .pErr = "2625-102 Error opening file \"FILE\", No such file or directory\n"},
    {.pCall = "fcntl",
     .pError = "EAGAIN",
     .iWhen = 1,
     .whole = part::SECOND_FILE,
     .status = 1,
     .pOut = "2625-161 Trace file \"FILE\" is already in use.\n"},
    {.pCall = "fcntl",
     .pError = "EACCES",
     .iWhen = 2,
     .whole = part::SECOND_FILE,
     .pOut = "2625-161 Trace file \"FILE\" is already in use.\n"},
    {.pCall = "fcntl",
     .pError = "ENOLCK",
     .iWhen = 1,
     .whole = part::SECOND_FILE,
     .status = 1,
     .pErr = "2625-162 Error returned from fcntl() attempting to lock trace file,  No locks "
             "available\n"},
    {.pCall = "?fstat,?newfstatat,?statx",
     .pError = "EIO",
     .iWhen = 1,
     .whole = part::SECOND_FILE,
     .status = 1,
     .pErr = "2625-104 Error retrieving information about file \"FILE\",  Input/output error\n"},
    {.pCall = "mmap",
     .pError = "ENOMEM",
     .iWhen = 1,
     .whole = part::SECOND_FILE,
     .status = 1,
     .pOut = "\t[INSUFFICIENT MEMORY TO PROCESS]\n",
     .pErr = "WARNING: Insufficient memory (size=1048576) to process: FILE\n"
             "Total insufficient memory warning messages: 1\n"
             "Total insufficient memory warning messages during file open: 1\n"},
    {.pCall = "mmap",
     .pError = "EAGAIN",
     .iWhen = 2,
     .whole = part::SECOND_FILE,
     .pOut = "\t[INSUFFICIENT MEMORY TO PROCESS]\n",
     .pErr = "WARNING: Insufficient memory (size=1048576) to process: FILE\n"
             "Total insufficient memory warning messages: 1\n"
             "Total insufficient memory warning messages during file open: 1\n"},
    {.pCall = "mmap",
     .pError = "EACCES",
     .iWhen = 1,
     .whole = part::SECOND_FILE,
     .status = 1,
     .pOut = "2625-180 Either file permissions are too restrictive, or the trace file must be "
             "copied outside of NFS to be used.\n "},
    {.pCall = "close", .pError = "EIO", .iWhen = 1},
    {.pCall = "close", .pError = "EINTR", .iWhen = 1},
    {.pCall = "utimensat", .pError = "EPERM", .iWhen = 1},
    {.pCall = "openat", .pError = "EMFILE", .iWhen = 1, .bTemplate = true},
    {.pCall = "openat", .pError = "EACCES", .iWhen = 1, .bTemplate = true, .options = {"-l"}},
    {.pCall = "?fstat,?newfstatat,?statx", .pError = "EIO", .iWhen = 1, .bTemplate = true},
    {.pCall = "read", .pError = "EIO", .iWhen = 1, .bTemplate = true},
    {.pCall = "read", .pError = "EINTR", .iWhen = 1, .bTemplate = true, .options = {"-l"}},
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
    fault_sweep{}.sweep(
        std::size(FAILING_CALLS),
        [](size_t uCase, const fault_sample& sample) {
            const failing_call& call = FAILING_CALLS[uCase];
            const std::string sCall = call.pCall;
            std::vector<std::string> arguments = {
                "-f",
                "-qq",
                "-o",
                log_of(sample),
                "-P",
                call.bTemplate ? sample.template_file() : sample.file(0),
                "-e",
                "trace=openat,close," + sCall,
                "-e",
                "inject=" + sCall + ":error=" + call.pError + ":when=" + std::to_string(call.iWhen),
                KELVO_PROGRAM};
            for (std::string& sArgument : sample.arguments(call.options))
                arguments.push_back(std::move(sArgument));
            return fault_sweep::run{std::move(arguments), traced_setup()};
        },
        [](size_t uCase, const fault_sample& sample, const command_result& result) {
            const failing_call& call = FAILING_CALLS[uCase];
            SCOPED_TRACE(std::string(call.pCall) + " " + call.pError + " " +
                         std::to_string(call.iWhen));
            sample.expect_honest(result);
            EXPECT_EQ(result.status, call.status);
            const auto whole = static_cast<unsigned>(call.whole);
            EXPECT_EQ(sample.is_whole(0, result.sOut), (whole & 1U) != 0);
            EXPECT_EQ(sample.is_whole(1, result.sOut), (whole & 2U) != 0);
            EXPECT_THAT(result.sOut, HasSubstr(with_name(call.pOut, sample.file(0))));
            std::string sErr = with_name(call.pErr, sample.file(0));
            if (sErr.starts_with("2625-"))
                sErr.insert(0, std::string(KELVO_PROGRAM) + ": ");
            EXPECT_EQ(result.sErr, sErr);

            const std::vector<std::string> log = read_lines(log_of(sample));
            EXPECT_THAT(log, testing::Contains(HasSubstr("INJECTED")));
            EXPECT_EQ(left_open(log), 0) << "a descriptor was left open";
        });
}

// ---------------------------------------------------- calls, counted over all

constexpr size_t TIMES = 5;

/// A call that fails once: the first, then in the next run the second, and so on,
/// counted from the beginning of the program itself, in each thread.
struct counted_call {
    const char* pCall;
    const char* pError;
    size_t uTimes = TIMES;
    bool bMainThreadOnly = false;
};

// munmap is tried on the two files alone: the C library itself ends a process
// that cannot release the stack of a thread.
constexpr counted_call COUNTED_CALLS[] = {
    {"mmap", "ENOMEM"},
    {"munmap", "ENOMEM", 2, true},
    {"mprotect", "ENOMEM"},
    {"brk", "ENOMEM"},
    {"clone3", "EAGAIN"},
    {"rt_sigprocmask", "EINVAL"},
    {"rt_sigaction", "EINVAL"},
    {"write", "ENOSPC"},
    {"write", "EINTR"},
    {"write", "EAGAIN"},
    {"write", "EIO"},
    {"ppoll", "EINTR"},
    {"ppoll", "ENOMEM"},
    {"poll", "EINTR"},
    {"clock_nanosleep", "EINTR"},
    {"getcwd", "ENOENT"},
    {"getdents64", "EIO"},
    {"newfstatat", "EIO"},
    {"lseek", "ESPIPE"},
    {"ioctl", "ENOTTY"},
    {"openat", "EMFILE"},
    {"openat", "ENFILE"},
    {"openat", "EINTR"},
    {"close", "EINTR"},
    {"fcntl", "EINTR"},
    {"utimensat", "EROFS"},
    {"read", "EIO"},
    {"sched_yield", "EINVAL"},
    {"madvise", "EINVAL"},
    {"prctl", "EINVAL"},
};

std::string all_calls() {
    std::string sCalls;
    for (const counted_call& call : COUNTED_CALLS)
        sCalls += std::string(sCalls.empty() ? "?" : ",?") + call.pCall;
    return sCalls;
}

/// How often each call is made before `main`, whose first call opens /dev/null.
std::map<std::string, size_t> calls_before_main() {
    const fault_sample sample;
    std::vector<std::string> arguments = {
        "-qq", "-o", log_of(sample), "-e", "trace=" + all_calls(), KELVO_PROGRAM};
    for (std::string& sArgument : sample.arguments())
        arguments.push_back(std::move(sArgument));
    run_command(arguments, traced_setup());
    std::map<std::string, size_t> counts;
    for (const std::string& sLine : read_lines(log_of(sample))) {
        if (sLine.find("\"/dev/null\", O_RDONLY") != sLine.npos)
            return counts;
        ++counts[sLine.substr(0, sLine.find('('))];
    }
    ADD_FAILURE() << "the beginning of main was not found";
    return counts;
}

/// A path of templates on which a relative directory comes first.
std::vector<std::string> counted_arguments(const fault_sample& sample, bool bPreload) {
    return {bPreload ? "-l" : "-k", "-t", ".:" + sample.directory(), sample.file(0),
            sample.file(1)};
}

TEST_F(SystemCall, MayFailOnce) {
    if (SANITIZED)
        GTEST_SKIP() << "a sanitizer makes such calls itself and cannot do without";
    std::map<std::string, size_t> before = calls_before_main();
    std::vector<std::pair<counted_call, size_t>> runs;
    for (const counted_call& call : COUNTED_CALLS)
        for (size_t uNumber = 1; uNumber <= call.uTimes; ++uNumber)
            runs.emplace_back(call, uNumber);
    fault_sweep{}.sweep(
        runs.size(),
        [&](size_t uRun, const fault_sample& sample) {
            const auto& [call, uNumber] = runs[uRun];
            const size_t uWhen = before[call.pCall] + uNumber;
            const std::string sCall = std::string("?") + call.pCall;
            std::vector<std::string> arguments = {"-qq", "-o", "/dev/null"};
            if (!call.bMainThreadOnly)
                arguments.push_back("-f");
            const std::string sInjection =
                sCall + ":error=" + call.pError + ":when=" + std::to_string(uWhen);
            arguments.insert(arguments.end(),
                             {"-e", "trace=" + sCall, "-e", "inject=" + sInjection, KELVO_PROGRAM});
            for (std::string& sArgument : counted_arguments(sample, uRun % 2 == 0))
                arguments.push_back(std::move(sArgument));
            return fault_sweep::run{std::move(arguments), traced_setup()};
        },
        [&](size_t uRun, const fault_sample& sample, const command_result& result) {
            const auto& [call, uNumber] = runs[uRun];
            SCOPED_TRACE(std::string(call.pCall) + " " + call.pError + " " +
                         std::to_string(uNumber));
            sample.expect_honest(result);
            const std::string sError = call.pError;
            if (sError == "EINTR" && std::string(call.pCall) != "openat" &&
                std::string(call.pCall) != "fcntl") {
                EXPECT_TRUE(sample.is_whole(0, result.sOut) && sample.is_whole(1, result.sOut));
                EXPECT_EQ(result.status, 0);
            }
        });
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
