#include "handover.h"

#include "kelvo.h"
#include "mutex.h"
#include "sink.h"
#include "stdout_stream.h"

#include <atomic>
#include <cstdlib>
#include <new>
#include <pthread.h>

namespace {

// One text that waits, in one block with its characters.
struct waiting_text {
    waiting_text* pNext;
    size_t uSize;

    char* text() {
        return reinterpret_cast<char*>(this + 1);
    }
};

pthread_mutex_t waiting_mutex = PTHREAD_MUTEX_INITIALIZER; // guards the list; taken last
waiting_text* pFirstWaiting = nullptr;
waiting_text** ppEndWaiting = &pFirstWaiting;
uint32_t uWaitingMarkers = 0;
std::atomic<bool> bAnyWaiting = false; // a look at both without the mutex

// What waited, taken over by the main thread.
struct taken_over {
    waiting_text* pFirst;
    uint32_t uMarkers;
};

taken_over take_all_waiting() {
    const mutex_guard guard(waiting_mutex);
    const taken_over taken{pFirstWaiting, uWaitingMarkers};
    pFirstWaiting = nullptr;
    ppEndWaiting = &pFirstWaiting;
    uWaitingMarkers = 0;
    bAnyWaiting.store(false, std::memory_order_relaxed);
    return taken;
}

} // namespace

bool owns_standard_output() {
    return anchor.threadId == pthread_t{} || pthread_equal(anchor.threadId, pthread_self()) != 0;
}

void hand_over_output(std::string_view text) {
    void* pBlock = std::malloc(sizeof(waiting_text) + text.size());
    if (pBlock == nullptr)
        return;
    auto* pWaiting = new (pBlock) waiting_text{nullptr, text.size()};
    text.copy(pWaiting->text(), text.size());

    const mutex_guard guard(waiting_mutex);
    *ppEndWaiting = pWaiting;
    ppEndWaiting = &pWaiting->pNext;
    bAnyWaiting.store(true, std::memory_order_relaxed);
}

void hand_over_marker() {
    const mutex_guard guard(waiting_mutex);
    uWaitingMarkers++;
    bAnyWaiting.store(true, std::memory_order_relaxed);
}

void write_handed_over_output() {
    if (!bAnyWaiting.load(std::memory_order_relaxed))
        return;
    output_abandon_rec(); // what is still open between two records was given up
    taken_over taken = take_all_waiting();
    while (waiting_text* pWaiting = taken.pFirst) {
        output_text({pWaiting->text(), pWaiting->uSize});
        taken.pFirst = pWaiting->pNext;
        std::free(pWaiting);
    }
    for (; taken.uMarkers > 0; taken.uMarkers--)
        stdout_write(insufficient_resources_warning_message_in_output_header);
    stdout_flush();
}
