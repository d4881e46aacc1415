#include "platform/posix/SmbThreads.h"

#include <dlfcn.h>
#include <pthread.h>

#include <cerrno>
#include <new>

namespace clipfileModule {

namespace {

/// What `smbc_thread_impl` of libsmbclient.h takes, in its order. The header tells of that function and of
/// `smbc_thread_posix`; distributions leave both out of the library, and the one behind them in.
struct ThreadFunctions {
    int (*createMutex)(const char* name, void** mutex, const char* location);
    void (*destroyMutex)(void* mutex, const char* location);
    int (*lockMutex)(void* mutex, int type, const char* location);
    int (*createStorage)(const char* name, void** key, const char* location);
    void (*destroyStorage)(void** key, const char* location);
    int (*setStorage)(void* key, const void* value, const char* location);
    void* (*getStorage)(void* key, const char* location);
};

/// The other one is 1, to lock.
constexpr int kUnlock = 2;

int createMutex(const char* /*name*/, void** mutex, const char* /*location*/) {
    auto* const made = new (std::nothrow) pthread_mutex_t;
    if (made == nullptr) {
        return ENOMEM;
    }
    *mutex = made;
    return pthread_mutex_init(made, nullptr);
}

void destroyMutex(void* mutex, const char* /*location*/) {
    auto* const destroyed = static_cast<pthread_mutex_t*>(mutex);
    pthread_mutex_destroy(destroyed);
    delete destroyed;
}

int lockMutex(void* mutex, int type, const char* /*location*/) {
    auto* const locked = static_cast<pthread_mutex_t*>(mutex);
    return type == kUnlock ? pthread_mutex_unlock(locked) : pthread_mutex_lock(locked);
}

int createStorage(const char* /*name*/, void** key, const char* /*location*/) {
    auto* const made = new (std::nothrow) pthread_key_t;
    if (made == nullptr) {
        return ENOMEM;
    }
    *key = made;
    return pthread_key_create(made, nullptr);
}

void destroyStorage(void** key, const char* /*location*/) {
    auto* const destroyed = static_cast<pthread_key_t*>(*key);
    if (destroyed != nullptr) {
        pthread_key_delete(*destroyed);
        delete destroyed;
        *key = nullptr;
    }
}

int setStorage(void* key, const void* value, const char* /*location*/) {
    return pthread_setspecific(*static_cast<pthread_key_t*>(key), value);
}

void* getStorage(void* key, const char* /*location*/) {
    // The key is made by the first thread that stores something.
    return key == nullptr ? nullptr : pthread_getspecific(*static_cast<pthread_key_t*>(key));
}

constexpr ThreadFunctions kFunctions = {createMutex,    destroyMutex, lockMutex, createStorage,
                                        destroyStorage, setStorage,   getStorage};

template <typename Function>
Function find(void* handle, const char* name) {
    return reinterpret_cast<Function>(dlsym(handle, name));
}

}  // namespace

bool EnableSmbThreads(void* libsmbclient) {
    const auto set = find<int (*)(const ThreadFunctions*)>(libsmbclient, "smb_thread_set_functions");
    const auto* const inForce = static_cast<const void* const*>(dlsym(libsmbclient, "global_tfp"));
    const auto inUse = find<bool (*)()>(libsmbclient, "talloc_stackframe_exists");
    if (set == nullptr || inForce == nullptr || inUse == nullptr) {
        return false;
    }
    if (*inForce != nullptr) {
        // The host did it.
        return true;
    }
    // A host that has used them already has a stack of frames that is no thread's.
    return !inUse() && set(&kFunctions) == 0;
}

}  // namespace clipfileModule
