#include "reader/Folder.h"

#include <algorithm>

namespace clipfile {

std::vector<std::string> FilesIn(const std::filesystem::path& folder) {
    std::vector<std::string> files;
    std::error_code error;
    const auto options = std::filesystem::directory_options::skip_permission_denied;
    for (auto entry = std::filesystem::recursive_directory_iterator(folder, options, error);
         !error && entry != std::filesystem::recursive_directory_iterator(); entry.increment(error)) {
        std::error_code ignored;
        if (entry->path().extension() == ".MP4" && entry->is_regular_file(ignored)) {
            files.push_back(entry->path().string());
        }
    }
    std::sort(files.begin(), files.end());
    return files;
}

}  // namespace clipfile
