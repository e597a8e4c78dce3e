#include "child.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <memory>
#include <stdexcept>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

constexpr size_t CHUNK = 256 * 1024;

struct pipe_ends {
    int reading = -1;
    int writing = -1;
};

pipe_ends make_pipe() {
    int ends[2];
    if (pipe2(ends, O_CLOEXEC) != 0)
        give_up("no pipe");
    return {ends[0], ends[1]};
}

/// Starts a program with `fd` as its standard output; closes `fd` here.
pid_t start(const command_words& words, int fd) {
    std::vector<char*> arguments;
    for (const std::string& sWord : words)
        arguments.push_back(const_cast<char*>(sWord.c_str()));
    arguments.push_back(nullptr);
    const pid_t pid = fork();
    if (pid == 0) {
        dup2(fd, STDOUT_FILENO);
        execv(arguments[0], arguments.data());
        _exit(127);
    }
    if (pid < 0)
        give_up("no process");
    close(fd);
    return pid;
}

void check_status(int status, const std::string& sProgram) {
    if (!WIFEXITED(status) || WEXITSTATUS(status) != 0)
        give_up(sProgram + " failed");
}

int open_target(output_target target, const std::string& sFile) {
    const bool bNull = target == output_target::NULL_DEVICE;
    const int fd =
        open(bNull ? "/dev/null" : sFile.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0644);
    if (fd < 0)
        give_up("cannot open " + sFile);
    return fd;
}

double seconds(const timeval& time) {
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_usec) / 1e6;
}

/// Reads what is there; 0 at the end.
size_t read_some(int fd, char* pBuffer, size_t uSize) {
    for (;;) {
        const ssize_t iRead = read(fd, pBuffer, uSize);
        if (iRead >= 0)
            return static_cast<size_t>(iRead);
        if (errno != EINTR)
            give_up("cannot read a pipe");
    }
}

std::string process_path(pid_t pid) {
    return "/proc/" + std::to_string(pid);
}

/// The number behind a name in a status file of /proc; 0 when there is none.
uint64_t status_field(const std::string& sPath, const std::string& sName) {
    std::ifstream status(sPath);
    for (std::string sLine; std::getline(status, sLine);)
        if (sLine.starts_with(sName))
            return strtoull(sLine.c_str() + sName.size(), nullptr, 10);
    return 0;
}

} // namespace

void give_up(const std::string& sWhy) {
    throw std::runtime_error(sWhy);
}

piped_child::piped_child(const command_words& words, const std::string& sFile) {
    const pipe_ends ends = sFile.empty()
                               ? make_pipe()
                               : pipe_ends{-1, open_target(output_target::REGULAR_FILE, sFile)};
    fd = ends.reading;
    pid = start(words, ends.writing);
}

piped_child::~piped_child() {
    if (pid > 0)
        terminate();
    if (fd >= 0)
        close(fd);
}

size_t piped_child::read(char* pBuffer, size_t uSize) {
    look();
    size_t uRead = 0;
    while (uRead < uSize) {
        const size_t uPart = read_some(fd, pBuffer + uRead, uSize - uRead);
        if (uPart == 0)
            break;
        uRead += uPart;
    }
    return uRead;
}

void piped_child::finish() {
    int status = 0;
    waitpid(pid, &status, 0);
    pid = -1;
    check_status(status, "a compared program");
}

void piped_child::terminate() {
    kill(pid, SIGTERM);
    waitpid(pid, nullptr, 0);
    pid = -1;
}

uint64_t piped_child::cpu_time() const {
    clockid_t clock{};
    timespec time{};
    if (clock_getcpuclockid(pid, &clock) != 0 || clock_gettime(clock, &time) != 0)
        give_up("no processor time of a child");
    return static_cast<uint64_t>(time.tv_sec) * 1'000'000'000 + static_cast<uint64_t>(time.tv_nsec);
}

void piped_child::look() {
    const std::string sStatus = process_path(pid) + "/status";
    uPrivate = std::max(uPrivate, 1024 * status_field(sStatus, "RssAnon:"));
    uThreads = std::max(uThreads, status_field(sStatus, "Threads:"));
}

uint64_t piped_child::waits() const {
    uint64_t uWaits = 0;
    for (const auto& thread : std::filesystem::directory_iterator(process_path(pid) + "/task"))
        uWaits += status_field(thread.path().string() + "/status", "voluntary_ctxt_switches:");
    return uWaits;
}

run_cost run_measured(const command_words& words, output_target target, const std::string& sFile) {
    using clock = std::chrono::steady_clock;
    const bool bPipe = target == output_target::PIPE;
    const pipe_ends ends = bPipe ? make_pipe() : pipe_ends{-1, open_target(target, sFile)};
    const auto begin = clock::now();
    const pid_t pid = start(words, ends.writing);
    if (bPipe) {
        const auto buffer = std::make_unique<char[]>(CHUNK);
        while (read_some(ends.reading, buffer.get(), CHUNK) != 0)
            ;
        close(ends.reading);
    }
    int status = 0;
    rusage usage{};
    wait4(pid, &status, 0, &usage);
    const std::chrono::duration<double> wall = clock::now() - begin;
    check_status(status, words[0]);
    return {wall.count(), seconds(usage.ru_utime) + seconds(usage.ru_stime),
            static_cast<double>(usage.ru_maxrss) * 1024, static_cast<double>(usage.ru_nvcsw)};
}

void run_quietly(const command_words& words) {
    run_measured(words, output_target::NULL_DEVICE, "");
}

comparison compare_outputs(const command_words& first, const command_words& second) {
    piped_child children[] = {piped_child(first), piped_child(second)};
    const auto buffers = std::make_unique<char[]>(2 * CHUNK);
    comparison result;
    size_t uRead = CHUNK;
    while (uRead == CHUNK) {
        uRead = children[0].read(&buffers[0], CHUNK);
        const size_t uOther = children[1].read(&buffers[CHUNK], CHUNK);
        if (uRead != uOther || memcmp(&buffers[0], &buffers[CHUNK], uRead) != 0)
            give_up("the outputs differ within " + std::to_string(CHUNK) + " bytes from byte " +
                    std::to_string(result.uBytes) + " on: " + first[0] + " and " + second[0]);
        result.uBytes += uRead;
    }
    for (size_t i = 0; i < 2; ++i) {
        children[i].finish();
        result.uPrivate[i] = children[i].private_memory();
        result.uThreads[i] = children[i].threads();
    }
    return result;
}
