#include "insufficient.h"

#include "handover.h"
#include "messages.h"
#include "mutex.h"
#include "stdout_stream.h"

#include <atomic>
#include <pthread.h>

namespace {

// Keeps each line together with its count; the lock taken last but for the
// handover's own.
pthread_mutex_t insufficient_resources_mutex = PTHREAD_MUTEX_INITIALIZER;
std::atomic<uint32_t> total_insufficient_resources_warning_messages = 0;
std::atomic<uint32_t> total_insufficient_resources_warning_messages_during_open = 0;

} // namespace

uint32_t insufficient_resources_warnings() {
    return total_insufficient_resources_warning_messages;
}

uint32_t insufficient_resources_warnings_during_open() {
    return total_insufficient_resources_warning_messages_during_open;
}

void warn_insufficient_resources(const char* pName, int64_t size) {
    if (pName == nullptr)
        return;
    const mutex_guard guard(insufficient_resources_mutex);
    output_err_text("WARNING: Insufficient memory (size=%ld) to process: %s\n",
                    static_cast<long>(size), pName);
    total_insufficient_resources_warning_messages++;
}

void warn_insufficient_resources_during_open(const char* pName, int64_t size) {
    if (pName == nullptr)
        return;
    warn_insufficient_resources(pName, size);
    const mutex_guard guard(insufficient_resources_mutex);
    if (owns_standard_output()) {
        stdout_write(insufficient_resources_warning_message_in_output_header);
        stdout_flush();
    } else {
        hand_over_marker();
    }
    total_insufficient_resources_warning_messages_during_open++;
}
