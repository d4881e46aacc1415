#pragma once

#include <system_error>
#include <thread>

namespace clipfileModule {

/// Joins `thread` if it is joinable. Throws `std::system_error` (resource_deadlock_would_occur) on the thread
/// itself, which stays joinable then. `std::thread::join` does the same, but the thread sanitizer takes its
/// try for the join.
inline void JoinThread(std::thread& thread) {
    if (thread.get_id() == std::this_thread::get_id()) {
        throw std::system_error(std::make_error_code(std::errc::resource_deadlock_would_occur));
    }
    if (thread.joinable()) {
        thread.join();
    }
}

}  // namespace clipfileModule
