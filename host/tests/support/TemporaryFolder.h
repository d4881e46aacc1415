#pragma once

#include <stdlib.h>

#include <algorithm>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <system_error>
#include <vector>

namespace endtoend {

/// A folder of one test, removed with all that is in it at the end.
class TemporaryFolder {
 public:
    TemporaryFolder() {
        std::string name = (std::filesystem::temp_directory_path() / "receiver.XXXXXX").string();
        if (mkdtemp(name.data()) == nullptr) {
            throw std::runtime_error("no temporary folder");
        }
        path_ = name;
    }
    ~TemporaryFolder() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    TemporaryFolder(const TemporaryFolder&) = delete;
    TemporaryFolder& operator=(const TemporaryFolder&) = delete;

    const std::filesystem::path& Path() const { return path_; }

 private:
    std::filesystem::path path_;
};

/// Every recording below `folder`, in the order in which they were begun.
inline std::vector<std::filesystem::path> RecordingsIn(const std::filesystem::path& folder) {
    std::vector<std::filesystem::path> found;
    std::error_code error;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(folder, error)) {
        if (entry.is_regular_file() && entry.path().extension() == ".MP4") {
            found.push_back(entry.path());
        }
    }
    // The names are timecodes; a second file at the same one has a number behind it, and '(' sorts before
    // '.'.
    std::sort(found.begin(), found.end(), [](const auto& one, const auto& other) {
        const auto keyOf = [](const std::filesystem::path& path) {
            const std::string name = path.filename().string();
            return std::make_pair(name.substr(0, 11), name.size());
        };
        return keyOf(one) != keyOf(other) ? keyOf(one) < keyOf(other) : one < other;
    });
    return found;
}

}  // namespace endtoend
