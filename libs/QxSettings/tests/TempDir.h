#pragma once

#include <gtest/gtest.h>
#include <stdlib.h>

#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>

/// A folder of its own for each test, gone with it.
class TempDir {
 public:
    TempDir() : path_(::testing::TempDir() + "qx_settings_XXXXXX") {
        if (mkdtemp(path_.data()) == nullptr) {
            ADD_FAILURE() << "no temporary folder at " << path_;
        }
    }
    ~TempDir() { std::filesystem::remove_all(path_); }
    TempDir(const TempDir&) = delete;
    TempDir& operator=(const TempDir&) = delete;

    const std::string& Path() const { return path_; }

    /// Writes a file with exactly these bytes and gives its path.
    std::string Write(std::string_view bytes, const std::string& name = "settings.ini") const {
        const std::string path = path_ + "/" + name;
        std::ofstream file(path, std::ios::binary);
        file << bytes;
        file.close();
        EXPECT_TRUE(file.good()) << path;
        return path;
    }

 private:
    std::string path_;
};
