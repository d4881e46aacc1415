#pragma once

#include <stdlib.h>

#include <algorithm>
#include <filesystem>
#include <stdexcept>
#include <string>
#include <system_error>

/// A directory of one test, removed with all that is in it at the end.
class TempDir {
 public:
    TempDir() {
        std::string name = (std::filesystem::temp_directory_path() / "clipfile.XXXXXX").string();
        if (mkdtemp(name.data()) == nullptr) {
            throw std::runtime_error("no temporary directory");
        }
        path_ = name;
    }
    ~TempDir() {
        std::error_code ignored;
        std::filesystem::remove_all(path_, ignored);
    }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    const std::filesystem::path& Path() const { return path_; }
    /// As the module's settings hold it: separated by backslashes.
    std::string ModulePath() const {
        std::string path = path_.string();
        std::replace(path.begin(), path.end(), '/', '\\');
        return path;
    }

 private:
    std::filesystem::path path_;
};
