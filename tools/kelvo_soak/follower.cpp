#include "follower.h"

#include <charconv>
#include <csignal>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/wait.h>
#include <unistd.h>

namespace {

constexpr int PIPE_SIZE = 1 << 20;

/// In the child. A process group of its own: Ctrl-C is for kelvo_soak alone.
[[noreturn]] void become_kelvo(const char* const* argv, int outFd, const char* pErrors) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    setpgid(0, 0);
    dup2(outFd, STDOUT_FILENO);
    const int errFd = open(pErrors, O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC, 0600);
    dup2(errFd, STDERR_FILENO);
    execv(argv[0], const_cast<char* const*>(argv));
    perror(argv[0]);
    _exit(127);
}

} // namespace

void number_check::take_line(std::string_view line) {
    const size_t uSign = line.rfind('#');
    uint64_t uNumber = 0;
    const char* const pEnd = line.data() + line.size();
    if (uSign == line.npos || std::from_chars(line.data() + uSign + 1, pEnd, uNumber).ptr != pEnd ||
        uNumber == 0) {
        if (uPrinted != 0)
            ++uOther;
        return;
    }
    ++uPrinted;
    if (uNumber < uNext) {
        ++uOutOfOrder;
        return;
    }
    uMissing += uNumber - uNext;
    uNext = uNumber + 1;
}

void number_check::take(std::string_view text) {
    for (size_t uEnd; (uEnd = text.find('\n')) != text.npos; text.remove_prefix(uEnd + 1)) {
        if (m_sRest.empty()) {
            take_line(text.substr(0, uEnd));
        } else {
            m_sRest += text.substr(0, uEnd);
            take_line(m_sRest);
            m_sRest.clear();
        }
    }
    m_sRest += text;
}

follower::~follower() {
    if (m_pid > 0) {
        kill(m_pid, SIGKILL);
        waitpid(m_pid, nullptr, 0);
    }
    if (m_fd >= 0)
        close(m_fd);
}

bool follower::start(const std::string& sKelvo, const std::string& sDirectory,
                     const std::string& sPath, const std::string& sErrors) {
    const char* const argv[] = {sKelvo.c_str(),     "-f",          "-s",   "+1r", "-t",
                                sDirectory.c_str(), sPath.c_str(), nullptr};
    int fds[2];
    if (pipe2(fds, O_CLOEXEC) != 0) {
        perror("kelvo_soak: pipe");
        return false;
    }
    fcntl(fds[0], F_SETPIPE_SZ, PIPE_SIZE); // if it may; it does without
    m_fd = fds[0];
    m_pid = fork();
    if (m_pid == 0)
        become_kelvo(argv, fds[1], sErrors.c_str());
    if (m_pid < 0)
        perror("kelvo_soak: fork");
    close(fds[1]);
    return m_pid > 0;
}

bool follower::read(int iMilliseconds) {
    static char buffer[PIPE_SIZE];
    pollfd output{m_fd, POLLIN, 0};
    if (poll(&output, 1, iMilliseconds) == 0)
        return true;
    const ssize_t size = ::read(m_fd, buffer, sizeof buffer);
    if (size > 0)
        numbers.take({buffer, static_cast<size_t>(size)});
    return size > 0;
}

process_use follower::use() const {
    process_use result;
    const std::string sProcess = "/proc/" + std::to_string(m_pid);
    std::ifstream status(sProcess + "/status");
    for (std::string sLine; std::getline(status, sLine);) {
        if (sLine.starts_with("RssAnon:"))
            result.uPrivateKiB = strtoull(sLine.c_str() + strlen("RssAnon:"), nullptr, 10);
        if (sLine.starts_with("Threads:"))
            result.uThreads = strtoull(sLine.c_str() + strlen("Threads:"), nullptr, 10);
    }
    std::error_code error;
    for (std::filesystem::directory_iterator entry(sProcess + "/fd", error), end;
         !error && entry != end; entry.increment(error))
        ++result.uDescriptors;
    return result;
}

bool follower::end() {
    kill(m_pid, SIGINT);
    while (read(-1)) {
    }
    int state = 0;
    waitpid(m_pid, &state, 0);
    m_pid = -1;
    return WIFEXITED(state) && WEXITSTATUS(state) == 0;
}
