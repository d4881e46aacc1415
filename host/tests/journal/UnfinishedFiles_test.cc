#include "journal/UnfinishedFiles.h"

#include <gtest/gtest.h>

#include <fstream>
#include <map>

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
    /// Takes one journal at a time, as receivers do.
    std::vector<std::string> Found() const {
        std::vector<std::string> names;
        for (const fs::path& journal : clipfile::JournalsIn(folder_.Path())) {
            const auto files = UnfinishedFiles::Take(journal);
            for (const fs::path& path : files ? files->Paths() : std::vector<fs::path>()) {
                names.push_back(path.lexically_relative(folder_.Path()).string());
            }
        }
        return names;
    }
    std::string Sentence(const fs::path& journal) const {
        const auto files = UnfinishedFiles::Take(journal);
        return files && files->Obstacles().size() == 1 ? files->Obstacles()[0] : "";
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
    const fs::path journal = clipfile::JournalsIn(folder_.Path()).at(0);
    const auto first = UnfinishedFiles::Take(journal);
    EXPECT_TRUE(first);
    EXPECT_FALSE(UnfinishedFiles::Take(journal));
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
    const fs::path journal = Leave({"link/a.MP4", "b.MP4"});
    EXPECT_EQ(Found(), Names{});
    EXPECT_TRUE(fs::exists(elsewhere.Path() / "a.MP4"));
    const auto files = UnfinishedFiles::Take(journal);
    ASSERT_TRUE(files) << "it may be wanted";
    const std::string link = (folder_.Path() / "link").string();
    const std::string file = (folder_.Path() / "b.MP4").string();
    const std::string why = " is a link to another place; clipfile recover makes a whole file of it";
    EXPECT_EQ(files->Obstacles(), (Names{link + "/a.MP4 is not recovered: " + link + why,
                                         file + " is not recovered: " + file + why}));
}

TEST_F(UnfinishedFilesTest, LinksWithinTheFolderAreFollowed) {
    Record("20261121/a.MP4", false);
    fs::create_directory_symlink(folder_.Path() / "20261121", folder_.Path() / "today");
    Leave({"today/a.MP4"});
    EXPECT_EQ(Found(), Names{"today/a.MP4"});
}

TEST_F(UnfinishedFilesTest, WhatCannotBeLookedAtStaysInTheJournalAndIsTold) {
    Record("20261121/a.MP4", false);
    fs::create_directory_symlink(folder_.Path() / "unmounted", folder_.Path() / "20261122");
    for (const auto& [name, why] : std::map<std::string, std::string>{
             {"20261122/a.MP4", (folder_.Path() / "20261122").string() +
                                    " is a link that cannot be followed: No such file or directory"},
             {std::string(300, 'a'), "File name too long"}}) {
        const fs::path journal = Leave({name});
        EXPECT_EQ(Sentence(journal), (folder_.Path() / name).string() + " is not recovered: " + why);
        ASSERT_TRUE(clipfile::ReadJournal(journal));
        EXPECT_EQ(clipfile::ReadJournal(journal)->files, Names{name});
        fs::remove(journal);
    }
}

TEST_F(UnfinishedFilesTest, AFolderWithTheNameOfAFileIsNoFile) {
    Record("a.MP4/b.MP4", false);
    const fs::path journal = Leave({"a.MP4", "a.MP4/b.MP4/c.MP4"});
    EXPECT_EQ(Found(), Names{});
    EXPECT_FALSE(fs::exists(journal));
}

TEST_F(UnfinishedFilesTest, AFileThatTwoJournalsNameLeavesBothOnceItIsClosed) {
    Record("a.MP4", false);
    const fs::path first = Leave({"a.MP4"});
    const fs::path second = Leave({"a.MP4"});
    EXPECT_EQ(Found().size(), 2U);
    Record("a.MP4", true);
    EXPECT_EQ(Found(), Names{});
    EXPECT_FALSE(fs::exists(first));
    EXPECT_FALSE(fs::exists(second));
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
    for (const char* const file : {"a.MP4", "b.MP4"}) {
        auto found = UnfinishedFiles::Take(journal);
        ASSERT_TRUE(found);
        found->Forget(folder_.Path() / file);
        found.reset();
        EXPECT_EQ(Found(), file == std::string("a.MP4") ? Names{"b.MP4"} : Names{});
    }
    EXPECT_FALSE(fs::exists(journal));
}

}  // namespace
}  // namespace receiver
