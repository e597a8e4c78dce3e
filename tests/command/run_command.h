// Runs a program for a test and captures what it does. A program that is not
// done in time is killed and fails the test; none outlives its test.
#pragma once

#include <string>
#include <sys/types.h>
#include <vector>

struct command_setup {
    std::string sProgram = KELVO_PROGRAM;

    /// "NAME=value" texts. Apart from these the program gets the environment of
    /// the test, without what would change kelvo's behaviour, in the C locale
    /// and with TZ=UTC0.
    std::vector<std::string> environment{};

    std::string sDirectory{}; ///< working directory; empty: the test's
    std::string sStdout{}; ///< file that standard output is added to, not captured; empty: captured
    bool bStdoutClosed = false; ///< the program starts without standard output
    bool bStderrGone = false;   ///< nobody reads standard error
};

struct command_result {
    std::string sOut;
    std::string sErr;
    int status = -1;  ///< exit status; -1 when a signal ended the program
    int signo = 0;    ///< that signal
    long peakKiB = 0; ///< most memory that was resident at once, mapped files included
};

/// A program that runs while the test goes on. Its output is read only by the
/// functions here: a program that writes much more than a pipe holds waits.
class live_command {
public:
    explicit live_command(const std::vector<std::string>& arguments,
                          const command_setup& setup = {});
    ~live_command();
    live_command(const live_command&) = delete;
    live_command& operator=(const live_command&) = delete;

    /// The next line of standard output without its newline; what is left when
    /// the output ends without one. Fails the test when nothing comes in time.
    std::string read_line();

    /// What standard output brings next, as much as has come; "" at its end.
    /// For long outputs. Fails the test when nothing comes in time.
    std::string read_text();

    /// Reads lines up to the first that contains `sText` and returns that line.
    /// Fails the test, and returns "", when the output ends before.
    std::string read_line_with(const std::string& sText);

    /// Waits until standard error contains `sText`.
    void wait_for_error(const std::string& sText);

    void send_signal(int signo) const;

    /// Closes the test's end of the program's standard output.
    void close_output();

    pid_t pid() const {
        return m_pid;
    }

    /// Waits for the end and returns all that was captured and not yet read.
    command_result wait();

private:
    struct stream {
        int fd = -1;
        std::string sText;
    };

    bool receive(int64_t iDeadline);
    void give_up(const char* pWhat);

    std::string m_sName;
    pid_t m_pid = -1;
    stream m_out;
    stream m_err;
    command_result m_result;
};

/// Runs the program to its end.
command_result run_command(const std::vector<std::string>& arguments,
                           const command_setup& setup = {});

/// A number from the environment, for runs longer than the usual ones.
uint64_t setting(const char* pName, uint64_t uDefault);

/// What /proc says of a process under a name such as "Threads"; "" when it has ended.
std::string status_of(pid_t pid, const std::string& sName);

/// Whether another process holds a lock on the file.
bool is_locked(const std::string& sPath);

/// "NAME=value" that adds an option to those of a sanitizer that are in force.
std::string sanitizer_option(const std::string& sName, const std::string& sOption);
