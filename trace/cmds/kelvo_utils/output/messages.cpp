#include "messages.h"

#include "write_all.h"

#include <algorithm>
#include <cstdarg>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <string_view>
#include <unistd.h>

namespace {

struct block_deleter {
    void operator()(char* pBlock) const {
        std::free(pBlock);
    }
};

// Writes the formatted text and `tail` to standard error in one piece. When
// memory for a long text runs out, the part that fits without is written.
__attribute__((format(printf, 1, 0))) void write_error_text(const char* pFormat, va_list args,
                                                            std::string_view tail) {
    char local[4096];
    va_list again;
    va_copy(again, args);
    const int result = std::vsnprintf(local, sizeof local, pFormat, args);
    size_t length = result > 0 ? static_cast<size_t>(result) : 0;

    char* pText = local;
    std::unique_ptr<char, block_deleter> block;
    if (const size_t size = length + tail.size() + 1; size > sizeof local) {
        block.reset(static_cast<char*>(std::malloc(size)));
        if (block != nullptr) {
            pText = block.get();
            std::vsnprintf(pText, length + 1, pFormat, again);
        } else {
            tail = tail.substr(0, sizeof local / 2);
            length = std::min(length, sizeof local - tail.size() - 1);
        }
    }
    va_end(again);
    tail.copy(pText + length, tail.size());
    write_all(STDERR_FILENO, {pText, length + tail.size()});
}

} // namespace

void output_err_message(const char* pMsg, ...) {
    va_list args;
    va_start(args, pMsg);
    write_error_text(pMsg, args, "\n");
    va_end(args);
}

void output_sys_message(const char* pMsg, int syserr, ...) {
    char buffer[1024];
    char tail[sizeof buffer + 2];
    const int length =
        std::snprintf(tail, sizeof tail, " %s\n", strerror_r(syserr, buffer, sizeof buffer));
    va_list args;
    va_start(args, syserr);
    write_error_text(pMsg, args, {tail, std::min(static_cast<size_t>(length), sizeof tail - 1)});
    va_end(args);
}

void output_err_text(const char* pFormat, ...) {
    va_list args;
    va_start(args, pFormat);
    write_error_text(pFormat, args, {});
    va_end(args);
}
