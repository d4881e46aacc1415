#include "CrashRecovery.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <chrono>
#include <fstream>
#include <thread>

#include "fakes/FakeDisplay.h"
#include "fakes/FakeSource.h"
#include "journal/JournalFile.h"
#include "support/TempDir.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::SizeIs;

class CrashRecoveryTest : public ::testing::Test {
 protected:
    CrashRecoveryTest() { place_.folder = folder_.Path().string(); }

    std::string File(const std::string& name) const { return place_.folder + "/" + name; }
    /// Follows the run until `condition` holds.
    template <typename Condition>
    [[nodiscard]] bool FollowUntil(CrashRecovery& recovery, Condition condition) {
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
        while (!condition() && std::chrono::steady_clock::now() < deadline) {
            recovery.Follow(report_);
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
        }
        return condition();
    }

    TempDir folder_;
    Options options_;
    OutputPlace place_;
    FakeDisplay display_;
    ModuleReport report_{display_};
};

TEST_F(CrashRecoveryTest, TheJournalHasTheFilesThatTheModuleHasOpenedAndNotClosed) {
    CrashRecovery recovery(options_, place_, false, display_, false);
    recovery.Describe(FakeSource(1).Description());
    recovery.LookAt(MakeFrame(0, true, 1));
    report_.Tell({{ModuleEvent::Kind::kFileOpened, File("a.MP4")},
                  {ModuleEvent::Kind::kFileClosed, File("a.MP4")},
                  {ModuleEvent::Kind::kFileOpened, File("b.MP4")}});
    ASSERT_TRUE(FollowUntil(recovery, [&] { return clipfile::JournalsIn(folder_.Path()).size() == 1; }));
    const auto journal = clipfile::ReadJournal(clipfile::JournalsIn(folder_.Path())[0]);
    ASSERT_TRUE(journal);
    EXPECT_THAT(journal->files, ElementsAre("b.MP4"));
    EXPECT_THAT(journal->sets, SizeIs(1));
    report_.Tell({{ModuleEvent::Kind::kFileClosed, File("b.MP4")}});
    EXPECT_TRUE(FollowUntil(recovery, [&] { return clipfile::JournalsIn(folder_.Path()).empty(); }));
    EXPECT_THAT(display_.notices, IsEmpty());
}

TEST_F(CrashRecoveryTest, AFolderWithoutAJournalIsToldAndTheRunGoesOn) {
    place_.folder = File("gone");
    CrashRecovery recovery(options_, place_, false, display_, false);
    report_.Tell({{ModuleEvent::Kind::kFileOpened, File("gone/a.MP4")}});
    ASSERT_TRUE(FollowUntil(recovery, [&] { return !display_.notices.empty(); }));
    recovery.End(report_);
    EXPECT_THAT(display_.notices, ElementsAre(HasSubstr("no journal can be kept, ")));
}

TEST_F(CrashRecoveryTest, OnAShareThereIsNoJournalAndThatIsTold) {
    place_.folder = "//server/share/folder";
    place_.onShare = true;
    CrashRecovery recovery(options_, place_, false, display_, true);
    recovery.LookAt(MakeFrame(0, true, 1));
    report_.Tell({{ModuleEvent::Kind::kFileOpened, "//server/share/folder/a.MP4"}});
    recovery.Follow(report_);
    EXPECT_FALSE(recovery.Agree());
    recovery.End(report_);
    EXPECT_THAT(display_.notices, ElementsAre("no journal is kept on a share: files that a crash leaves open "
                                              "there have to be recovered by hand, with clipfile recover"));
    display_.notices.clear();
    options_.recover = RecoverMode::kNo;
    const CrashRecovery silent(options_, place_, false, display_, true);
    EXPECT_THAT(display_.notices, IsEmpty());
}

TEST_F(CrashRecoveryTest, WhatIsRecordedIsMadeDurableAsOftenAsAskedFor) {
    options_.durable = 0.001;
    std::ofstream(File("a.MP4")) << "text";
    CrashRecovery recovery(options_, place_, false, display_, false);
    EXPECT_FALSE(recovery.SyncLatency());
    report_.Tell({{ModuleEvent::Kind::kFileOpened, File("a.MP4")}});
    EXPECT_TRUE(FollowUntil(recovery, [&] { return recovery.SyncLatency().has_value(); }));
    EXPECT_EQ(recovery.SyncFaults(), 0U);
    EXPECT_THAT(display_.notices, IsEmpty());
}

TEST_F(CrashRecoveryTest, TheEndOfARunMakesItsFilesDurable) {
    std::ofstream(File("a.MP4")) << "text";
    CrashRecovery recovery(options_, place_, false, display_, false);
    report_.Tell(
        {{ModuleEvent::Kind::kFileOpened, File("a.MP4")}, {ModuleEvent::Kind::kFileClosed, File("a.MP4")}});
    recovery.End(report_);
    EXPECT_TRUE(recovery.SyncLatency());
}

TEST_F(CrashRecoveryTest, WithADurabilityOfZeroNothingIsAskedOfTheDisk) {
    options_.durable = 0;
    std::ofstream(File("a.MP4")) << "text";
    CrashRecovery recovery(options_, place_, false, display_, false);
    report_.Tell({{ModuleEvent::Kind::kFileOpened, File("a.MP4")}});
    recovery.Follow(report_);
    recovery.End(report_);
    EXPECT_FALSE(recovery.SyncLatency());
}

TEST_F(CrashRecoveryTest, OnAShareDurabilityIsItsServersAndThatIsTold) {
    place_.folder = "//server/share/folder";
    place_.onShare = true;
    options_.recover = RecoverMode::kNo;
    options_.durable = 2;
    CrashRecovery recovery(options_, place_, false, display_, false);
    recovery.End(report_);
    EXPECT_THAT(display_.notices,
                ElementsAre("--durable has no effect on a share: its server makes durable what it is given"));
    EXPECT_FALSE(recovery.SyncLatency());
}

}  // namespace
}  // namespace receiver
