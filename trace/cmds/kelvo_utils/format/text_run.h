// Collects the pieces of a text, so that the sink sees long runs in place of
// single characters. Main thread only.
#pragma once

#include "format_plan.h"
#include "print.h"
#include "sink.h"

#include <algorithm>
#include <cstddef>
#include <cstring>
#include <string_view>

/// Passes what it is given to output_text, in order, at the latest when it goes.
class text_run {
public:
    text_run() = default;
    text_run(const text_run&) = delete;
    text_run& operator=(const text_run&) = delete;
    ~text_run() {
        flush();
    }

    void add(char ch) {
        if (uLength == sizeof(text))
            flush();
        text[uLength++] = ch;
    }

    void add(std::string_view piece) {
        if (piece.size() > sizeof(text) - uLength) {
            flush();
            if (piece.size() > sizeof(text)) {
                output_text(piece);
                return;
            }
        }
        if (!piece.empty())
            std::memcpy(text + uLength, piece.data(), piece.size());
        uLength += piece.size();
    }

    /// Adds a piece of a format, behind whose first byte PADDED_TEXT bytes can be
    /// read whatever its length is. Most are shorter and are copied in one go.
    void add_padded(std::string_view piece) {
        if (piece.size() > PADDED_TEXT || PADDED_TEXT > sizeof(text) - uLength) [[unlikely]] {
            add(piece);
            return;
        }
        std::memcpy(text + uLength, piece.data(), PADDED_TEXT);
        uLength += piece.size();
    }

    /// `uCount` times `ch`.
    void fill(char ch, size_t uCount) {
        while (uCount > 0) {
            if (uLength == sizeof(text))
                flush();
            const size_t uPart = std::min(uCount, sizeof(text) - uLength);
            std::memset(text + uLength, ch, uPart);
            uLength += uPart;
            uCount -= uPart;
        }
    }

    /// Room for `uCount` characters, at most MAX_ROOM, which the caller writes in
    /// place and then passes their end to end_room.
    char* begin_room(size_t uCount) {
        if (uCount > sizeof(text) - uLength)
            flush();
        return text + uLength;
    }
    void end_room(const char* pEnd) {
        uLength = static_cast<size_t>(pEnd - text);
    }
    static constexpr size_t MAX_ROOM = 512;

    /// Needed before anything else writes to the sink.
    void flush() {
        if (uLength > 0)
            output_text({text, uLength});
        uLength = 0;
    }

private:
    char text[MAX_ROOM]; ///< not set up: a record must not pay for what it does not use
    size_t uLength = 0;
};

/// A text of which only the first MAX_PRINTED_TEXT characters go out, as of one that
/// printf writes.
class kept_text {
public:
    explicit kept_text(text_run& run) : out(run) {}

    void add(std::string_view piece) {
        piece = piece.substr(0, uLeft);
        out.add(piece);
        uLeft -= piece.size();
    }

    void fill(char ch, int64_t iCount) {
        const size_t uCount = std::min(static_cast<size_t>(iCount), uLeft);
        out.fill(ch, uCount);
        uLeft -= uCount;
    }

private:
    text_run& out;
    size_t uLeft = MAX_PRINTED_TEXT;
};
