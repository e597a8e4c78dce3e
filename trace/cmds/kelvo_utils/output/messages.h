// Messages and warnings to standard error. Each goes out in one write, so that
// lines of different threads do not run into each other. Any thread may call
// these; nothing is buffered.
#pragma once

/// The formatted message, then a newline.
void output_err_message(const char* pMsg, ...) __attribute__((format(printf, 1, 2)));

/// The formatted message, a blank, the system's text for the error number
/// `syserr`, a newline. The variable arguments belong to `pMsg`.
void output_sys_message(const char* pMsg, int syserr, ...) __attribute__((format(printf, 1, 3)));

/// The formatted text as it is: warnings and diagnostic lines bring their own
/// newline.
void output_err_text(const char* pFormat, ...) __attribute__((format(printf, 1, 2)));
