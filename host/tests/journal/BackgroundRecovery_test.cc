// With programs of the tests in the place of `clipfile`.

#include "journal/BackgroundRecovery.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <sys/resource.h>

#include <fstream>
#include <functional>
#include <thread>

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
    recovery.End();
    EXPECT_THAT(Called(), SizeIs(0));
    EXPECT_THAT(recovery.TakeSentences(), SizeIs(0));
    EXPECT_THAT(clipfile::ReadJournal(journal_)->files, SizeIs(2));
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
    }
    EXPECT_THAT(clipfile::ReadJournal(journal_)->files, SizeIs(2));
    EXPECT_TRUE(WaitFor([&] { return clipfile::JournalFile::Claim(journal_).has_value(); }));
}

TEST_F(BackgroundRecoveryTest, TheEndTellsWhatIsNotRecoveredYet) {
    BackgroundRecovery recovery(folder_.Path(), RecoverMode::kYes, Program("exec sleep 1000"));
    ASSERT_TRUE(WaitFor([&] { return Called().size() == 1; }));
    recovery.End();
    EXPECT_THAT(Hear(recovery, 4),
                ElementsAre(HasSubstr("was never closed"), HasSubstr("was never closed"),
                            File("a.MP4") + " is not recovered yet: the next receiver goes on with it",
                            File("b.MP4") + " is not recovered yet: the next receiver goes on with it"));
}

TEST_F(BackgroundRecoveryTest, AFileThatTwoJournalsNameIsRecoveredOnce) {
    clipfile::Journal journal;
    journal.files = {"a.MP4"};
    fs::path second;
    {
        clipfile::JournalFile file(folder_.Path());
        file.Write(journal);
        second = file.Path();
    }
    test_stream::Record(programs_.Path() / "closed", {"normal", clipfileModule::RecordRules::kExact, true},
                        test_stream::MakePlainStream(1));
    BackgroundRecovery recovery(
        folder_.Path(), RecoverMode::kYes,
        Program("cp " + (programs_.Path() / "closed").string() + " \"$3\"; echo done"));
    EXPECT_THAT(Hear(recovery, 4),
                ElementsAre(HasSubstr("was never closed"), HasSubstr("was never closed"), "done", "done"));
    EXPECT_TRUE(WaitFor([&] { return !fs::exists(journal_) && !fs::exists(second); }));
    EXPECT_THAT(Called(), SizeIs(2));
}

TEST_F(BackgroundRecoveryTest, MoreJournalsThanFilesThatAProcessMayOpenAreAllSeenTo) {
    rlimit before = {};
    ASSERT_EQ(getrlimit(RLIMIT_NOFILE, &before), 0);
    clipfile::Journal journal;
    journal.files = {"a.MP4"};
    for (int i = 0; i < 80; ++i) {
        clipfile::JournalFile(folder_.Path()).Write(journal);
    }
    const rlimit few = {64, before.rlim_max};
    ASSERT_EQ(setrlimit(RLIMIT_NOFILE, &few), 0);
    {
        BackgroundRecovery recovery(folder_.Path(), RecoverMode::kYes, Program("echo done"));
        EXPECT_TRUE(WaitFor([&] { return clipfile::JournalsIn(folder_.Path()).empty(); }));
    }
    EXPECT_EQ(setrlimit(RLIMIT_NOFILE, &before), 0);
    // A folder that could not be opened looked empty.
    EXPECT_THAT(clipfile::JournalsIn(folder_.Path()), SizeIs(0));
}

TEST_F(BackgroundRecoveryTest, WithoutAProgramNothingIsStartedAndThatIsTold) {
    BackgroundRecovery recovery(folder_.Path(), RecoverMode::kYes, "");
    EXPECT_EQ(Hear(recovery, 3)[2], "nothing is recovered: the program clipfile cannot be found");
    recovery.End();
    EXPECT_THAT(clipfile::ReadJournal(journal_)->files, SizeIs(2));
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
    // The end comes behind its look at the folder.
    recovery.End();
    EXPECT_FALSE(recovery.Agree());
    EXPECT_THAT(recovery.TakeSentences(), SizeIs(0));
    EXPECT_THAT(Called(), SizeIs(0));
}

}  // namespace
}  // namespace receiver
