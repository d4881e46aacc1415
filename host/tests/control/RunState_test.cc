#include "control/RunState.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace receiver {
namespace {

using std::chrono::seconds;
using ::testing::SizeIs;

constexpr const char* kFolder = "/srv/20261121/CAM1/";

Timecode Address(int second, int frame = 0) {
    return {10, 0, static_cast<std::uint8_t>(second), static_cast<std::uint8_t>(frame), false};
}

class RunStateTest : public ::testing::Test {
 protected:
    void Describe() {
        SourceDescription source;
        source.frameRate = ParseFrameRate("25").value();
        state_.Describe(source);
    }
    void Show(bool waiting, bool away = false) {
        Snapshot snapshot;
        snapshot.waiting = waiting;
        snapshot.source.away = away;
        state_.Show(snapshot);
    }
    static std::string File(const std::string& name) { return kFolder + name + ".MP4"; }
    RunPhase Phase() const { return state_.Look().phase; }

    RunState::WallClock::time_point now_{seconds(1000)};
    int changes_ = 0;
    RunState state_{[this] { ++changes_; }, [this] { return now_; }};
};

TEST_F(RunStateTest, FollowsTheRunFromPhaseToPhase) {
    EXPECT_EQ(Phase(), RunPhase::kWaitingForSource);
    EXPECT_FALSE(state_.HasSource());
    Describe();
    EXPECT_TRUE(state_.HasSource());
    EXPECT_EQ(Phase(), RunPhase::kIdle);
    Show(true);
    EXPECT_EQ(Phase(), RunPhase::kWaitingForIdr);
    state_.RecordStarted(Address(0));
    EXPECT_EQ(Phase(), RunPhase::kRecording);
    state_.RecordStopped(Address(1));
    Show(true, true);
    EXPECT_EQ(Phase(), RunPhase::kSourceLost);
    Show(false);
    EXPECT_EQ(Phase(), RunPhase::kIdle);
    state_.Status({7, 4});
    EXPECT_EQ(Phase(), RunPhase::kFailed);
    state_.Finish({});
    EXPECT_EQ(Phase(), RunPhase::kEnded);
    EXPECT_EQ(changes_, 8);
}

TEST_F(RunStateTest, TellsSinceWhenAPhaseLasts) {
    now_ += seconds(5);
    Describe();
    now_ += seconds(5);
    Show(false);
    EXPECT_EQ(state_.Look().since, RunState::WallClock::time_point(seconds(1005)));
    EXPECT_EQ(state_.Look().started, RunState::WallClock::time_point(seconds(1000)));
}

TEST_F(RunStateTest, AFailureEndsTheRun) {
    state_.Failure(ExitCode::kOutput, "no disk.");
    EXPECT_EQ(Phase(), RunPhase::kEnded);
}

TEST_F(RunStateTest, CountsFaultsAlone) {
    state_.Status({4, 0});
    state_.Status({6, 22});
    state_.Status({3, 0});
    EXPECT_EQ(state_.Look().faults, 1u);
    EXPECT_EQ(state_.Look().snapshot.status, (ModuleStatus{3, 0}));
}

TEST_F(RunStateTest, AFileBelongsToTheRecordingThatBeganWithItsName) {
    Describe();
    state_.RecordStarted(Address(0));
    EXPECT_FALSE(state_.FirstFileFrom(Address(0)));
    state_.RecordStopped(Address(2));
    state_.RecordStarted(Address(3));
    // The module opens files later than recordings begin.
    state_.FileOpened(File("10_00_00_00"));
    state_.FileOpened(File("10_00_03_00"));
    EXPECT_EQ(state_.FirstFileFrom(Address(0))->path, File("10_00_00_00"));
    EXPECT_EQ(state_.FirstFileFrom(Address(3))->path, File("10_00_03_00"));
    EXPECT_EQ(state_.LastFileTo(Address(2))->path, File("10_00_00_00"));
    EXPECT_EQ(state_.LastFileTo(Address(2))->end, Address(2));
    EXPECT_FALSE(state_.LastFileTo(Address(5)));
    EXPECT_EQ(state_.Look().recordings, 2u);
}

TEST_F(RunStateTest, AFileEndsWhereTheNextOneOfItsRecordingBegins) {
    Describe();
    state_.RecordStarted(Address(0));
    state_.FileOpened(File("10_00_00_00"));
    state_.FileOpened(File("10_00_30_00"));
    state_.FileClosed(File("10_00_00_00"));
    state_.RecordStopped(Address(45));
    const auto files = state_.Files();
    ASSERT_THAT(files, SizeIs(2));
    EXPECT_EQ(files[0].end, Address(30));
    EXPECT_TRUE(files[0].closed);
    EXPECT_EQ(files[1].end, Address(45));
    EXPECT_FALSE(files[1].closed);
    EXPECT_EQ(state_.FirstFileFrom(Address(0))->path, File("10_00_00_00"));
    EXPECT_EQ(state_.LastFileTo(Address(45))->path, File("10_00_30_00"));
    EXPECT_EQ(state_.Look().openFile->path, File("10_00_30_00"));
}

TEST_F(RunStateTest, ASecondRecordingAtTheSameAddressHasItsOwnFile) {
    Describe();
    for (const char* const name : {"10_00_00_00", "10_00_00_00(2)"}) {
        state_.RecordStarted(Address(0));
        state_.FileOpened(File(name));
        EXPECT_EQ(state_.FirstFileFrom(Address(0))->path, File(name));
        state_.RecordStopped(Address(1));
        EXPECT_EQ(state_.LastFileTo(Address(1))->path, File(name));
        state_.FileClosed(File(name));
    }
    EXPECT_FALSE(state_.Look().openFile);
}

TEST_F(RunStateTest, KeepsTheNewestFilesOfALongRunAndCountsAll) {
    Describe();
    for (std::size_t i = 0; i < RunState::kKept + 2; ++i) {
        state_.RecordStarted(Address(0));
        state_.FileOpened(File("10_00_00_00(" + std::to_string(i) + ")"));
        state_.RecordStopped(Address(1));
    }
    const auto files = state_.Files();
    ASSERT_THAT(files, SizeIs(RunState::kKept));
    EXPECT_EQ(files.front().path, File("10_00_00_00(2)"));
    EXPECT_EQ(state_.Look().files, RunState::kKept + 2);
    EXPECT_EQ(state_.LastFileTo(Address(1))->path, files.back().path);
}

TEST(SecondsBetweenTest, CountsFramesOfTheRateOverMidnightToo) {
    const FrameRate pal = ParseFrameRate("25").value();
    EXPECT_DOUBLE_EQ(SecondsBetween(Address(0), Address(2, 5), pal), 2.2);
    EXPECT_DOUBLE_EQ(SecondsBetween({23, 59, 59, 0, false}, {0, 0, 1, 0, false}, pal), 2);
    // Drop frame leaves out ;00 and ;01 of the minute: 60 seconds of addresses are 1798 frames here.
    const FrameRate ntsc = ParseFrameRate("29.97").value();
    EXPECT_DOUBLE_EQ(SecondsBetween({10, 0, 2, 0, true}, {10, 1, 2, 0, true}, ntsc), 1798 * 1001 / 30000.0);
    EXPECT_DOUBLE_EQ(SecondsBetween({23, 59, 59, 29, true}, {0, 0, 0, 0, true}, ntsc), 1001 / 30000.0);
}

}  // namespace
}  // namespace receiver
