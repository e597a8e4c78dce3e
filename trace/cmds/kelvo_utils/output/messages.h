// Numbered messages to standard error. Any thread may call these.
#pragma once

/// The formatted message, then a newline; flushed.
void output_err_message(const char* pMsg, ...) __attribute__((format(printf, 1, 2)));

/// The formatted message, a blank, the system's text for the error number
/// `syserr`, a newline; flushed. The variable arguments belong to `pMsg`.
void output_sys_message(const char* pMsg, int syserr, ...) __attribute__((format(printf, 1, 3)));
