// One big buffer and one write loop.
#pragma once

#include <cerrno>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <memory>
#include <string_view>
#include <unistd.h>

class floor_output {
public:
    floor_output() : pBuffer(std::make_unique_for_overwrite<char[]>(SIZE)), pEnd(pBuffer.get()) {}
    floor_output(const floor_output&) = delete;
    floor_output& operator=(const floor_output&) = delete;
    ~floor_output() {
        flush();
    }

    /// Where the next `uSize` bytes are to be written.
    char* room(size_t uSize) {
        if (static_cast<size_t>(pBuffer.get() + SIZE - pEnd) < uSize) [[unlikely]] {
            flush();
            if (uSize > SIZE)
                abort();
        }
        return pEnd;
    }

    /// Takes what was written up to `pWritten`.
    void commit(char* pWritten) {
        pEnd = pWritten;
        if (pEnd - pBuffer.get() >= static_cast<std::ptrdiff_t>(FULL)) [[unlikely]]
            flush();
    }

    void write(std::string_view text) {
        commit(room(text.size()) + text.copy(pEnd, text.size()));
    }

private:
    // Small enough to stay in the second-level cache on its way to a pipe.
    static constexpr size_t FULL = 128 * 1024;
    static constexpr size_t SIZE = 8 * 1024 * 1024; // the rest is for one huge record

    void flush() {
        for (const char* pAt = pBuffer.get(); pAt != pEnd;) {
            const ssize_t iWritten = ::write(1, pAt, static_cast<size_t>(pEnd - pAt));
            if (iWritten < 0 && errno != EINTR) {
                perror("kelvo_floor: standard output");
                exit(1);
            }
            pAt += iWritten < 0 ? 0 : iWritten;
        }
        pEnd = pBuffer.get();
    }

    std::unique_ptr<char[]> pBuffer;
    char* pEnd;
};
