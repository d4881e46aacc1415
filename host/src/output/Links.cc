#include "output/Links.h"

#include <filesystem>
#include <system_error>

namespace receiver {

bool LeadsOutOf(const std::string& folder, const std::string& path) {
    namespace fs = std::filesystem;
    std::error_code error;
    if (fs::is_symlink(fs::symlink_status(path, error)) && !fs::exists(path, error)) {
        return true;
    }
    const fs::path top = fs::weakly_canonical(folder, error);
    const fs::path place = error ? fs::path() : fs::weakly_canonical(path, error);
    // What cannot be looked at is told by who opens it.
    if (error) {
        return false;
    }
    const fs::path below = place.lexically_relative(top);
    return below.empty() || *below.begin() == "..";
}

}  // namespace receiver
