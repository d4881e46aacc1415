#include "support/FailingThreads.h"

#include <dlfcn.h>
#include <pthread.h>

#include <atomic>
#include <cerrno>

namespace {

/// Starts until the one that fails; 0 or less for none, or none any more.
std::atomic<int> startsLeft = 0;
std::atomic<bool> failed = false;

}  // namespace

extern "C" int pthread_create(pthread_t* thread, const pthread_attr_t* attributes, void* (*body)(void*),
                              void* argument) noexcept {
    using Create = int (*)(pthread_t*, const pthread_attr_t*, void* (*)(void*), void*);
    static const auto create = reinterpret_cast<Create>(dlsym(RTLD_NEXT, "pthread_create"));
    if (startsLeft > 0 && --startsLeft == 0) {
        failed = true;
        return EAGAIN;
    }
    return create(thread, attributes, body, argument);
}

FailingThreads::FailingThreads(int number) {
    failed = false;
    startsLeft = number;
}

FailingThreads::~FailingThreads() {
    startsLeft = 0;
}

bool FailingThreads::HasFailed() const {
    return failed;
}
