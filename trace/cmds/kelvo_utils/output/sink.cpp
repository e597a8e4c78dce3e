#include "sink.h"

#include "kelvo.h"
#include "stdout_stream.h"

namespace {

void indent() {
    if (anchor.curColumn < anchor.currentIndent) {
        stdout_fill(' ', static_cast<size_t>(anchor.currentIndent - anchor.curColumn));
        anchor.curColumn = anchor.currentIndent;
    }
}

// The prefix is written; the body begins at the column of its thread's level.
void open_body() {
    const int level = anchor.pCurThread != nullptr ? anchor.pCurThread->nestingLevel : 0;
    anchor.currentIndent = static_cast<int16_t>(anchor.headerIndent + 2 * level);
    indent();
    anchor.outputFlags &= static_cast<uint8_t>(~OUTPUT_START_PENDING);
}

// The body began with a pair of markers. An unbalanced return leaves the level
// at 0 and still sets the record off from what follows.
void apply_marker_pair(char marker) {
    thread_info* pThread = anchor.pCurThread;
    if (pThread == nullptr)
        return;
    if (marker == '>') {
        pThread->outputFlags |= THREAD_NEST_AFTER;
        return;
    }
    if (pThread->nestingLevel > 0)
        pThread->nestingLevel--;
    if (pThread->nestingLevel == 0)
        pThread->outputFlags |= THREAD_BLANK_LINE_AFTER;
}

// Handles a character while the start of the body is pending. Returns whether
// it is ordinary text that is still to be written.
bool start_body(char ch) {
    if (is_marker(ch) && anchor.firstChar == 0) {
        anchor.firstChar = ch;
        return false;
    }
    const char held = anchor.firstChar;
    anchor.firstChar = 0;
    if (ch == held && is_marker(ch)) {
        apply_marker_pair(ch);
        open_body();
        return false;
    }
    open_body();
    if (held != 0) {
        stdout_put(held);
        anchor.curColumn++;
    }
    return true;
}

} // namespace

void output_char(char ch) {
    if ((anchor.outputFlags & OUTPUT_START_PENDING) != 0 && !start_body(ch))
        return;
    if (ch == '\n')
        anchor.curColumn = 0;
    else if (anchor.curColumn == 0)
        indent();
    stdout_put(ch);
}

void output_text(std::string_view text) {
    while (!text.empty() && (anchor.outputFlags & OUTPUT_START_PENDING) != 0 &&
           !start_body(text.front()))
        text.remove_prefix(1);
    while (!text.empty()) {
        // A run is the rest of a line with its newline, or, where nothing is
        // indented, all the text up to its last newline.
        const size_t newline = anchor.currentIndent > 0 ? text.find('\n') : text.rfind('\n');
        const size_t size = newline == text.npos ? text.size() : newline + 1;
        if (anchor.curColumn == 0 && text.front() != '\n')
            indent();
        stdout_write(text.substr(0, size));
        if (newline != text.npos)
            anchor.curColumn = 0;
        text.remove_prefix(size);
    }
}

void output_begin_text() {
    if ((anchor.outputFlags & OUTPUT_START_PENDING) != 0)
        start_body(' ');
    if (anchor.curColumn == 0)
        indent();
}

void output_string(const char* pString) {
    if (pString != nullptr)
        output_text(pString);
}

void output_abandon_rec() {
    if (anchor.curColumn != 0) {
        stdout_put('\n');
        anchor.curColumn = 0;
    }
    anchor.outputFlags &= static_cast<uint8_t>(~OUTPUT_START_PENDING);
    anchor.firstChar = 0;
    anchor.headerIndent = 0;
    anchor.currentIndent = 0;
    anchor.pCurFile = nullptr;
    anchor.pCurThread = nullptr;
}
