// Entry of the command: command line, run, end of standard output.

#include "cleanup.h"
#include "kelvo.h"
#include "messages.h"
#include "options.h"
#include "run.h"
#include "signals.h"
#include "stdout_stream.h"

#include <cerrno>
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
/// written. A reader of our pipe that has gone is no error. Returns the exit
/// status.
int end_standard_output(int bError) {
    stdout_flush();
    if (pending_signal() != 0)
        return 0;
    const int syserr = stdout_error();
    if (syserr == 0 || syserr == EPIPE)
        return bError;
    output_sys_message("%s: 2625-163 Error writing standard output, ", syserr, anchor.pProgName);
    return 1;
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
