#include "journal/UnfinishedFiles.h"

#include <gtest/gtest.h>

#include <fstream>

#include "support/TempDir.h"
#include "support/TestStream.h"

namespace receiver {
namespace {

namespace fs = std::filesystem;
using clipfile::Journal;
using clipfile::JournalFile;

class UnfinishedFilesTest : public ::testing::Test {
 protected:
    void Record(const std::string& name, bool close) const {
        fs::create_directories((folder_.Path() / name).parent_path());
        test_stream::Record(folder_.Path() / name, {"normal", clipfileModule::RecordRules::kExact, close},
                            test_stream::MakePlainStream(1));
    }
    /// The journal of a receiver that is gone, unless `holder` holds it.
    fs::path Leave(const std::vector<std::string>& files,
                   std::optional<JournalFile>* holder = nullptr) const {
        JournalFile file(folder_.Path());
        Journal journal;
        journal.files = files;
        file.Write(journal);
        const fs::path path = file.Path();
        if (holder != nullptr) {
            holder->emplace(std::move(file));
        }
        return path;
    }
    std::vector<std::string> Found() const {
        std::vector<std::string> names;
        for (const UnfinishedFiles& files : FindUnfinishedFiles(folder_.Path())) {
            for (const fs::path& path : files.Paths()) {
                names.push_back(path.lexically_relative(folder_.Path()).string());
            }
        }
        return names;
    }

    TempDir folder_;
};

using Names = std::vector<std::string>;

TEST_F(UnfinishedFilesTest, AreThoseOfAJournalThatNobodyHolds) {
    Record("20261121/CAM1/a.MP4", false);
    Record("20261121/CAM1/b.MP4", false);
    Record("20261121/CAM1/own.MP4", false);
    Leave({"20261121/CAM1/a.MP4"});
    std::optional<JournalFile> holder;
    Leave({"20261121/CAM1/b.MP4"}, &holder);
    EXPECT_EQ(Found(), Names{"20261121/CAM1/a.MP4"});
    holder.reset();
    EXPECT_EQ(Found().size(), 2U);
}

TEST_F(UnfinishedFilesTest, AreFoundByOneReceiverAlone) {
    Record("a.MP4", false);
    Leave({"a.MP4"});
    const auto first = FindUnfinishedFiles(folder_.Path());
    EXPECT_EQ(first.size(), 1U);
    EXPECT_TRUE(FindUnfinishedFiles(folder_.Path()).empty());
}

TEST_F(UnfinishedFilesTest, FilesThatAreClosedOrGoneLeaveTheJournal) {
    Record("a.MP4", true);
    Record("b.MP4", false);
    const fs::path journal = Leave({"a.MP4", "gone.MP4", "b.MP4"});
    EXPECT_EQ(Found(), Names{"b.MP4"});
    EXPECT_EQ(clipfile::ReadJournal(journal)->files, Names{"b.MP4"});
    fs::remove(folder_.Path() / "b.MP4");
    EXPECT_EQ(Found(), Names{});
    EXPECT_FALSE(fs::exists(journal));
}

TEST_F(UnfinishedFilesTest, WhatLiesOutsideOfTheFolderIsNotTouched) {
    const TempDir elsewhere;
    test_stream::Record(elsewhere.Path() / "a.MP4", {"normal", clipfileModule::RecordRules::kExact, false},
                        test_stream::MakePlainStream(1));
    fs::create_directory_symlink(elsewhere.Path(), folder_.Path() / "link");
    fs::create_symlink(elsewhere.Path() / "a.MP4", folder_.Path() / "b.MP4");
    Leave({"link/a.MP4", "b.MP4"});
    EXPECT_EQ(Found(), Names{});
    EXPECT_TRUE(fs::exists(elsewhere.Path() / "a.MP4"));
}

TEST_F(UnfinishedFilesTest, AJournalThatIsTornStaysAndIsNotFollowed) {
    Record("a.MP4", false);
    const fs::path journal = Leave({"a.MP4"});
    fs::resize_file(journal, fs::file_size(journal) / 2);
    std::ofstream(folder_.Path() / ".receiver-hostile.journal") << std::string(1'000'000, '[');
    EXPECT_EQ(Found(), Names{});
    EXPECT_TRUE(fs::exists(journal));
}

TEST_F(UnfinishedFilesTest, AFileThatIsForgottenIsNotFoundAgain) {
    Record("a.MP4", false);
    Record("b.MP4", false);
    const fs::path journal = Leave({"a.MP4", "b.MP4"});
    {
        auto found = FindUnfinishedFiles(folder_.Path());
        ASSERT_EQ(found.size(), 1U);
        found[0].Forget(folder_.Path() / "a.MP4");
    }
    EXPECT_EQ(Found(), Names{"b.MP4"});
    {
        auto found = FindUnfinishedFiles(folder_.Path());
        ASSERT_EQ(found.size(), 1U);
        found[0].Forget(folder_.Path() / "b.MP4");
    }
    EXPECT_FALSE(fs::exists(journal));
}

}  // namespace
}  // namespace receiver
