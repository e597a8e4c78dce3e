// Entry of the command: command line, run, end of standard output.

#include "cleanup.h"
#include "options.h"
#include "run.h"
#include "signals.h"
#include "stdout_stream.h"

#include <cstdlib>
#include <fcntl.h>
#include <unistd.h>

namespace {

/// Puts something on each standard descriptor that came closed, or the first
/// trace file would be opened on it, and text would go into that file. What
/// stands in cannot be written, so a closed standard output is still an error.
void occupy_standard_descriptors() {
    int fd;
    do {
        fd = open("/dev/null", O_RDONLY | O_CLOEXEC);
    } while (fd >= 0 && fd <= STDERR_FILENO);
    if (fd >= 0)
        close(fd);
}

/// Writes out what is still buffered and reports, once, what could not be
/// written. Returns the exit status.
int end_standard_output(int bError) {
    let_second_signal_through();
    stdout_flush();
    if (pending_signal() != 0)
        return 0;
    return stdout_report_loss() ? 1 : bError;
}

} // namespace

int main(int argc, char** argv) {
    occupy_standard_descriptors();
    command_line command;
    int bError;
    if (read_command_line(argc, argv, &command)) {
        bError = run(command);
    } else {
        bError = command.bError;
        cleanup(0);
    }
    bError = end_standard_output(bError);
    if (bReadersMayRun)
        _exit(bError); // no static object may be destroyed under a reader
    return bError;
}
