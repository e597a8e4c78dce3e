// The stream against descriptors that take text slowly, partly or not at all.
#include "stdout_stream.h"

#include <gtest/gtest.h>

#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <string>
#include <sys/wait.h>
#include <termios.h>
#include <thread>
#include <unistd.h>

namespace {

std::string read_all(int fd) {
    std::string all;
    char buffer[1000];
    for (ssize_t size; (size = read(fd, buffer, sizeof buffer)) > 0;)
        all.append(buffer, static_cast<size_t>(size));
    return all;
}

TEST(StdoutStream, LosesNothingOnASlowPipeThatDoesNotBlock) {
    int fds[2];
    ASSERT_EQ(pipe(fds), 0);
    ASSERT_EQ(fcntl(fds[1], F_SETFL, O_NONBLOCK), 0);
    std::string expected;
    std::string received;
    std::thread reader([&] { received = read_all(fds[0]); });
    const int savedFd = dup(STDOUT_FILENO);
    dup2(fds[1], STDOUT_FILENO);
    close(fds[1]);
    stdout_reset();
    for (int i = 0; i < 40000; i++) {
        const std::string line = std::to_string(i) + "\n";
        const std::string blanks(static_cast<size_t>(i % 50), ' ');
        expected += line + "." + blanks;
        stdout_write(line);
        stdout_put('.');
        stdout_fill(' ', blanks.size());
    }
    const std::string big(300000, 'b');
    expected += big;
    stdout_write(big);
    EXPECT_FALSE(stdout_is_empty());
    stdout_flush();
    EXPECT_TRUE(stdout_is_empty());
    EXPECT_EQ(stdout_error(), 0);
    dup2(savedFd, STDOUT_FILENO); // closes the pipe for the reader
    close(savedFd);
    reader.join();
    close(fds[0]);
    EXPECT_TRUE(received == expected);
}

// A child in the background of a terminal that stops background output: its
// first write is refused with SIGTTOU, which its handler only notes. Lines must
// then still appear, each when it is complete.
int write_in_background(int terminal) {
    alarm(20); // ends a child that is refused for ever
    struct sigaction action {};
    action.sa_handler = [](int) {};
    sigaction(SIGTTOU, &action, nullptr);
    setpgid(0, 0);
    dup2(terminal, STDOUT_FILENO);
    stdout_reset();
    stdout_write("one\ntw");
    stdout_put('o');
    stdout_put('\n');
    return stdout_is_empty() ? stdout_error() : -1;
}

int lead_session(const char* pTerminal) {
    alarm(30);
    setsid();
    const int terminal = open(pTerminal, O_RDWR);
    termios settings{};
    if (terminal < 0 || tcgetattr(terminal, &settings) != 0)
        return 1;
    settings.c_lflag |= TOSTOP;
    settings.c_oflag &= ~static_cast<tcflag_t>(OPOST);
    tcsetattr(terminal, TCSANOW, &settings);
    const pid_t background = fork();
    if (background == 0)
        _exit(write_in_background(terminal));
    int status = 0;
    waitpid(background, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : 2;
}

TEST(StdoutStream, ShowsLinesOnATerminalEvenFromTheBackground) {
    const int master = posix_openpt(O_RDWR | O_NOCTTY);
    if (master < 0 || grantpt(master) != 0 || unlockpt(master) != 0)
        GTEST_SKIP() << "no pseudo-terminals here";
    const std::string name = ptsname(master);
    const pid_t leader = fork();
    ASSERT_GE(leader, 0);
    if (leader == 0)
        _exit(lead_session(name.c_str()));
    int status = 0;
    ASSERT_EQ(waitpid(leader, &status, 0), leader);
    EXPECT_TRUE(WIFEXITED(status) && WEXITSTATUS(status) == 0) << status;
    EXPECT_EQ(read_all(master), "one\ntwo\n");
    close(master);
}

} // namespace
