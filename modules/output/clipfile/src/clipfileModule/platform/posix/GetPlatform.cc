// By itself, so that a program of tests can have a system of its own.

#include "platform/posix/PosixPlatform.h"

namespace clipfileModule {

const PlatformInterface& GetPlatform() {
    static const PlatformInterface& platform = *new PosixPlatform;
    return platform;
}

}  // namespace clipfileModule
