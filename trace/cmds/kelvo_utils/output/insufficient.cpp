#include "insufficient.h"

#include "handover.h"
#include "messages.h"
#include "stdout_stream.h"

#include <atomic>
#include <pthread.h>
#include <string_view>

namespace {

constexpr std::string_view insufficient_resources_warning_message_in_output_header =
    "\t[INSUFFICIENT MEMORY TO PROCESS]\n";

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
    pthread_mutex_lock(&insufficient_resources_mutex);
    output_err_text("WARNING: Insufficient memory (size=%ld) to process: %s\n",
                    static_cast<long>(size), pName);
    total_insufficient_resources_warning_messages++;
    pthread_mutex_unlock(&insufficient_resources_mutex);
}

void warn_insufficient_resources_during_open(const char* pName, int64_t size) {
    if (pName == nullptr)
        return;
    warn_insufficient_resources(pName, size);
    pthread_mutex_lock(&insufficient_resources_mutex);
    if (owns_standard_output()) {
        stdout_write(insufficient_resources_warning_message_in_output_header);
        stdout_flush();
    } else {
        hand_over_output(insufficient_resources_warning_message_in_output_header, true);
    }
    total_insufficient_resources_warning_messages_during_open++;
    pthread_mutex_unlock(&insufficient_resources_mutex);
}
