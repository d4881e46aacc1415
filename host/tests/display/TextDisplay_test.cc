#include "display/TextDisplay.h"

#include <gtest/gtest.h>

#include <sstream>

#include "Snapshots.h"

namespace receiver {
namespace {

class TextDisplayTest : public ::testing::Test {
 protected:
    /// What was said since the last call.
    std::string Said() {
        std::string text = messages_.str();
        messages_.str("");
        return text;
    }

    std::ostringstream messages_;
    std::ostringstream results_;
    std::chrono::steady_clock::time_point now_{};
    TextDisplay display_{messages_, results_, [this] { return now_; }};
};

TEST_F(TextDisplayTest, BeginsAndEndsOfRecordingsAreLines) {
    display_.RecordStarted({10, 20, 18, 0, true});
    display_.RecordStopped({10, 20, 40, 0, true});
    EXPECT_EQ(Said(), "recording at 10:20:18;00\nnot recording at 10:20:40;00\n");
}

TEST_F(TextDisplayTest, WaitingIsToldOnce) {
    Snapshot snapshot = RecordingSnapshot();
    display_.Show(snapshot);
    EXPECT_EQ(Said(), "");
    snapshot.waiting = true;
    display_.Show(snapshot);
    display_.Show(snapshot);
    EXPECT_EQ(Said(), "recording begins with the next IDR frame\n");
}

TEST_F(TextDisplayTest, LossesAreToldAtOnceAndThenEveryFiveSecondsWithTheTotal) {
    Snapshot snapshot = RecordingSnapshot();
    snapshot.lost = 1;
    display_.Show(snapshot);
    EXPECT_EQ(Said(), "lost: 1 unit so far at 10:20:30;12\n");
    snapshot.lost = 2;
    now_ += std::chrono::milliseconds(4999);
    display_.Show(snapshot);
    EXPECT_EQ(Said(), "");
    snapshot.lost = 7;
    now_ += std::chrono::milliseconds(1);
    display_.Show(snapshot);
    display_.Show(snapshot);
    EXPECT_EQ(Said(), "lost: 7 units so far at 10:20:30;12\n");
    now_ += std::chrono::minutes(1);
    display_.Show(snapshot);
    EXPECT_EQ(Said(), "");
}

TEST_F(TextDisplayTest, WhatNobodyHasReadIsCounted) {
    EXPECT_EQ(TextRemark(1), "1 message could not be shown\n");
    EXPECT_EQ(TextRemark(20), "20 messages could not be shown\n");
}

TEST_F(TextDisplayTest, StatusesAreWordsAndFaultsHaveTheirNumbers) {
    display_.Status({4, 0});
    EXPECT_EQ(Said(), "module: buffering\n");
    display_.Status({6, 22});
    EXPECT_EQ(Said(), "module: the disk is too slow: more than 48 chunks wait for it (status 6, cause 22)\n");
}

TEST_F(TextDisplayTest, FilesNoticesAndFailuresAreLines) {
    display_.FileOpened("a.MP4");
    display_.FileClosed("a.MP4");
    display_.Notice("the source was lost");
    display_.Failure(ExitCode::kOutput, "the disk is full.");
    EXPECT_EQ(Said(), "writing a.MP4\nclosed  a.MP4\nthe source was lost\nreceiver: the disk is full.\n");
}

TEST_F(TextDisplayTest, TheTableOfFilesIsTheResult) {
    RecordedFile broken = ClosedFile();
    broken.problem = "Invalid data";
    display_.Finish({{ClosedFile(), broken}, 2, ExitCode::kLost});
    EXPECT_EQ(results_.str(),
              "File                                         Size        Start        Length   Frames\n"
              "/srv/rec/20261121/CAM1/10_20_18_00.MP4    12.3 MB  10:20:18;00  00:00:07.040      176\n"
              "/srv/rec/20261121/CAM1/10_20_18_00.MP4    12.3 MB  cannot be read: Invalid data\n");
    EXPECT_EQ(Said(), "lost: 2 units\n");
}

TEST_F(TextDisplayTest, ARunWithoutFilesSaysSo) {
    display_.Finish({});
    EXPECT_EQ(results_.str(), "");
    EXPECT_EQ(Said(), "no file was written\n");
}

}  // namespace
}  // namespace receiver
