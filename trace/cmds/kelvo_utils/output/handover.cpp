#include "handover.h"

#include "kelvo.h"
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
    bool bStraight;

    char* text() {
        return reinterpret_cast<char*>(this + 1);
    }
};

pthread_mutex_t waiting_mutex = PTHREAD_MUTEX_INITIALIZER; // guards the list; taken last
waiting_text* pFirstWaiting = nullptr;
waiting_text** ppEndWaiting = &pFirstWaiting;
std::atomic<bool> bAnyWaiting = false; // a look at the list without the mutex

waiting_text* take_all_waiting() {
    pthread_mutex_lock(&waiting_mutex);
    waiting_text* pFirst = pFirstWaiting;
    pFirstWaiting = nullptr;
    ppEndWaiting = &pFirstWaiting;
    bAnyWaiting.store(false, std::memory_order_relaxed);
    pthread_mutex_unlock(&waiting_mutex);
    return pFirst;
}

} // namespace

bool owns_standard_output() {
    return anchor.threadId == pthread_t{} || pthread_equal(anchor.threadId, pthread_self()) != 0;
}

void hand_over_output(std::string_view text, bool bStraight) {
    void* pBlock = std::malloc(sizeof(waiting_text) + text.size());
    if (pBlock == nullptr)
        return;
    auto* pWaiting = new (pBlock) waiting_text{nullptr, text.size(), bStraight};
    text.copy(pWaiting->text(), text.size());

    pthread_mutex_lock(&waiting_mutex);
    *ppEndWaiting = pWaiting;
    ppEndWaiting = &pWaiting->pNext;
    bAnyWaiting.store(true, std::memory_order_relaxed);
    pthread_mutex_unlock(&waiting_mutex);
}

void write_handed_over_output() {
    if (!bAnyWaiting.load(std::memory_order_relaxed))
        return;
    output_abandon_rec(); // what is still open between two records was given up
    waiting_text* pWaiting = take_all_waiting();
    while (pWaiting != nullptr) {
        const std::string_view text{pWaiting->text(), pWaiting->uSize};
        if (pWaiting->bStraight) {
            stdout_write(text);
            stdout_flush();
        } else {
            output_text(text);
        }
        waiting_text* pNext = pWaiting->pNext;
        std::free(pWaiting);
        pWaiting = pNext;
    }
}
