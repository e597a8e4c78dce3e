#pragma once

/// Counts one processed file and redraws the progress line on standard error
/// when its whole percent has grown. Does nothing without -i. Returns 0.
/// Called by the main thread before any reader runs, then with priorityQmutex
/// held.
int kelvo_progress_status();
