#pragma once

#include <stdlib.h>

#include <filesystem>
#include <string>
#include <system_error>

/// A folder that goes with the process.
class TemporaryFolder {
 public:
    explicit TemporaryFolder(const std::filesystem::path& parent = std::filesystem::temp_directory_path()) {
        std::string name = (parent / "fuzz.XXXXXX").string();
        if (mkdtemp(name.data()) == nullptr) {
            __builtin_trap();
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
    void Clear() const {
        for (const auto& entry : std::filesystem::directory_iterator(path_)) {
            std::filesystem::remove_all(entry);
        }
    }

 private:
    std::filesystem::path path_;
};
