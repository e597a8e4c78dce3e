#include "run_command.h"

#include <array>
#include <cerrno>
#include <chrono>
#include <csignal>
#include <cstdlib>
#include <fcntl.h>
#include <fstream>
#include <poll.h>
#include <sys/prctl.h>
#include <sys/resource.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>

#include <gtest/gtest.h>

namespace {

constexpr int64_t TIMEOUT_MS = 120'000; // of each wait

int64_t now_ms() {
    using namespace std::chrono;
    return duration_cast<milliseconds>(steady_clock::now().time_since_epoch()).count();
}

void close_fd(int& fd) {
    if (fd >= 0)
        close(fd);
    fd = -1;
}

/// In the child.
[[noreturn]] void become_program(const command_setup& setup, const char* const* argv, int outFd,
                                 int errFd) {
    prctl(PR_SET_PDEATHSIG, SIGKILL);
    sigset_t none;
    sigemptyset(&none);
    sigprocmask(SIG_SETMASK, &none, nullptr);
    signal(SIGPIPE, SIG_DFL);
    for (const char* pName :
         {"NLSPATH", "KV_TR_TEMPLATE_PATH", "KELVO_USE_LOWMEM", "POSIXLY_CORRECT"})
        unsetenv(pName);
    std::vector<std::string> variables{"LC_ALL=C", "TZ=UTC0", sanitizer_option("TSAN_OPTIONS", "")};
    variables.insert(variables.end(), setup.environment.begin(), setup.environment.end());
    for (std::string& sVariable : variables)
        putenv(sVariable.data());
    const int inFd = open("/dev/null", O_RDONLY);
    if (!setup.sStdout.empty())
        outFd = open(setup.sStdout.c_str(), O_WRONLY | O_CREAT | O_APPEND, 0600);
    dup2(inFd, STDIN_FILENO);
    dup2(outFd, STDOUT_FILENO);
    dup2(errFd, STDERR_FILENO);
    if (setup.bStdoutClosed)
        close(STDOUT_FILENO);
    if (setup.sDirectory.empty() || chdir(setup.sDirectory.c_str()) == 0)
        execv(argv[0], const_cast<char* const*>(argv));
    _exit(127);
}

} // namespace

live_command::live_command(const std::vector<std::string>& arguments, const command_setup& setup)
    : m_sName(setup.sProgram) {
    std::vector<const char*> argv{setup.sProgram.c_str()};
    for (const std::string& sArgument : arguments) {
        argv.push_back(sArgument.c_str());
        m_sName += ' ' + sArgument;
    }
    argv.push_back(nullptr);
    int out[2] = {-1, -1};
    int err[2] = {-1, -1};
    if (pipe2(out, O_CLOEXEC) == 0 && pipe2(err, O_CLOEXEC) == 0) {
        if (setup.bStderrGone)
            close_fd(err[0]);
        m_pid = fork();
    }
    if (m_pid == 0)
        become_program(setup, argv.data(), out[1], err[1]);
    if (m_pid < 0)
        ADD_FAILURE() << "pipe2 or fork: " << errno;
    close_fd(out[1]);
    close_fd(err[1]);
    m_out.fd = out[0];
    m_err.fd = err[0];
}

live_command::~live_command() {
    if (m_pid > 0) {
        kill(m_pid, SIGKILL);
        waitpid(m_pid, nullptr, 0);
    }
    close_fd(m_out.fd);
    close_fd(m_err.fd);
}

void live_command::give_up(const char* pWhat) {
    ADD_FAILURE() << pWhat << ": " << m_sName << "\nstandard output: " << m_out.sText
                  << "\nstandard error: " << m_err.sText;
    if (m_pid > 0)
        kill(m_pid, SIGKILL);
    close_fd(m_out.fd);
    close_fd(m_err.fd);
}

/// Takes in what the program writes next. Returns false when both streams have
/// ended or the deadline has passed (the program is then killed).
bool live_command::receive(int64_t iDeadline) {
    std::array<stream*, 2> streams{&m_out, &m_err};
    std::array<pollfd, 2> fds{pollfd{m_out.fd, POLLIN, 0}, pollfd{m_err.fd, POLLIN, 0}};
    if (m_out.fd < 0 && m_err.fd < 0)
        return false;
    const int64_t iLeft = iDeadline - now_ms();
    if (iLeft <= 0 || poll(fds.data(), fds.size(), static_cast<int>(iLeft)) == 0) {
        give_up("timed out");
        return false;
    }
    for (size_t i = 0; i < streams.size(); ++i) {
        if (fds[i].revents == 0)
            continue;
        char buffer[65536];
        const ssize_t length = read(fds[i].fd, buffer, sizeof buffer);
        if (length > 0)
            streams[i]->sText.append(buffer, static_cast<size_t>(length));
        else
            close_fd(streams[i]->fd);
    }
    return true;
}

std::string live_command::read_line() {
    const int64_t iDeadline = now_ms() + TIMEOUT_MS;
    size_t uEnd;
    while ((uEnd = m_out.sText.find('\n')) == std::string::npos && m_out.fd >= 0)
        receive(iDeadline);
    std::string sLine = m_out.sText.substr(0, uEnd);
    m_out.sText.erase(0, uEnd == std::string::npos ? uEnd : uEnd + 1);
    return sLine;
}

std::string live_command::read_text() {
    const int64_t iDeadline = now_ms() + TIMEOUT_MS;
    while (m_out.sText.empty() && m_out.fd >= 0)
        receive(iDeadline);
    return std::exchange(m_out.sText, {});
}

std::string live_command::read_line_with(const std::string& sText) {
    while (m_out.fd >= 0 || !m_out.sText.empty()) {
        std::string sLine = read_line();
        if (sLine.find(sText) != std::string::npos)
            return sLine;
    }
    ADD_FAILURE() << "no line with \"" << sText << "\": " << m_sName
                  << "\nstandard error: " << m_err.sText;
    return "";
}

void live_command::wait_for_error(const std::string& sText) {
    const int64_t iDeadline = now_ms() + TIMEOUT_MS;
    while (m_err.sText.find(sText) == std::string::npos) {
        if (m_err.fd < 0) {
            ADD_FAILURE() << "standard error has no \"" << sText << "\": " << m_sName << '\n'
                          << m_err.sText;
            return;
        }
        receive(iDeadline);
    }
}

void live_command::send_signal(int signo) const {
    // An id of -1 would send it to every process there is.
    if (m_pid > 0)
        kill(m_pid, signo);
    else
        ADD_FAILURE() << m_sName << " does not run";
}

void live_command::close_output() {
    close_fd(m_out.fd);
}

command_result live_command::wait() {
    const int64_t iDeadline = now_ms() + TIMEOUT_MS;
    while (receive(iDeadline)) {
    }
    int state = -1;
    rusage usage{};
    while (m_pid > 0 && wait4(m_pid, &state, WNOHANG, &usage) == 0) {
        if (now_ms() > iDeadline)
            give_up("did not end");
        usleep(1000);
    }
    m_pid = -1;
    m_result.peakKiB = usage.ru_maxrss;
    if (WIFEXITED(state))
        m_result.status = WEXITSTATUS(state);
    if (WIFSIGNALED(state))
        m_result.signo = WTERMSIG(state);
    m_result.sOut = std::move(m_out.sText);
    m_result.sErr = std::move(m_err.sText);
    return m_result;
}

command_result run_command(const std::vector<std::string>& arguments, const command_setup& setup) {
    return live_command(arguments, setup).wait();
}

uint64_t setting(const char* pName, uint64_t uDefault) {
    const char* const pValue = getenv(pName);
    return pValue != nullptr && *pValue != '\0' ? strtoull(pValue, nullptr, 10) : uDefault;
}

std::string status_of(pid_t pid, const std::string& sName) {
    std::ifstream status("/proc/" + std::to_string(pid) + "/status");
    for (std::string sLine; std::getline(status, sLine);)
        if (sLine.starts_with(sName + ':'))
            return sLine.substr(sName.size() + 1);
    return "";
}

bool is_locked(const std::string& sPath) {
    const int fd = open(sPath.c_str(), O_RDWR | O_CLOEXEC);
    struct flock lock {};
    lock.l_type = F_WRLCK;
    lock.l_whence = SEEK_SET;
    EXPECT_EQ(fcntl(fd, F_GETLK, &lock), 0);
    close(fd);
    return lock.l_type != F_UNLCK;
}

std::string sanitizer_option(const std::string& sName, const std::string& sOption) {
    const char* const pInForce = getenv(sName.c_str());
    std::string sVariable = sName + '=' + (pInForce != nullptr ? pInForce : "") + ':' + sOption;
    // Otherwise each run of a thread sanitizer's program sleeps for a second at its end.
    return sName == "TSAN_OPTIONS" ? sVariable + ":atexit_sleep_ms=0" : sVariable;
}
