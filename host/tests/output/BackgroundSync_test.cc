#include "output/BackgroundSync.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <condition_variable>
#include <filesystem>
#include <fstream>
#include <map>
#include <memory>
#include <mutex>
#include <thread>

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using Kind = BackgroundSync::Kind;
using std::chrono::milliseconds;

/// Far more than any loaded machine needs.
constexpr std::chrono::seconds kPatience{60};
constexpr milliseconds kSoon{1};
constexpr milliseconds kNever = std::chrono::hours(24);

/// A disk that notes what is written out. A thread that was left to itself still uses it.
class FakeDisk : public std::enable_shared_from_this<FakeDisk> {
 public:
    BackgroundSync::Call Call() {
        return [disk = shared_from_this()](const std::string& path, Kind kind) {
            return disk->Take(path, kind);
        };
    }
    void Fail(const std::string& path, int error) {
        const std::lock_guard lock(mutex_);
        errors_[path] = error;
    }
    /// It answers no more until it is told to.
    void Hang(bool hangs) {
        const std::lock_guard lock(mutex_);
        hangs_ = hangs;
        changed_.notify_all();
    }
    /// True once `path` was written out so many times.
    bool WaitFor(const std::string& path, std::size_t times = 1) {
        std::unique_lock lock(mutex_);
        return changed_.wait_for(lock, kPatience, [&] { return counts_[path] >= times; });
    }
    /// True once a call waits for an answer.
    bool WaitUntilCalled() {
        std::unique_lock lock(mutex_);
        return changed_.wait_for(lock, kPatience, [&] { return waiting_; });
    }
    std::vector<std::string> Calls() const {
        const std::lock_guard lock(mutex_);
        return calls_;
    }

 private:
    int Take(const std::string& path, Kind kind) {
        std::unique_lock lock(mutex_);
        waiting_ = true;
        changed_.notify_all();
        changed_.wait(lock, [this] { return !hangs_; });
        waiting_ = false;
        calls_.push_back((kind == Kind::kFile ? "file " : "folder ") + path);
        ++counts_[path];
        changed_.notify_all();
        const auto error = errors_.find(path);
        return error == errors_.end() ? 0 : error->second;
    }

    mutable std::mutex mutex_;
    std::condition_variable changed_;
    bool hangs_ = false;
    bool waiting_ = false;
    std::vector<std::string> calls_;
    std::map<std::string, std::size_t> counts_;
    std::map<std::string, int> errors_;
};

BackgroundSync::Settings Every(milliseconds interval) {
    BackgroundSync::Settings settings;
    settings.folder = "/rec";
    settings.interval = interval;
    settings.slow = kNever;
    settings.endPatience = kPatience;
    return settings;
}

template <typename Condition>
bool Eventually(Condition condition) {
    const auto deadline = std::chrono::steady_clock::now() + kPatience;
    bool holds = condition();
    while (!holds && std::chrono::steady_clock::now() < deadline) {
        std::this_thread::sleep_for(kSoon);
        holds = condition();
    }
    return holds;
}

TEST(BackgroundSync, AFileThatGrowsIsWrittenOutAgainAndAgain) {
    const auto disk = std::make_shared<FakeDisk>();
    BackgroundSync sync(Every(kSoon), disk->Call());
    sync.SetFiles({"/rec/20261121/CAM1/a.MP4"}, {});
    EXPECT_TRUE(disk->WaitFor("/rec/20261121/CAM1/a.MP4", 5));
}

TEST(BackgroundSync, TheFoldersThatLeadToANewFileFollowItOnce) {
    const auto disk = std::make_shared<FakeDisk>();
    {
        BackgroundSync sync(Every(kSoon), disk->Call());
        sync.SetFiles({"/rec/20261121/CAM1/a.MP4"}, {});
        ASSERT_TRUE(disk->WaitFor("/rec/20261121/CAM1/a.MP4", 3));
    }
    std::vector<std::string> calls = disk->Calls();
    ASSERT_GE(calls.size(), 6U);
    const std::vector<std::string> repeated(calls.begin() + 4, calls.end());
    calls.resize(4);
    EXPECT_THAT(calls, ElementsAre("file /rec/20261121/CAM1/a.MP4", "folder /rec/20261121/CAM1",
                                   "folder /rec/20261121", "folder /rec"));
    EXPECT_THAT(repeated, ::testing::Each("file /rec/20261121/CAM1/a.MP4"));
}

TEST(BackgroundSync, TheNameOfAnOutputFolderThatWasMadeStandsInTheOneAboveIt) {
    const auto disk = std::make_shared<FakeDisk>();
    BackgroundSync::Settings settings = Every(kNever);
    settings.folderIsNew = true;
    settings.folder = "rec";
    BackgroundSync sync(settings, disk->Call());
    sync.SetFiles({"rec/20261121/a.MP4"}, {});
    sync.End();
    EXPECT_THAT(disk->Calls(),
                ElementsAre("file rec/20261121/a.MP4", "folder rec/20261121", "folder rec", "folder ."));
}

TEST(BackgroundSync, AFileIsWrittenOutOnceMoreBehindItsEnd) {
    const auto disk = std::make_shared<FakeDisk>();
    BackgroundSync sync(Every(kSoon), disk->Call());
    sync.SetFiles({"/rec/a.MP4"}, {});
    ASSERT_TRUE(disk->WaitFor("/rec"));
    disk->Hang(true);
    ASSERT_TRUE(disk->WaitUntilCalled());
    // What goes on now may have begun before the file's last boxes.
    sync.SetFiles({"/rec/b.MP4"}, {"/rec/a.MP4"});
    const std::size_t before = disk->Calls().size();
    disk->Hang(false);
    ASSERT_TRUE(disk->WaitFor("/rec/b.MP4", 2));
    const std::vector<std::string> calls = disk->Calls();
    EXPECT_EQ(std::count(calls.begin() + static_cast<std::ptrdiff_t>(before), calls.end(), "file /rec/a.MP4"),
              2);
}

TEST(BackgroundSync, TheEndOfARunWritesOutEverythingWithoutWaitingForItsTime) {
    const auto disk = std::make_shared<FakeDisk>();
    BackgroundSync sync(Every(kNever), disk->Call());
    sync.SetFiles({"/rec/a.MP4"}, {});
    sync.SetFiles({}, {"/rec/a.MP4"});
    sync.End();
    EXPECT_THAT(disk->Calls(), ElementsAre("file /rec/a.MP4", "folder /rec"));
    EXPECT_THAT(sync.TakeSentences(), IsEmpty());
}

TEST(BackgroundSync, AFileThatWasNeverSeenOpenIsWrittenOutWhenItIsClosed) {
    const auto disk = std::make_shared<FakeDisk>();
    BackgroundSync sync(Every(kNever), disk->Call());
    sync.SetFiles({}, {"/rec/a.MP4"});
    sync.SetFiles({}, {"/rec/b.MP4"});
    sync.End();
    EXPECT_THAT(disk->Calls(),
                ElementsAre("file /rec/a.MP4", "folder /rec", "file /rec/b.MP4", "folder /rec"));
}

TEST(BackgroundSync, NothingIsWrittenOutWhereNothingIsRecorded) {
    const auto disk = std::make_shared<FakeDisk>();
    BackgroundSync sync(Every(kSoon), disk->Call());
    sync.End();
    EXPECT_THAT(disk->Calls(), IsEmpty());
    EXPECT_FALSE(sync.Latency());
}

TEST(BackgroundSync, AFileThatIsNotMadeYetIsTriedAgain) {
    const auto disk = std::make_shared<FakeDisk>();
    disk->Fail("/rec/a.MP4", ENOENT);
    BackgroundSync sync(Every(kSoon), disk->Call());
    sync.SetFiles({"/rec/a.MP4"}, {});
    ASSERT_TRUE(disk->WaitFor("/rec/a.MP4", 2));
    disk->Fail("/rec/a.MP4", 0);
    EXPECT_TRUE(disk->WaitFor("/rec"));
    EXPECT_THAT(sync.TakeSentences(), IsEmpty());
    EXPECT_EQ(sync.Faults(), 0U);
}

TEST(BackgroundSync, WhatTheDiskHasNotKeptIsToldOnceAndCounted) {
    const auto disk = std::make_shared<FakeDisk>();
    disk->Fail("/rec/a.MP4", EIO);
    BackgroundSync sync(Every(kSoon), disk->Call());
    sync.SetFiles({"/rec/a.MP4"}, {});
    ASSERT_TRUE(disk->WaitFor("/rec/a.MP4", 3));
    sync.End();
    EXPECT_THAT(sync.TakeSentences(),
                ElementsAre("the disk has not kept all that was written to /rec/a.MP4: Input/output error; "
                            "look at its log, and verify the file"));
    EXPECT_EQ(sync.Faults(), 1U);
}

TEST(BackgroundSync, AFolderThatCannotBeWrittenOutIsToldAndIsNoLoss) {
    const auto disk = std::make_shared<FakeDisk>();
    disk->Fail("/rec", EACCES);
    BackgroundSync sync(Every(kNever), disk->Call());
    sync.SetFiles({"/rec/a.MP4"}, {});
    sync.End();
    EXPECT_THAT(sync.TakeSentences(), ElementsAre("/rec cannot be made durable: Permission denied"));
    EXPECT_EQ(sync.Faults(), 0U);
}

TEST(BackgroundSync, AFileSystemThatSynchronisesNoFoldersIsTakenAsItIs) {
    const auto disk = std::make_shared<FakeDisk>();
    disk->Fail("/rec", EINVAL);
    BackgroundSync sync(Every(kNever), disk->Call());
    sync.SetFiles({"/rec/a.MP4"}, {});
    sync.End();
    EXPECT_THAT(sync.TakeSentences(), IsEmpty());
}

TEST(BackgroundSync, ADiskThatHangsHoldsUpNobodyAndIsTold) {
    const auto disk = std::make_shared<FakeDisk>();
    disk->Hang(true);
    BackgroundSync::Settings settings = Every(kSoon);
    settings.slow = milliseconds(20);
    settings.reminder = kNever;
    settings.endPatience = kSoon;
    BackgroundSync sync(settings, disk->Call());
    sync.SetFiles({"/rec/a.MP4"}, {});
    std::vector<std::string> sentences;
    ASSERT_TRUE(Eventually([&] {
        for (std::string& sentence : sync.TakeSentences()) {
            sentences.push_back(std::move(sentence));
        }
        return !sentences.empty();
    }));
    EXPECT_THAT(sentences, ElementsAre(HasSubstr("to make durable what is recorded")));
    EXPECT_GT(sync.Latency(), settings.slow);
    // Once in a while.
    EXPECT_THAT(sync.TakeSentences(), IsEmpty());
    sync.End();
    EXPECT_THAT(sync.TakeSentences(), ElementsAre(HasSubstr("the disk still writes out what was recorded")));
    // What it was left with is written out all the same.
    disk->Hang(false);
    EXPECT_TRUE(disk->WaitFor("/rec/a.MP4", 2));
}

TEST(BackgroundSync, ASlowDiskIsToldAgain) {
    const auto disk = std::make_shared<FakeDisk>();
    disk->Hang(true);
    BackgroundSync::Settings settings = Every(kSoon);
    settings.slow = kSoon;
    settings.reminder = kSoon;
    BackgroundSync sync(settings, disk->Call());
    sync.SetFiles({"/rec/a.MP4"}, {});
    for (int times = 0; times < 2; ++times) {
        EXPECT_TRUE(Eventually([&] { return !sync.TakeSentences().empty(); })) << times;
    }
    disk->Hang(false);
}

class BackgroundSyncCall : public ::testing::Test {
 protected:
    BackgroundSyncCall() {
        std::string name = (std::filesystem::temp_directory_path() / "sync.XXXXXX").string();
        folder_ = mkdtemp(name.data());
    }
    ~BackgroundSyncCall() override { std::filesystem::remove_all(folder_); }

    std::string Path(const std::string& name) const { return folder_ / name; }

    std::filesystem::path folder_;
};

TEST_F(BackgroundSyncCall, WritesOutAFileAndAFolder) {
    std::ofstream(Path("a.MP4")) << "text";
    EXPECT_EQ(BackgroundSync::Sync(Path("a.MP4"), Kind::kFile), 0);
    EXPECT_EQ(BackgroundSync::Sync(folder_, Kind::kFolder), 0);
}

TEST_F(BackgroundSyncCall, GivesTheSystemsError) {
    EXPECT_EQ(BackgroundSync::Sync(Path("none"), Kind::kFile), ENOENT);
    std::ofstream(Path("a.MP4")) << "text";
    EXPECT_EQ(BackgroundSync::Sync(Path("a.MP4"), Kind::kFolder), ENOTDIR);
}

TEST_F(BackgroundSyncCall, FollowsNoLinkInThePlaceOfAFile) {
    std::ofstream(Path("a.MP4")) << "text";
    std::filesystem::create_symlink(Path("a.MP4"), Path("link.MP4"));
    EXPECT_EQ(BackgroundSync::Sync(Path("link.MP4"), Kind::kFile), ELOOP);
}

TEST_F(BackgroundSyncCall, DoesNotWaitAtAPipe) {
    ASSERT_EQ(mkfifo(Path("pipe.MP4").c_str(), 0600), 0);
    EXPECT_NE(BackgroundSync::Sync(Path("pipe.MP4"), Kind::kFile), 0);
}

}  // namespace
}  // namespace receiver
