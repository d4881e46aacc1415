#include "recover/UnfinishedFiles.h"

#include <algorithm>
#include <exception>

#include "reader/Recording.h"

namespace clipfile {

namespace {

bool IsUnfinished(const std::filesystem::path& path) {
    try {
        return ReadRecording(InputFile(path)).completion == Completion::kUnfinished;
    } catch (const std::exception&) {
        return false;
    }
}

}  // namespace

std::vector<std::string> UnfinishedIn(const std::filesystem::path& folder) {
    std::vector<std::string> files;
    std::error_code error;
    const auto options = std::filesystem::directory_options::skip_permission_denied;
    for (auto entry = std::filesystem::recursive_directory_iterator(folder, options, error);
         entry != std::filesystem::recursive_directory_iterator(); entry.increment(error)) {
        if (entry->path().extension() == ".MP4" && entry->is_regular_file(error) &&
            IsUnfinished(entry->path())) {
            files.push_back(entry->path().string());
        }
    }
    std::sort(files.begin(), files.end());
    return files;
}

}  // namespace clipfile
