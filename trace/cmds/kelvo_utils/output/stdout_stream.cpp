#include "stdout_stream.h"

#include "kelvo.h"
#include "messages.h"
#include "write_all.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <unistd.h>

namespace {

constexpr size_t BUFFER_SIZE = 64 * 1024; // what a pipe takes in one piece

enum class terminal_state { UNKNOWN, NO, YES };

struct {
    size_t uUsed = 0; // always below BUFFER_SIZE between calls
    int iError = 0;
    bool bErrorReported = false;
    terminal_state terminal = terminal_state::UNKNOWN;
    alignas(4096) char pBuffer[BUFFER_SIZE];
} stream;

bool is_terminal() {
    if (stream.terminal == terminal_state::UNKNOWN) {
        const int savedErrno = errno;
        stream.terminal = isatty(STDOUT_FILENO) ? terminal_state::YES : terminal_state::NO;
        errno = savedErrno;
    }
    return stream.terminal == terminal_state::YES;
}

} // namespace

void stdout_put(char ch) {
    stream.pBuffer[stream.uUsed++] = ch;
    if (stream.uUsed == BUFFER_SIZE || (ch == '\n' && is_terminal()))
        stdout_flush();
}

void stdout_write(std::string_view text) {
    if (text.size() < BUFFER_SIZE - stream.uUsed && stream.terminal == terminal_state::NO)
        [[likely]] {
        std::memcpy(stream.pBuffer + stream.uUsed, text.data(), text.size());
        stream.uUsed += text.size();
        return;
    }
    const bool bLineEnds = is_terminal() && text.find('\n') != text.npos;
    while (!text.empty()) {
        const size_t size = std::min(text.size(), BUFFER_SIZE - stream.uUsed);
        std::memcpy(stream.pBuffer + stream.uUsed, text.data(), size);
        stream.uUsed += size;
        text.remove_prefix(size);
        if (stream.uUsed == BUFFER_SIZE)
            stdout_flush();
    }
    if (bLineEnds)
        stdout_flush();
}

void stdout_fill(char ch, size_t count) {
    if (count == 1) { // most often: the blank behind a record's prefix
        stdout_put(ch);
        return;
    }
    while (count > 0) {
        const size_t size = std::min(count, BUFFER_SIZE - stream.uUsed);
        std::memset(stream.pBuffer + stream.uUsed, ch, size);
        stream.uUsed += size;
        count -= size;
        if (stream.uUsed == BUFFER_SIZE)
            stdout_flush();
    }
}

char* stdout_begin_room(size_t count) {
    if (count >= BUFFER_SIZE - stream.uUsed)
        stdout_flush();
    return stream.pBuffer + stream.uUsed;
}

void stdout_end_room(const char* pEnd) {
    stream.uUsed = static_cast<size_t>(pEnd - stream.pBuffer);
}

void stdout_flush() {
    if (stream.iError == 0)
        stream.iError = write_all(STDOUT_FILENO, {stream.pBuffer, stream.uUsed});
    stream.uUsed = 0;
    if (anchor.bFollow)
        stdout_report_loss(); // the end may be days away
}

bool stdout_is_empty() {
    return stream.uUsed == 0;
}

int stdout_error() {
    return stream.iError;
}

bool stdout_report_loss() {
    if (stream.iError == 0 || stream.iError == EPIPE)
        return false;
    if (!stream.bErrorReported)
        output_sys_message("%s: 2625-163 Error writing standard output, ", stream.iError,
                           anchor.pProgName);
    stream.bErrorReported = true;
    return true;
}

void stdout_reset() {
    stream.uUsed = 0;
    stream.iError = 0;
    stream.bErrorReported = false;
    stream.terminal = terminal_state::UNKNOWN;
}
