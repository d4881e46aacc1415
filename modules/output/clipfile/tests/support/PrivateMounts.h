#pragma once

#include <sched.h>
#include <sys/mount.h>

/// From here on what this thread, and the threads that it starts, mount is theirs alone and goes with them.
/// False where the process may not mount anything.
[[nodiscard]] inline bool UsePrivateMounts() {
    return unshare(CLONE_NEWNS) == 0 && mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) == 0;
}
