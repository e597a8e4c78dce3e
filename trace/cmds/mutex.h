#pragma once

#include <pthread.h>

/// Holds a pthread mutex for the length of a scope.
class mutex_guard {
public:
    explicit mutex_guard(pthread_mutex_t& mutex) : m_mutex(mutex) {
        pthread_mutex_lock(&m_mutex);
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
