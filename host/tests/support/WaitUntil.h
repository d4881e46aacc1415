#pragma once

#include <chrono>
#include <functional>
#include <thread>

/// Gives the processor away until `condition` holds; false when it does not before a deadline that no healthy
/// test comes near. For conditions that nothing signals; where something does, wait on that.
[[nodiscard]] inline bool WaitUntil(const std::function<bool()>& condition) {
    const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
    while (!condition()) {
        if (std::chrono::steady_clock::now() > deadline) {
            return false;
        }
        std::this_thread::yield();
    }
    return true;
}
