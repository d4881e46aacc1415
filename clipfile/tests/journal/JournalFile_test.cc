#include "journal/JournalFile.h"

#include <fcntl.h>
#include <gtest/gtest.h>
#include <signal.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cerrno>
#include <fstream>
#include <system_error>

#include "support/SystemCalls.h"
#include "support/TempDir.h"

namespace clipfile {
namespace {

Journal Naming(const std::string& file) {
    Journal journal;
    journal.frameRate = 25000;
    journal.sets = {{{0x67, 1, 2, 3}, {0x68, 4}}};
    journal.files = {file};
    return journal;
}

class JournalFileTest : public testing::Test {
 protected:
    std::size_t entries() const {
        return static_cast<std::size_t>(
            std::distance(std::filesystem::directory_iterator(folder_.Path()), {}));
    }
    void put(const std::filesystem::path& path, const std::string& text) const {
        std::ofstream(path) << text;
    }

    TempDir folder_;
};

TEST_F(JournalFileTest, AppearsWithItsFirstContentAndIsReplacedAsAWhole) {
    JournalFile file(folder_.Path());
    EXPECT_EQ(entries(), 0U);
    file.Write(Naming("a.MP4"));
    EXPECT_EQ(JournalsIn(folder_.Path()), std::vector<std::filesystem::path>{file.Path()});
    file.Write(Naming("b.MP4"));
    EXPECT_EQ(entries(), 1U);
    const auto journal = ReadJournal(file.Path());
    ASSERT_TRUE(journal);
    EXPECT_EQ(journal->files, std::vector<std::string>{"b.MP4"});
    file.Remove();
    EXPECT_EQ(entries(), 0U);
    file.Remove();
}

TEST_F(JournalFileTest, TwoInOneFolderHaveNamesOfTheirOwn) {
    JournalFile first(folder_.Path());
    JournalFile second(folder_.Path());
    first.Write(Naming("a.MP4"));
    second.Write(Naming("b.MP4"));
    EXPECT_EQ(entries(), 2U);
    first.Remove();
    EXPECT_EQ(JournalsIn(folder_.Path()), std::vector<std::filesystem::path>{second.Path()});
}

TEST_F(JournalFileTest, IsHeldAsLongAsItsWriterLives) {
    std::filesystem::path path;
    {
        JournalFile file(folder_.Path());
        file.Write(Naming("a.MP4"));
        path = file.Path();
        EXPECT_FALSE(JournalFile::Claim(path));
        file.Write(Naming("b.MP4"));
        EXPECT_FALSE(JournalFile::Claim(path));
    }
    const auto claimed = JournalFile::Claim(path);
    ASSERT_TRUE(claimed);
    EXPECT_FALSE(JournalFile::Claim(path)) << "two took it over";
}

TEST_F(JournalFileTest, IsFreeOnceItsProcessIsKilled) {
    int ready[2] = {};
    ASSERT_EQ(pipe(ready), 0);
    const pid_t writer = fork();
    if (writer == 0) {
        JournalFile file(folder_.Path());
        file.Write(Naming("a.MP4"));
        [[maybe_unused]] const ssize_t told = write(ready[1], "x", 1);
        pause();
    }
    char byte = 0;
    ASSERT_EQ(read(ready[0], &byte, 1), 1);
    const auto found = JournalsIn(folder_.Path());
    ASSERT_EQ(found.size(), 1U);
    EXPECT_FALSE(JournalFile::Claim(found[0]));
    kill(writer, SIGKILL);
    ASSERT_EQ(waitpid(writer, nullptr, 0), writer);
    EXPECT_TRUE(JournalFile::Claim(found[0]));
    close(ready[0]);
    close(ready[1]);
}

TEST_F(JournalFileTest, OneThatWasClaimedIsWrittenUnderItsName) {
    std::filesystem::path path;
    {
        JournalFile file(folder_.Path());
        file.Write(Naming("a.MP4"));
        path = file.Path();
    }
    auto claimed = JournalFile::Claim(path);
    ASSERT_TRUE(claimed);
    claimed->Write(Naming("c.MP4"));
    EXPECT_EQ(ReadJournal(path)->files, std::vector<std::string>{"c.MP4"});
    EXPECT_FALSE(JournalFile::Claim(path));
}

TEST_F(JournalFileTest, WhatIsNoJournalIsNotRead) {
    const auto path = folder_.Path() / ".receiver-1.journal";
    EXPECT_FALSE(ReadJournal(path));
    EXPECT_FALSE(JournalFile::Claim(path));
    put(path, "");
    EXPECT_FALSE(ReadJournal(path));
    const std::string whole = ToText(Naming("a.MP4"));
    put(path, whole.substr(0, whole.size() / 2));
    EXPECT_FALSE(ReadJournal(path));
    std::filesystem::resize_file(path, 100'000'000'000);
    EXPECT_FALSE(ReadJournal(path));
}

TEST_F(JournalFileTest, LinksPipesAndFoldersAreNoJournals) {
    const auto real = folder_.Path() / "real";
    put(real, ToText(Naming("a.MP4")));
    const auto link = folder_.Path() / ".receiver-link.journal";
    std::filesystem::create_symlink(real, link);
    const auto pipe = folder_.Path() / ".receiver-pipe.journal";
    ASSERT_EQ(mkfifo(pipe.c_str(), 0600), 0);
    const auto folder = folder_.Path() / ".receiver-folder.journal";
    std::filesystem::create_directory(folder);
    for (const auto& path : {link, pipe, folder}) {
        EXPECT_FALSE(ReadJournal(path)) << path;
        EXPECT_FALSE(JournalFile::Claim(path)) << path;
    }
}

TEST_F(JournalFileTest, WhatAKilledWriterHasLeftIsRemoved) {
    const auto torn = folder_.Path() / ".receiver-1.journal.new";
    const auto held = folder_.Path() / ".receiver-2.journal.new";
    put(torn, "{");
    put(held, "{");
    put(folder_.Path() / "other.journal.new", "{");
    JournalFile journal(folder_.Path());
    journal.Write(Naming("a.MP4"));
    const int holder = open(held.c_str(), O_RDWR | O_CLOEXEC);
    ASSERT_EQ(flock(holder, LOCK_EX | LOCK_NB), 0);
    RemoveTornJournals(folder_.Path());
    close(holder);
    EXPECT_FALSE(std::filesystem::exists(torn));
    EXPECT_TRUE(std::filesystem::exists(held)) << "somebody writes it";
    EXPECT_EQ(entries(), 3U);
}

TEST_F(JournalFileTest, WithoutLocksThereIsNone) {
    const SystemCallGuard guard;
    SystemCalls().flock = [] { return ENOLCK; };
    JournalFile journal(folder_.Path());
    EXPECT_THROW(journal.Write(Naming("a.MP4")), std::system_error);
    EXPECT_EQ(entries(), 0U);
}

TEST_F(JournalFileTest, AFullDiskLeavesTheOneThatIsThere) {
    const SystemCallGuard guard;
    JournalFile journal(folder_.Path());
    journal.Write(Naming("a.MP4"));
    SystemCalls().fsync = [](int) { return ENOSPC; };
    EXPECT_THROW(journal.Write(Naming("b.MP4")), std::system_error);
    SystemCalls().fsync = nullptr;
    EXPECT_EQ(entries(), 1U);
    EXPECT_EQ(ReadJournal(journal.Path())->files, std::vector<std::string>{"a.MP4"});
    EXPECT_FALSE(JournalFile::Claim(journal.Path())) << "it is still held";
    journal.Write(Naming("c.MP4"));
    EXPECT_EQ(ReadJournal(journal.Path())->files, std::vector<std::string>{"c.MP4"});
}

TEST_F(JournalFileTest, IsClaimedThroughADescriptorForWriting) {
    std::filesystem::path path;
    {
        JournalFile file(folder_.Path());
        file.Write(Naming("a.MP4"));
        path = file.Path();
    }
    const SystemCallGuard guard;
    int mode = -1;
    SystemCalls().flockOf = [&](int descriptor) { mode = fcntl(descriptor, F_GETFL) & O_ACCMODE; };
    ASSERT_TRUE(JournalFile::Claim(path));
    EXPECT_EQ(mode, O_RDWR);
}

TEST_F(JournalFileTest, AFolderThatTakesNoFilesIsAFailureThatLeavesNothing) {
    JournalFile gone(folder_.Path() / "gone");
    EXPECT_THROW(gone.Write(Naming("a.MP4")), std::system_error);
    JournalFile blocked(folder_.Path());
    std::filesystem::create_directories(blocked.Path() / "something");
    EXPECT_THROW(blocked.Write(Naming("a.MP4")), std::system_error);
    EXPECT_EQ(entries(), 1U);
}

}  // namespace
}  // namespace clipfile
