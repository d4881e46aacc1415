// With programs of the tests in the place of `clipfile`.

#include "journal/BackgroundRecovery.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <fstream>
#include <functional>

#include "journal/JournalFile.h"
#include "support/TempDir.h"
#include "support/TestStream.h"

namespace receiver {
namespace {

namespace fs = std::filesystem;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::SizeIs;

class BackgroundRecoveryTest : public ::testing::Test {
 protected:
    BackgroundRecoveryTest() {
        clipfile::Journal journal;
        for (const char* const name : {"a.MP4", "b.MP4"}) {
            test_stream::Record(folder_.Path() / name, {"normal", clipfileModule::RecordRules::kExact, false},
                                test_stream::MakePlainStream(1));
            journal.files.emplace_back(name);
        }
        clipfile::JournalFile file(folder_.Path());
        file.Write(journal);
        journal_ = file.Path();
    }
    /// A program that is told its arguments and does `what`.
    fs::path Program(const std::string& what) const {
        const fs::path path = programs_.Path() / "clipfile";
        std::ofstream(path) << "#!/bin/sh\necho \"$@\" >> " << Calls() << "\n" << what << "\n";
        fs::permissions(path, fs::perms::owner_all);
        return path;
    }
    fs::path Calls() const { return programs_.Path() / "calls"; }
    std::vector<std::string> Called() const {
        std::ifstream in(Calls());
        std::vector<std::string> lines;
        for (std::string line; std::getline(in, line);) {
            lines.push_back(line);
        }
        return lines;
    }
    std::string File(const std::string& name) const { return (folder_.Path() / name).string(); }
    /// Sentences until there are `count`.
    std::vector<std::string> Hear(BackgroundRecovery& recovery, std::size_t count) const {
        std::vector<std::string> heard;
        EXPECT_TRUE(WaitFor([&] {
            for (std::string& sentence : recovery.TakeSentences()) {
                heard.push_back(std::move(sentence));
            }
            return heard.size() >= count;
        }));
        return heard;
    }
    static bool WaitFor(const std::function<bool()>& condition) {
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(60);
        bool holds = condition();
        while (!holds && std::chrono::steady_clock::now() < deadline) {
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
            holds = condition();
        }
        return holds;
    }

    TempDir folder_;
    TempDir programs_;
    fs::path journal_;
};

TEST_F(BackgroundRecoveryTest, TellsEachFileAndWhatBecomesOfIt) {
    BackgroundRecovery recovery(folder_.Path(), RecoverMode::kYes, Program("echo \"$3 is whole again.\""));
    EXPECT_THAT(
        Hear(recovery, 4),
        ElementsAre(
            File("a.MP4") + " was never closed: its receiver is gone; it is recovered in the background",
            File("b.MP4") + " was never closed: its receiver is gone; it is recovered in the background",
            File("a.MP4") + " is whole again", File("b.MP4") + " is whole again"));
    EXPECT_THAT(Called(), ElementsAre("recover --unattended " + File("a.MP4"),
                                      "recover --unattended " + File("b.MP4")));
    EXPECT_TRUE(WaitFor([&] { return !fs::exists(journal_); })) << "recovered files leave the journal";
}

TEST_F(BackgroundRecoveryTest, AHopelessFileIsToldWithTheReasonAndNotTriedAgain) {
    BackgroundRecovery recovery(
        folder_.Path(), RecoverMode::kYes,
        Program("echo \"clipfile: $3 cannot be recovered: it is torn.\" >&2; exit 1"));
    EXPECT_EQ(Hear(recovery, 4).back(), File("b.MP4") + " cannot be recovered: it is torn");
    EXPECT_TRUE(WaitFor([&] { return !fs::exists(journal_); }));
    EXPECT_TRUE(fs::exists(File("a.MP4")));
    EXPECT_TRUE(fs::exists(File("b.MP4")));
}

TEST_F(BackgroundRecoveryTest, WhatMaySucceedAnotherTimeStaysInTheJournal) {
    {
        BackgroundRecovery recovery(folder_.Path(), RecoverMode::kYes, Program("echo full; exit 3"));
        EXPECT_EQ(Hear(recovery, 4).back(), "full");
    }
    EXPECT_THAT(clipfile::ReadJournal(journal_)->files, SizeIs(2));
    BackgroundRecovery next(folder_.Path(), RecoverMode::kYes, Program("echo done"));
    EXPECT_THAT(Hear(next, 4), SizeIs(4));
}

TEST_F(BackgroundRecoveryTest, NoOnlyTells) {
    BackgroundRecovery recovery(folder_.Path(), RecoverMode::kNo, Program("echo done"));
    EXPECT_EQ(Hear(recovery, 2)[0], File("a.MP4") +
                                        " was never closed: its receiver is gone; clipfile recover makes a "
                                        "whole file of it");
    EXPECT_FALSE(recovery.Agree());
    EXPECT_THAT(Called(), SizeIs(0));
    EXPECT_TRUE(fs::exists(journal_));
}

TEST_F(BackgroundRecoveryTest, AskWaitsForAnAnswer) {
    BackgroundRecovery recovery(folder_.Path(), RecoverMode::kAsk, Program("echo done"));
    EXPECT_THAT(Hear(recovery, 2)[0], HasSubstr("; press y to have it recovered"));
    ASSERT_TRUE(WaitFor([&] { return recovery.Agree(); }));
    EXPECT_FALSE(recovery.Agree()) << "asked once";
    EXPECT_THAT(Hear(recovery, 2), ElementsAre("done", "done"));
}

TEST_F(BackgroundRecoveryTest, NobodyWaitsForAnAnswerAtTheEnd) {
    {
        BackgroundRecovery recovery(folder_.Path(), RecoverMode::kAsk, Program("echo done"));
        Hear(recovery, 2);
    }
    EXPECT_THAT(Called(), SizeIs(0));
    EXPECT_THAT(clipfile::ReadJournal(journal_)->files, SizeIs(2));
}

TEST_F(BackgroundRecoveryTest, TheEndStopsARecoveryAndTheNextReceiverBeginsItAgain) {
    {
        BackgroundRecovery recovery(folder_.Path(), RecoverMode::kYes, Program("exec sleep 1000"));
        ASSERT_TRUE(WaitFor([&] { return Called().size() == 1; }));
        recovery.Stop();
        EXPECT_EQ(recovery.TakeSentences().back(),
                  File("a.MP4") + " is not recovered yet: the next receiver goes on with it");
    }
    EXPECT_THAT(clipfile::ReadJournal(journal_)->files, SizeIs(2));
    EXPECT_TRUE(WaitFor([&] { return clipfile::JournalFile::Claim(journal_).has_value(); }));
}

TEST_F(BackgroundRecoveryTest, AProgramThatIsMissingIsTold) {
    BackgroundRecovery recovery(folder_.Path(), RecoverMode::kYes, "/nowhere/clipfile");
    EXPECT_EQ(Hear(recovery, 4)[2],
              File("a.MP4") +
                  " is not recovered: /nowhere/clipfile did not run to its end: No such file or directory");
}

TEST_F(BackgroundRecoveryTest, NothingIsSaidWithoutUnfinishedFiles) {
    fs::remove(journal_);
    BackgroundRecovery recovery(folder_.Path(), RecoverMode::kAsk, Program("echo done"));
    std::this_thread::yield();
    EXPECT_FALSE(recovery.Agree());
    EXPECT_THAT(recovery.TakeSentences(), SizeIs(0));
}

}  // namespace
}  // namespace receiver
