#pragma once

#include <cstddef>
#include <filesystem>
#include <iterator>

/// Number of threads of this process.
inline std::size_t threadCount() {
    return static_cast<std::size_t>(std::distance(std::filesystem::directory_iterator("/proc/self/task"),
                                                  std::filesystem::directory_iterator()));
}
