#pragma once

#include <sys/mount.h>

#include <cstdint>
#include <filesystem>
#include <iostream>
#include <string>

#include "support/FakePlatform.h"
#include "support/PrivateMounts.h"
#include "support/TempDir.h"

/// A file system of a given size: a tmpfs of its own. Where the test may not mount one, it is a directory
/// whose free space is worked out from what stands in it, and a line of the output says so.
class SmallFileSystem {
 public:
    /// The file system stands in `dir` until the object goes; `platform` tells its free space.
    SmallFileSystem(const TempDir& dir, std::uint64_t bytes, FakePlatform& platform)
        : path_(dir.Path() / "small"), modulePath_(dir.ModulePath() + "\\small"), bytes_(bytes) {
        std::filesystem::create_directory(path_);
        mounted_ = UsePrivateMounts() &&
                   mount("tmpfs", path_.c_str(), "tmpfs", 0, ("size=" + std::to_string(bytes)).c_str()) == 0;
        if (!mounted_) {
            std::cout << "no file system can be mounted here; its free space is made up" << std::endl;
        }
        platform.Set([this](FakePlatform::Hooks& hooks) {
            hooks.availableSpace = nullptr;
            if (!mounted_) {
                hooks.availableSpace = [this](const std::string&, std::uint64_t& available) {
                    available = Available();
                    return 0;
                };
            }
        });
    }
    ~SmallFileSystem() {
        if (mounted_) {
            umount(path_.c_str());
        }
    }
    SmallFileSystem(const SmallFileSystem&) = delete;
    SmallFileSystem& operator=(const SmallFileSystem&) = delete;

    const std::filesystem::path& Path() const { return path_; }
    const std::string& ModulePath() const { return modulePath_; }
    std::uint64_t Available() const {
        if (mounted_) {
            return std::filesystem::space(path_).available;
        }
        std::uint64_t used = 0;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(path_)) {
            used += entry.is_regular_file() ? entry.file_size() : 0;
        }
        return used < bytes_ ? bytes_ - used : 0;
    }

 private:
    const std::filesystem::path path_;
    const std::string modulePath_;
    const std::uint64_t bytes_;
    bool mounted_ = false;
};
