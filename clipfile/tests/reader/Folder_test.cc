#include "reader/Folder.h"

#include <gtest/gtest.h>

#include <fstream>

#include "support/AnotherUser.h"
#include "support/TempDir.h"

namespace clipfile {
namespace {

TEST(Folder, AFolderThatIsMissingIsToldWithTheReason) {
    const TempDir folder;
    const std::filesystem::path missing = folder.Path() / "missing";
    const FolderListing listing = FilesIn(missing);
    EXPECT_TRUE(listing.files.empty());
    EXPECT_EQ(listing.faults,
              std::vector<std::string>{missing.string() + " cannot be read: No such file or directory."});
}

TEST(Folder, AFolderThatIsDeniedIsToldAndTheOthersAreSearched) {
    namespace fs = std::filesystem;
    const TempDir folder;
    const fs::path denied = folder.Path() / "a";
    const fs::path open = folder.Path() / "b";
    fs::create_directory(denied);
    fs::create_directory(open);
    std::ofstream(open / "1.MP4") << "x";
    std::ofstream(open / "2.txt") << "x";
    fs::permissions(folder.Path(), fs::perms(0755));
    fs::permissions(denied, fs::perms::none);
    {
        const AnotherUser other;
        ASSERT_TRUE(other.IsOther());
        const FolderListing listing = FilesIn(folder.Path());
        EXPECT_EQ(listing.files, std::vector<std::string>{(open / "1.MP4").string()});
        EXPECT_EQ(listing.faults,
                  std::vector<std::string>{denied.string() + " cannot be read: Permission denied."});
    }
    fs::permissions(denied, fs::perms::owner_all);
}

}  // namespace
}  // namespace clipfile
