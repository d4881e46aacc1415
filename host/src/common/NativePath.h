#pragma once

#include <algorithm>
#include <string>

namespace receiver {

/// A path of the module as the system has it: each backslash is a slash, whoever wrote it.
inline std::string NativePath(std::string path) {
    std::replace(path.begin(), path.end(), '\\', '/');
    return path;
}

}  // namespace receiver
