// What exact rules change in the record commands, each beside what the kept ones do.

#include <gtest/gtest.h>

#include <optional>

#include "support/HeldQueueThreads.h"
#include "support/RunningController.h"
#include "support/ThreadCount.h"

namespace clipfileModule {
namespace {

class ControllerExactTest : public RunningController {
 protected:
    static constexpr std::size_t kVideo = 0;
    static constexpr std::size_t kAudio = 1;
    static constexpr std::size_t kMeta = 2;

    /// Pushes video and audio of the frames up to `end`, with an IDR frame at `idr`, and waits until they
    /// have gone by.
    void LetPass(std::uint64_t end, std::uint64_t idr) {
        for (; frame_ < end; ++frame_) {
            for (; audio_ < clock_.AudioBefore(frame_ + 1); ++audio_) {
                controller_.PushAudio(clock_.Audio(audio_));
            }
            controller_.PushVideo(
                clock_.Video(frame_, frame_ == idr ? stream_units::kIdr : stream_units::kPicture));
        }
        WaitUntilHanded(kVideo, end);
        WaitUntilHanded(kAudio, end);
    }
    std::uint64_t At(std::uint64_t frame) const { return clock_.VideoMilliSec(frame); }

    const stream_units::StreamClock clock_{};
    std::uint64_t frame_ = 0;
    std::uint64_t audio_ = 0;
};

// Recordings that wait.

TEST_F(ControllerExactTest, AFlagThatTogglesWhileTheClockStandsStillMakesABoundedNumberOfRecordings) {
    Run("exact");
    const std::size_t threads = threadCount();
    for (int i = 0; i < 40; ++i) {
        PushFlag(true, 1000);
        PushFlag(false, 1000);
        // The stop is an event: a recording that is removed before it says so.
        WaitForEvents();
    }
    EXPECT_EQ(peer_.StreamBuffers().size(), 16U);
    // The kernel lists a thread for a moment after it was joined.
    EXPECT_TRUE(waitUntil([&] { return threadCount() == threads + std::size_t{16} * 4; }));
    EXPECT_EQ(log_.Count("16 recordings wait for their first picture. the oldest is removed."), 24U);
    EXPECT_EQ(log_.Count("OP: REMOVE STREAM. RTPTS = 90000 -> 90000."), 24U);
    EXPECT_TRUE(host_.Statuses().empty());
}

TEST_F(ControllerExactTest, TheRecordingThatWaitsLongestMakesRoomAndTheNewOneRecords) {
    Run("exact");
    // Far ahead of all that comes.
    for (std::int64_t i = 0; i < 20; ++i) {
        const std::uint64_t rtp = 900000000U + static_cast<std::uint64_t>(i) * 90;
        controller_.PushMeta(stream_units::MetaUnit(1, rtp, 1000, {true, std::nullopt}));
        controller_.PushMeta(stream_units::MetaUnit(1, rtp, 1000, {false, std::nullopt}));
    }
    WaitUntilHanded(kMeta, 1000);
    StartRecord(2000);
    const Ranges recordings = Recordings();
    ASSERT_EQ(recordings.size(), 16U);
    EXPECT_EQ(recordings.front().first, 900000000 + 5 * 90);
    EXPECT_EQ(recordings.back(), (std::pair<std::int64_t, std::int64_t>{180000, -1}));
    EXPECT_FALSE(peer_.StreamBuffers().back()->IsWaiting());
}

TEST_F(ControllerExactTest, RecordingsThatHaveTheirPicturesAreNotCounted) {
    Run("exact");
    // What has ended is not removed meanwhile.
    const auto held = HoldEvents();
    for (std::uint64_t i = 0; i < 20; ++i) {
        StartRecord(1000 + 2 * i);
        PushFlag(false, 1001 + 2 * i);
    }
    EXPECT_EQ(peer_.StreamBuffers().size(), 20U);
    EXPECT_EQ(log_.CountIf([](const CapturedLine& line) { return line.priority == LOG_PRIORITY_WARNING; }),
              0U);
}

// The end of a record.

TEST_F(ControllerExactTest, TheEndIsSetBeforeTheUnitOfTheCommandReachesTheRecordingAndTheStopFollows) {
    Run("exact");
    StartRecord(1000);
    const auto buffer = peer_.StreamBuffers().at(0);
    {
        const auto held = HoldEvents();
        auto gate = log_.BlockAtText("ST: [M]\t180000");
        controller_.PushMeta(stream_units::MetaUnit(2, 180000, 2000, {false, std::nullopt}));
        ASSERT_TRUE(gate.WaitReached());
        EXPECT_EQ(peer_.WaitingEvents(), 1U);
        EXPECT_EQ(buffer->GetEndTimestamp(), 180000);
        gate.Release();
        WaitUntilHanded(kMeta, 2000);
        EXPECT_EQ(Recordings(), (Ranges{{90000, -1}}));
    }
    WaitForEvents();
    EXPECT_EQ(Recordings(), (Ranges{{90000, 180000}}));
    EXPECT_EQ(log_.Count("OP: REC STOP. RTPTS = 90000 -> 180000."), 1U);
}

TEST_F(ControllerExactTest, WithKeptRulesNoEndIsSet) {
    Run("kept");
    StartRecord(1000);
    PushFlag(false, 2000);
    StartRecord(3000);
    EXPECT_EQ(Ends(), (std::vector<std::int64_t>{-1, -1}));
}

TEST_F(ControllerExactTest, ANewRecordingEndsTheOpenOneAndLeavesAnEndThatIsSetToItsLateStop) {
    Run("exact");
    StartRecord(1000);
    {
        const auto held = HoldEvents();
        PushFlag(false, 2000);
        StartRecord(3000);
        EXPECT_EQ(Ends(), (std::vector<std::int64_t>{180000, -1}));
        EXPECT_EQ(Recordings(), (Ranges{{90000, -1}, {270000, -1}}));
    }
    WaitForEvents();
    EXPECT_EQ(Recordings(), (Ranges{{90000, 180000}, {270000, -1}}));
    RunEvent(std::make_shared<StartStreamingEvent>(stream_units::MetaUnit(4, 360000, 4000)));
    EXPECT_EQ(Recordings(), (Ranges{{90000, 180000}, {270000, 360000}, {360000, -1}}));
    EXPECT_EQ(Ends(), (std::vector<std::int64_t>{180000, 360000, -1}));
}

TEST_F(ControllerExactTest, ARestartRemovesARecordingWhoseStopWasCommandedAndFlushesNothing) {
    Run("exact");
    PushFlag(true, 1000);
    const auto buffer = peer_.StreamBuffers().at(0);
    HeldQueueThreads queues(peer_);
    ASSERT_TRUE(queues.WaitReached());
    RunEvent(std::make_shared<StopStreamingEvent>(stream_units::MetaUnit(2, 180000, 2000)));
    ASSERT_TRUE(peer_.Queue(kVideo).Push(stream_units::VideoUnit(1, 90, 1)));
    log_.Clear();
    RunEvent(std::make_shared<RestartStreamingEvent>(buffer));
    EXPECT_EQ(LinesWith({"OP: RE", "OP: CHANGE STATE"}),
              (Texts{"OP: REC RESTART. RTPTS = 90000 -> 180000.",
                     "OP: REMOVE STREAM. RTPTS = 90000 -> 180000.", "OP: CHANGE STATE wait_state -> stop."}));
    EXPECT_TRUE(peer_.StreamBuffers().empty());
    EXPECT_EQ(peer_.Queue(kVideo).Size(), 1U);
}

TEST_F(ControllerExactTest, ARestartInFrontOfTheStopRemovesARecordingWhoseEndIsSet) {
    Run("exact");
    PushFlag(true, 1000);
    const auto buffer = peer_.StreamBuffers().at(0);
    {
        const auto held = HoldEvents();
        controller_.PostEvent(std::make_shared<RestartStreamingEvent>(buffer));
        PushFlag(false, 2000);
    }
    WaitForEvents();
    EXPECT_TRUE(peer_.StreamBuffers().empty());
    EXPECT_EQ(log_.Count("OP: REMOVE STREAM. RTPTS = 90000 -> 180000."), 1U);
}

TEST_F(ControllerExactTest, ARecordingWhoseStopWasCommandedDoesNotBeginAgainWhenTheHostIsBack) {
    Run("exact");
    PushFlag(true, 1000);
    const auto held = HoldEvents();
    PushFlag(false, 2000);
    controller_.BufferingStop();
    log_.Clear();
    controller_.BufferingStart();
    EXPECT_TRUE(peer_.StreamBuffers().empty());
    EXPECT_EQ(LinesWith({"OP: CHANGE STATE"}), Texts{});
}

TEST_F(ControllerExactTest, ARecordingWithTheFlagOnBeginsAgainWhenTheHostIsBack) {
    Run("exact");
    PushFlag(true, 1000);
    controller_.BufferingStop();
    log_.Clear();
    controller_.BufferingStart();
    EXPECT_EQ(LinesWith({"OP: CHANGE STATE"}), Texts{"OP: CHANGE STATE stop -> wait_state."});
}

// Units that went by before the metadata thread met the command.

TEST_F(ControllerExactTest, ARecordingGetsTheUnitsFromItsStartOnThatWentByAlready) {
    Run("exact");
    PushFlag(false, At(0));
    LetPass(8, 5);
    log_.Clear();
    PushFlag(true, At(5));
    // Frame 5 is at 1200 ms. Audio frames: 9 at 1192, 10 at 1213, 11 at 1234, 12 at 1256, 13 at 1277, 14 at
    // 1298; frames 6 and 7 at 1240 and 1280.
    EXPECT_EQ(LinesWith({"ST: [V]", "ST: [A]", "ST: [M]", "OP: IDR"}),
              (Texts{"ST: [A]\t57216", "ST: [V]\t108000", "OP: IDR FRAME RECV. RTPTS = 108000.",
                     "ST: [A]\t58240", "ST: [A]\t59264", "ST: [V]\t111600", "ST: [A]\t60288",
                     "ST: [A]\t61312", "ST: [V]\t115200", "ST: [A]\t62336", "ST: [M]\t108000"}));
}

TEST_F(ControllerExactTest, NothingIsReplayedTwice) {
    Run("exact");
    PushFlag(false, At(0));
    LetPass(8, 5);
    PushFlag(true, At(5));
    LetPass(10, 5);
    for (const std::uint64_t frame : {5U, 6U, 7U, 8U, 9U}) {
        EXPECT_EQ(log_.Count("ST: [V]\t" + std::to_string(clock_.VideoRtp(frame))), 1U) << frame;
    }
}

TEST_F(ControllerExactTest, WithKeptRulesARecordingGetsNothingThatWentBy) {
    Run("kept");
    PushFlag(false, At(0));
    LetPass(8, 5);
    log_.Clear();
    PushFlag(true, At(5));
    EXPECT_EQ(LinesWith({"ST: [V]", "ST: [A]", "OP: IDR"}), Texts{});
}

TEST_F(ControllerExactTest, NothingIsReplayedOverAStopOfBuffering) {
    Run("exact");
    PushFlag(false, At(0));
    LetPass(8, 5);
    controller_.BufferingStop();
    log_.Clear();
    PushFlag(true, At(5));
    EXPECT_EQ(LinesWith({"ST: [V]", "ST: [A]"}), Texts{});
}

TEST_F(ControllerExactTest, NothingIsReplayedOverARestart) {
    Run("exact");
    PushFlag(true, At(0));
    LetPass(8, 5);
    RunEvent(std::make_shared<RestartStreamingEvent>(peer_.StreamBuffers().at(0)));
    PushFlag(false, At(5));
    log_.Clear();
    PushFlag(true, At(5));
    EXPECT_EQ(LinesWith({"ST: [V]", "ST: [A]"}), Texts{});
}

TEST_F(ControllerExactTest, NothingIsReplayedInTheNextLife) {
    Run("exact");
    PushFlag(false, At(0));
    LetPass(8, 5);
    controller_.Uninitialize();
    Run("exact");
    PushFlag(true, At(5));
    EXPECT_EQ(LinesWith({"ST: [V]", "ST: [A]"}), Texts{});
}

TEST_F(ControllerExactTest, NothingOfTheOldClockIsReplayedWhenTheCommandIsTheFirstOfTheNewOne) {
    Run("exact");
    PushFlag(false, 90000);
    controller_.PushVideo(stream_units::VideoUnit(1, 8100000, 90000, stream_units::kIdr));
    WaitUntilHanded(kVideo, 90000);
    log_.Clear();
    PushFlag(true, 1000);
    EXPECT_EQ(LinesWith({"ST: [V]", "ST: [A]"}), Texts{});
}

TEST_F(ControllerExactTest, WithoutAnyRecordNoUnitIsKeptForLongerThanThePreRoll) {
    Run("exact");
    const auto first = clock_.Video(0);
    controller_.PushVideo(first);
    WaitUntilHanded(kVideo, 0);
    EXPECT_GT(first.use_count(), 1);
    for (std::uint64_t n = 1; n <= 64; ++n) {
        controller_.PushVideo(clock_.Video(n));
        WaitUntilHanded(kVideo, n);
    }
    EXPECT_EQ(first.use_count(), 1);
}

TEST_F(ControllerExactTest, InOnModeNothingIsKept) {
    Run("exact", "on");
    const auto unit = clock_.Video(0);
    controller_.PushVideo(unit);
    WaitUntilHanded(kVideo, 0);
    EXPECT_EQ(unit.use_count(), 1);
}

// Media in step after units were dropped.

TEST_F(ControllerExactTest, ARestartedRecordingWaitsForWhatIsBehindAllThatWentByOrWasFlushed) {
    Run("exact");
    PushFlag(true, 1000);
    {
        HeldQueueThreads queues(peer_);
        ASSERT_TRUE(queues.WaitReached());
        ASSERT_TRUE(peer_.Queue(kVideo).Push(stream_units::VideoUnit(1, 93600, 1040)));
        ASSERT_TRUE(peer_.Queue(kAudio).Push(stream_units::AudioUnit(1, 50000, 1476)));
        ASSERT_TRUE(peer_.Queue(kMeta).Push(stream_units::MetaUnit(1, 97200, 1080)));
        RunEvent(std::make_shared<RestartStreamingEvent>(peer_.StreamBuffers().at(0)));
    }
    // The flushed audio frame at 1476 ms is the latest; one audio frame, 22 ms, behind it all media are
    // there.
    EXPECT_EQ(Recordings(), (Ranges{{1498 * 90, -1}}));
}

TEST_F(ControllerExactTest, WithKeptRulesARestartedRecordingWaitsForNothing) {
    Run("kept");
    PushFlag(true, 1000);
    RunEvent(std::make_shared<RestartStreamingEvent>(peer_.StreamBuffers().at(0)));
    EXPECT_EQ(Recordings(), (Ranges{{0, -1}}));
}

TEST_F(ControllerExactTest, ARestartedRecordingDoesNotWaitForAClockThatWasSetBack) {
    Run("exact");
    PushFlag(true, 90000);
    RunEvent(std::make_shared<RestartStreamingEvent>(peer_.StreamBuffers().at(0)));
    EXPECT_EQ(Recordings(), (Ranges{{90022 * 90, -1}}));
    controller_.PushVideo(stream_units::VideoUnit(1, 90 * 85022, 85022));
    WaitUntilHanded(kVideo, 85022);
    EXPECT_EQ(Recordings(), (Ranges{{90022 * 90, -1}}));
    controller_.PushVideo(stream_units::VideoUnit(2, 90 * 85021, 85021));
    WaitUntilHanded(kVideo, 85021);
    EXPECT_EQ(Recordings(), (Ranges{{0, -1}}));
}

TEST_F(ControllerExactTest, ARecordingThatBeginsAgainWhenTheHostIsBackStartsBehindWhatWentBy) {
    Run("exact");
    PushFlag(true, 1000);
    controller_.BufferingStop();
    controller_.PushAudio(stream_units::AudioUnit(1, 50000, 2000));
    WaitUntilHanded(kAudio, 2000);
    controller_.BufferingStart();
    EXPECT_EQ(Recordings(), (Ranges{{2022 * 90, -1}}));
}

TEST_F(ControllerExactTest, InOnModeARecordingStartsBehindWhatWentBy) {
    Run("exact", "on");
    controller_.PushAudio(stream_units::AudioUnit(1, 50000, 2000));
    WaitUntilHanded(kAudio, 2000);
    controller_.BufferingStart();
    EXPECT_EQ(LinesWith({"OP: REC START"}), Texts{"OP: REC START. 00:00:00:00. RTPTS = 0. -> -1"});
    EXPECT_EQ(Recordings(), (Ranges{{2022 * 90, -1}}));
}

TEST_F(ControllerExactTest, AClockBeyondTheRangeOfItsTicksWrapsAsWhereItIsCompared) {
    Run("exact", "on");
    constexpr std::uint64_t kFarAhead = std::uint64_t{1} << 63;
    controller_.PushAudio(stream_units::AudioUnit(1, 50000, kFarAhead));
    WaitUntilHanded(kAudio, kFarAhead);
    controller_.BufferingStart();
    // 2^63 times 90 is a multiple of 2^64: one audio frame is left.
    EXPECT_EQ(Recordings(), (Ranges{{22 * 90, -1}}));
}

TEST_F(ControllerExactTest, InOnModeARecordingInFrontOfTheStreamStartsAtItsBeginning) {
    Run("exact", "on");
    controller_.BufferingStart();
    EXPECT_EQ(Recordings(), (Ranges{{0, -1}}));
}

}  // namespace
}  // namespace clipfileModule
