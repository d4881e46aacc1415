// By itself, so that a program of tests can have a system of its own.

#include <new>

#include "platform/posix/PosixPlatform.h"

namespace clipfileModule {

const PlatformInterface& GetPlatform() {
    // In memory of the library, so that a host which unloads it gets all of it back.
    alignas(PosixPlatform) static unsigned char memory[sizeof(PosixPlatform)];
    static const PlatformInterface& platform = *new (memory) PosixPlatform;
    return platform;
}

}  // namespace clipfileModule
