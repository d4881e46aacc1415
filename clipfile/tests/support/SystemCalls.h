#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>

/// What happens in front of system calls of this test program. A hook that returns a number other than 0
/// makes the call fail with it.
struct SystemCallHooks {
    std::function<int()> flock;
    /// Only looks.
    std::function<void(int descriptor)> flockOf;
    std::function<int(int descriptor)> fsync;
    std::function<int()> renameWithFlags;
    /// Bytes that are free on each disk, instead of those that are.
    std::function<std::uint64_t()> availableBytes;
    /// Bytes that were asked of files.
    std::size_t bytesRead = 0;
};

/// Those of the test that runs. Only on its own thread.
SystemCallHooks& SystemCalls();

/// Takes the hooks away at the end of a test.
class SystemCallGuard {
 public:
    SystemCallGuard() { SystemCalls() = {}; }
    ~SystemCallGuard() { SystemCalls() = {}; }
    SystemCallGuard(const SystemCallGuard&) = delete;
    SystemCallGuard& operator=(const SystemCallGuard&) = delete;
};
