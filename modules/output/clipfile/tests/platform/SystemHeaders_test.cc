// The module meets the system in one place.

#include <gtest/gtest.h>

#include <cstddef>
#include <filesystem>
#include <fstream>
#include <regex>
#include <string>

namespace {

namespace fs = std::filesystem;

/// Headers of the C++ library and of Boost: no folder and no suffix, or Boost's folder.
bool isPortable(const std::string& header) {
    static const std::regex portable("[a-z0-9_]+|boost/.*\\.hpp");
    return std::regex_match(header, portable);
}

TEST(SystemHeaders, AreIncludedInTheFoldersOfThePlatformsAlone) {
    const fs::path root = CLIPFILE_MODULE_SOURCES;
    const std::regex include("\\s*#\\s*include\\s*<([^>]*)>.*");
    std::size_t outside = 0;
    std::size_t inside = 0;
    for (const fs::directory_entry& entry : fs::recursive_directory_iterator(root)) {
        const fs::path& path = entry.path();
        if (path.extension() != ".h" && path.extension() != ".cc") {
            continue;
        }
        const fs::path folder = path.lexically_relative(root).parent_path();
        const bool isPlatform = folder.parent_path().filename() == "platform";
        std::ifstream file(path);
        for (std::string line; std::getline(file, line);) {
            std::smatch match;
            if (!std::regex_match(line, match, include)) {
                continue;
            }
            if (isPlatform) {
                inside += isPortable(match[1]) ? 0 : 1;
                continue;
            }
            ++outside;
            EXPECT_TRUE(isPortable(match[1])) << path << ": " << line;
        }
    }
    // Of the module, and of its box library.
    EXPECT_GT(outside, 100u);
    EXPECT_GT(inside, 5u);
}

}  // namespace
