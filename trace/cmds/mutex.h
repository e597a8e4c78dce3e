#pragma once

#include <pthread.h>

/// Tells the processor that a loop waits for another one.
inline void pause_processor() {
#if defined(__x86_64__) || defined(__i386__)
    __builtin_ia32_pause();
#elif defined(__aarch64__)
    asm volatile("yield");
#endif
}

/// Locks a mutex that is held for some microseconds as a rule: to sleep and to be
/// woken takes longer, so it is tried for up to some ten microseconds first.
inline void lock_mutex(pthread_mutex_t& mutex) {
    constexpr int TRIES = 100;
    constexpr int PAUSES = 8;
    for (int i = 0; i < TRIES; ++i) {
        if (pthread_mutex_trylock(&mutex) == 0)
            return;
        for (int j = 0; j < PAUSES; ++j)
            pause_processor();
    }
    pthread_mutex_lock(&mutex);
}

/// Holds a pthread mutex for the length of a scope.
class mutex_guard {
public:
    explicit mutex_guard(pthread_mutex_t& mutex) : m_mutex(mutex) {
        lock_mutex(m_mutex);
    }
    ~mutex_guard() {
        pthread_mutex_unlock(&m_mutex);
    }
    mutex_guard(const mutex_guard&) = delete;
    mutex_guard& operator=(const mutex_guard&) = delete;

private:
    pthread_mutex_t& m_mutex;
};

/// Makes a recursive mutex. Errors are ignored.
inline void trc_init_recursive_mutex(pthread_mutex_t* pMutex) {
    pthread_mutexattr_t attributes;
    pthread_mutexattr_init(&attributes);
    pthread_mutexattr_settype(&attributes, PTHREAD_MUTEX_RECURSIVE);
    pthread_mutex_init(pMutex, &attributes);
    pthread_mutexattr_destroy(&attributes);
}
