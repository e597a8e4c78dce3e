// Calls that fail on request, for the tests of what a program does about it:
//   KELVO_FAIL_ALLOCATION=N    the Nth allocation, counted from 1
//   KELVO_FAIL_THREAD=N        the Nth thread creation
//   KELVO_FAIL_FROM_THEN_ON=1  and all of its kind after it
// The first failure is told on standard error, so that a test can see that
// there are no N calls of that kind.
//
// Preloaded, these functions stand before those of the C library. Linked into a
// program with --wrap, they take the program's own calls only.
#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstddef>
#include <cstdlib>
#include <dirent.h>
#include <dlfcn.h>
#include <new>
#include <pthread.h>
#include <unistd.h>

namespace {

struct failing_kind {
    std::atomic<long> iCalls{0};
    std::atomic<long> iFailAt{0}; // 0: never
};

failing_kind allocations;
failing_kind threads;
bool bFromThenOn = false;
std::atomic<bool> bTold{false};

long number_of(const char* pName) {
    const char* const pValue = getenv(pName);
    return pValue != nullptr ? strtol(pValue, nullptr, 10) : 0;
}

/// Nothing fails before the program itself begins.
__attribute__((constructor)) void take_requests() {
    bFromThenOn = getenv("KELVO_FAIL_FROM_THEN_ON") != nullptr;
    allocations.iCalls = 0;
    allocations.iFailAt = number_of("KELVO_FAIL_ALLOCATION");
    threads.iFailAt = number_of("KELVO_FAIL_THREAD");
}

/// Nor does anything behind its end: a coverage build writes its counters then.
void take_no_more() {
    allocations.iFailAt = 0;
    threads.iFailAt = 0;
}

bool fails(failing_kind& kind) {
    if (kind.iFailAt == 0)
        return false;
    static std::atomic<bool> bWatchesEnd{false};
    if (!bWatchesEnd.exchange(true))
        atexit(take_no_more);
    const long iCall = ++kind.iCalls;
    if (iCall < kind.iFailAt || (iCall > kind.iFailAt && !bFromThenOn))
        return false;
    if (!bTold.exchange(true)) {
        constexpr char TEXT[] = "[a call was made to fail]\n";
        (void)!write(STDERR_FILENO, TEXT, sizeof TEXT - 1);
    }
    errno = ENOMEM;
    return true;
}

using thread_body = void* (*)(void*);

} // namespace

#ifdef KELVO_WRAPPED_CALLS
#define OURS(name) __wrap_##name
#define REAL(name) __real_##name
#else
#define OURS(name) name
#define REAL(name) __libc_##name
#endif

// NAME becomes a call of the real function that fails as that one does.
#define FAILING(result, name, parameters, arguments)                                               \
    result REAL(name) parameters;                                                                  \
    result OURS(name) parameters;                                                                  \
    result OURS(name) parameters {                                                                 \
        return fails(allocations) ? nullptr : REAL(name) arguments;                                \
    }

extern "C" {
FAILING(void*, malloc, (size_t size), (size))
FAILING(void*, calloc, (size_t count, size_t size), (count, size))
FAILING(void*, realloc, (void* pBlock, size_t size), (pBlock, size))

#ifdef KELVO_WRAPPED_CALLS

FAILING(void*, aligned_alloc, (size_t alignment, size_t size), (alignment, size))
FAILING(char*, strdup, (const char* pText), (pText))
FAILING(DIR*, opendir, (const char* pName), (pName))
FAILING(void*, fdopen, (int fd, const char* pMode), (fd, pMode))
FAILING(void*, tsearch,
        (const void* pKey, void** ppRoot, int (*pCompare)(const void*, const void*)),
        (pKey, ppRoot, pCompare))
FAILING(void*, _ZnwmRKSt9nothrow_t, (size_t size, const std::nothrow_t& tag), (size, tag))
FAILING(void*, _ZnamRKSt9nothrow_t, (size_t size, const std::nothrow_t& tag), (size, tag))

int vasprintf(char** ppText, const char* pFormat, va_list args);
int __wrap_asprintf(char** ppText, const char* pFormat, ...);
int __wrap_asprintf(char** ppText, const char* pFormat, ...) {
    if (fails(allocations))
        return -1;
    va_list args;
    va_start(args, pFormat);
    const int length = vasprintf(ppText, pFormat, args);
    va_end(args);
    return length;
}

int __real_pthread_create(pthread_t*, const pthread_attr_t*, thread_body, void*);
int __wrap_pthread_create(pthread_t*, const pthread_attr_t*, thread_body, void*);

#else

void* __libc_memalign(size_t alignment, size_t size);

void* aligned_alloc(size_t alignment, size_t size) {
    return fails(allocations) ? nullptr : __libc_memalign(alignment, size);
}

static int __libc_pthread_create(pthread_t* pId, const pthread_attr_t* pAttributes,
                                 thread_body body, void* pArgument) {
    static const auto create =
        reinterpret_cast<decltype(&pthread_create)>(dlsym(RTLD_NEXT, "pthread_create"));
    return create(pId, pAttributes, body, pArgument);
}

#endif

int OURS(pthread_create)(pthread_t* pId, const pthread_attr_t* pAttributes, thread_body body,
                         void* pArgument) {
    return fails(threads) ? EAGAIN : REAL(pthread_create)(pId, pAttributes, body, pArgument);
}
}
