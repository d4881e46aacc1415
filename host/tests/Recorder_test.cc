#include "Recorder.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "Logger.h"
#include "fakes/FakeSource.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;

/// Where the record flag stands in a metadata unit: behind packet byte, label, length, identifier, tag and
/// length.
constexpr std::size_t kFlagAt = 1 + 16 + 1 + 20 + 4;
constexpr std::uint64_t kOrigin = 900000;

/// A module that lets go of everything at once, writes down what comes, and says about recordings what the
/// real one says.
class ScriptedModule final : public QxModuleInterface,
                             public QxModuleStreamInterface,
                             public QxModuleNotifyInterface {
 public:
    bool Initialize(QxModuleHostInterface* host) override {
        host->SendTransmissionStatus({{"file_output_status", "standby"}});
        return true;
    }
    bool Uninitialize() override { return true; }
    bool Execute() override { return true; }
    bool GetModuleInterval(unsigned int*) override { return true; }
    bool ReservedOperationA() override { return true; }
    bool ReservedOperationB() override { return true; }
    bool GetStreamInterface(QxModuleStreamInterface** out) override {
        *out = this;
        return true;
    }
    bool GetNotifyInterface(QxModuleNotifyInterface** out) override {
        *out = this;
        return true;
    }
    int ReservedOperationC() override { return 0; }

    void PushReserved(const std::shared_ptr<StreamData>&) override {}
    void PushVideo(const std::shared_ptr<StreamData>& unit) override {
        Write("v", *unit, 3600);
        if (unit->payload != nullptr && kept_.size() < keeps) {
            kept_.push_back(unit);
        }
        if (unit->presentation_timestamp != 0) {
            shown.push_back((unit->presentation_timestamp - kOrigin) / 3600);
        }
    }
    void PushAudio(const std::shared_ptr<StreamData>& unit) override { Write("a", *unit, 1024); }
    void PushMeta(const std::shared_ptr<StreamData>& unit) override {
        if (unit->payload == nullptr) {
            Write("m", *unit, 3600);
            return;
        }
        const bool flag = unit->payload[kFlagAt] == 1;
        Write(flag ? "M" : "m", *unit, 3600);
        metas.emplace_back(unit->payload, unit->payload + unit->size);
        metaTimes.push_back(unit->rtp_timestamp);
        if (flag && !recording_) {
            Say("OP: REC START. 00:00:00:00. RTPTS = 0. -> -1");
        } else if (!flag && recording_ && !deaf) {
            Logger::Put(LOG_PRIORITY_TRACE, "a.cc", "clipfileModule::Controller::OnStopStream", 1, "end.");
            Say("OP: REMOVE STREAM. RTPTS = 0 -> 1.");
        }
        recording_ = flag;
    }

    std::uint32_t NotifyInputOutputConnectRequest(const QxInputOutputConnectRequest*) override { return 0; }
    std::uint32_t NotifyModuleConnectionRequestReply(const void*) override { return 0; }
    std::uint32_t NotifyInputOutputDisconnectionRequest(const QxInputOutputDisconnectionRequest*) override {
        return 0;
    }
    std::uint32_t NotifySetPropertiesRequest(const void*) override { return 0; }
    void NotifyOnlineStatus() override { calls.push_back("online"); }
    void NotifyOfflineStatus() override { calls.push_back("offline"); }

    /// Which frames of reordered ones are shown.
    std::vector<std::uint64_t> shown;
    /// Carries out no stop.
    bool deaf = false;
    /// Frames that it does not let go of.
    std::size_t keeps = 0;
    /// "v3": the fourth frame; "M3" and "m3" its metadata with and without record flag; "a2" the third audio
    /// frame; "v-" and so on a mark.
    std::vector<std::string> calls;
    std::vector<std::vector<unsigned char>> metas;
    std::vector<std::uint64_t> metaTimes;

    /// The calls but the marks.
    std::vector<std::string> Units() const {
        std::vector<std::string> units;
        for (const std::string& call : calls) {
            if (!call.ends_with('-')) {
                units.push_back(call);
            }
        }
        return units;
    }

 private:
    static void Say(const char* text) { Logger::Put(LOG_PRIORITY_OPERATOR, nullptr, nullptr, 0, "%s", text); }
    void Write(std::string name, const StreamData& unit, std::uint64_t duration) {
        const std::uint64_t origin = duration == 1024 ? 480000 : kOrigin;
        const auto time = static_cast<std::int64_t>(unit.rtp_timestamp - origin);
        name += unit.payload == nullptr ? "-"
                : time < 0              ? std::to_string(time)
                                        : std::to_string(static_cast<std::uint64_t>(time) / duration);
        calls.push_back(name);
    }

    bool recording_ = false;
    std::vector<std::shared_ptr<StreamData>> kept_;
};

class RecorderTest : public ::testing::Test {
 protected:
    Recorder& Make(const Recorder::Settings& settings) {
        recorder_.emplace(settings, session_, log_, plan_, commands_);
        return *recorder_;
    }
    static Recorder::Settings Sync() {
        Recorder::Settings settings;
        settings.frameRate = ParseFrameRate("25").value();
        settings.timecode = Timecode{10, 0, 0, 0, false};
        return settings;
    }
    static Recorder::Settings On() {
        Recorder::Settings settings = Sync();
        settings.mode = OutputMode::kOn;
        return settings;
    }
    void PutFrame(std::int64_t frame, bool keyFrame) {
        recorder_->Put(MakeFrame(frame * 3600, keyFrame, static_cast<std::uint32_t>(frame)));
    }
    /// Audio 1.9 s ahead, so that no frame waits for it; itself it comes after the frames of a test.
    void PutLateAudio() { recorder_->Put(MakeAudio(std::int64_t{1024} * 89)); }

    /// The last bytes of a metadata unit: those of the timecode, and what follows.
    std::vector<unsigned char> Tail(std::size_t unit, std::ptrdiff_t count) const {
        return {module_.metas.at(unit).end() - count, module_.metas.at(unit).end()};
    }

    /// A recording that begins with that frame, or ends in front of it.
    static Recorder::Change Begin(std::uint8_t frame) { return {true, Timecode{10, 0, 0, frame, false}}; }
    static Recorder::Change End(std::uint8_t frame) { return {false, Timecode{10, 0, 0, frame, false}}; }

    ScriptedModule module_;
    Host host_{{}};
    ModuleSession session_{module_, host_};
    ModuleLog log_;
    RecordPlan plan_{{}};
    CommandQueue commands_;
    std::optional<Recorder> recorder_;
};

TEST_F(RecorderTest, ReorderedPicturesAreDecodedAheadOfTheirTurnAndCountByIt) {
    Recorder::Settings settings = Sync();
    settings.reordering = 2;
    settings.length = 3 * 3600;
    Make(settings);
    PutLateAudio();
    // I0 P4 B2 b1 b3, and P8 B6 b5 b7.
    const std::int64_t later[] = {0, 3, 0, -2, -1, 3, 0, -2, -1};
    for (std::int64_t n = 0; n < 9; ++n) {
        SourceUnit frame = MakeFrame(n * 3600, n == 0, static_cast<std::uint32_t>(n));
        frame.later = later[n] * 3600;
        recorder_->Put(std::move(frame));
        // The end is in front of the third picture. What is shown there is decoded up to two later.
        EXPECT_EQ(recorder_->Done(), n >= 5) << n;
    }
    EXPECT_THAT(module_.calls,
                ElementsAre("M0", "v-7200", "M1", "v-3600", "M2", "v0", "m3", "v1", "m4", "v2", "m5", "v3"));
    EXPECT_THAT(module_.shown, ElementsAre(0, 4, 2, 1, 3, 8));
}

TEST_F(RecorderTest, WhereAReorderedPictureIsMissingNoneIsShownBeforeItsDecoding) {
    Recorder::Settings settings = Sync();
    settings.reordering = 2;
    Make(settings);
    PutLateAudio();
    // I0 P4 B2 b1 b3, P8 B6 b5 without b1: each has the turn of the next one that is shown.
    const std::pair<std::int64_t, std::int64_t> pictures[] = {{0, 0}, {2, 4}, {3, 2}, {4, 3},
                                                              {5, 8}, {6, 6}, {7, 5}};
    for (const auto& [turn, shown] : pictures) {
        SourceUnit frame = MakeFrame(turn * 3600, turn == 0, static_cast<std::uint32_t>(turn));
        frame.later = (shown - turn) * 3600;
        recorder_->Put(std::move(frame));
    }
    EXPECT_THAT(module_.calls, ElementsAre("M0", "v-7200", "M2", "v-3600", "M3", "v0", "M4", "v2", "M5", "v3",
                                           "M6", "v4", "M7", "v5"));
    EXPECT_THAT(module_.shown, ElementsAre(0, 4, 2, 3, 8, 6, 5));
}

TEST_F(RecorderTest, TimeOfDayIsThatAtWhichTheFirstFrameArrived) {
    Recorder::Settings settings = Sync();
    settings.timecode.reset();
    Make(settings);
    SourceUnit frame = MakeFrame(0, true, 0);
    frame.arrived = SourceUnit::Clock::now() - std::chrono::minutes(7);
    const double expected = SecondsOfDay(frame.arrived);
    recorder_->Put(std::move(frame));
    PutLateAudio();
    ASSERT_TRUE(recorder_->LastTimecode());
    const Timecode& timecode = *recorder_->LastTimecode();
    EXPECT_NEAR(timecode.hours * 3600 + timecode.minutes * 60 + timecode.seconds + timecode.frames / 25.0,
                expected, 0.1);
}

TEST_F(RecorderTest, EachFrameComesBehindItsMetadataAndAudioInItsPlace) {
    Make(Sync());
    PutFrame(0, true);
    PutFrame(1, false);
    // 21.3 ms, 42.7 ms and 64 ms; the second frame is at 40 ms.
    for (std::int64_t audio = 1; audio <= 3; ++audio) {
        recorder_->Put(MakeAudio(audio * 1024));
    }
    PutFrame(2, false);
    EXPECT_THAT(module_.Units(), ElementsAre("M0", "v0", "a1", "M1", "v1", "a2", "a3"));
}

// The module keeps what went by lately, and needs the audio in front of a recording.
TEST_F(RecorderTest, EverythingIsPushedAlsoWhileNothingIsRecorded) {
    Make(Sync());
    recorder_->Put(MakeAudio(-100));
    PutLateAudio();
    PutFrame(0, false);
    PutFrame(1, true);
    EXPECT_THAT(module_.Units(), ElementsAre("a-100", "m0", "v0", "M1", "v1"));
    EXPECT_THAT(recorder_->TakeChanges(), ElementsAre(Begin(1)));
}

TEST_F(RecorderTest, TheUnitOfAFrameHoldsItsTimecodeAndThePacketsSinceTheLastOne) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 1000, {0xAA}));
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 3600, {0xBB}));
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 3601, {0xCC}));
    PutFrame(1, false);
    PutFrame(2, false);
    ASSERT_EQ(module_.metas.size(), 3u);
    EXPECT_THAT(Tail(0, 5), ElementsAre(10, 0, 0, 0, 0));
    EXPECT_THAT(Tail(1, 9), ElementsAre(10, 0, 0, 1, 0, 0x01, 0xAA, 0x01, 0xBB));
    EXPECT_THAT(Tail(2, 7), ElementsAre(10, 0, 0, 2, 0, 0x01, 0xCC));
}

TEST_F(RecorderTest, TheSourcesTimecodeGoesBeforeTheOperators) {
    Make(Sync());
    PutLateAudio();
    SourceUnit frame = MakeFrame(0, true, 0);
    frame.timecode = Timecode{1, 2, 3, 4, false};
    recorder_->Put(frame);
    EXPECT_EQ(recorder_->LastTimecode(), (Timecode{1, 2, 3, 4, false}));
}

TEST_F(RecorderTest, AGapEndsTheRecordingAndTheNextIdrFrameBeginsAnother) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    PutFrame(1, false);
    PutFrame(20, false);
    PutFrame(25, true);
    // The first stop is that of the frame behind the last one.
    EXPECT_THAT(module_.Units(), ElementsAre("M0", "v0", "M1", "v1", "m2", "m20", "v20", "M25", "v25"));
    EXPECT_EQ(recorder_->LastTimecode(), (Timecode{10, 0, 1, 0, false}));
    EXPECT_THAT(recorder_->TakeChanges(),
                ElementsAre(Begin(0), End(2), Recorder::Change{true, Timecode{10, 0, 1, 0, false}}));
    EXPECT_EQ(recorder_->Recorded(), 3u);
}

// The flag goes off between the two frames, so that no unit is in both recordings or in none.
TEST_F(RecorderTest, ASplitEndsTheRecordingInFrontOfTheIdrFrameThatBeginsTheNext) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    std::future<CommandResult> split = commands_.Post(RecordCommand::kSplit);
    PutFrame(1, false);
    PutFrame(2, true);
    PutFrame(3, false);
    EXPECT_THAT(module_.Units(), ElementsAre("M0", "v0", "M1", "v1", "m1", "M2", "v2", "M3", "v3"));
    EXPECT_EQ(module_.metaTimes[2], kOrigin + 2 * 3600 - 1);
    EXPECT_EQ(split.get(), (CommandResult{Timecode{10, 0, 0, 2, false}, {}}));
    recorder_->NoteEnd();
    EXPECT_THAT(recorder_->TakeChanges(), ElementsAre(Begin(0), End(2), Begin(2), End(4)));
    EXPECT_EQ(recorder_->Recorded(), 4u);
}

TEST_F(RecorderTest, CommandsTakeEffectWithTheVeryNextFrame) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    std::future<CommandResult> stop = commands_.Post(RecordCommand::kStop);
    std::future<CommandResult> start = commands_.Post(RecordCommand::kStart);
    PutFrame(1, false);
    PutFrame(2, true);
    EXPECT_THAT(module_.Units(), ElementsAre("M0", "v0", "m1", "v1", "M2", "v2"));
    EXPECT_EQ(stop.get().at, (Timecode{10, 0, 0, 1, false}));
    EXPECT_EQ(start.get().at, (Timecode{10, 0, 0, 2, false}));
}

TEST_F(RecorderTest, AStopThatTheModuleDoesNotCarryOutIsCountedAndHoldsNothingUp) {
    module_.deaf = true;
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    plan_.Stop();
    PutFrame(1, false);
    EXPECT_EQ(recorder_->LateStops(), 0u);
    PutFrame(2, false);
    EXPECT_EQ(module_.Units().back(), "v2");
    recorder_->Close();
    EXPECT_EQ(recorder_->LateStops(), 1u);
}

TEST_F(RecorderTest, AStopThatTheModuleCarriesOutIsNotLate) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    plan_.Stop();
    PutFrame(1, false);
    recorder_->Close();
    EXPECT_EQ(recorder_->LateStops(), 0u);
}

TEST_F(RecorderTest, AStopIsMissedAlsoWhereAnEarlierRecorderOfTheRunHadItsOwn) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    plan_.Stop();
    PutFrame(1, false);
    recorder_->Close();
    module_.deaf = true;
    plan_.Start();
    Make(Sync());
    PutLateAudio();
    PutFrame(2, true);
    plan_.Stop();
    PutFrame(3, false);
    recorder_->Close();
    EXPECT_EQ(recorder_->LateStops(), 1u);
}

// While the source is away nothing of its own reaches the end of the recording, which the module awaits.
TEST_F(RecorderTest, ASourceThatIsAwayEndsTheRecordingBehindItsLastFrame) {
    Make(Sync());
    PutFrame(0, true);
    PutFrame(1, false);
    recorder_->Put(MakeAudio(0));
    recorder_->Put(MakeAudio(1024));
    recorder_->Interrupt();
    EXPECT_THAT(module_.Units(), ElementsAre("M0", "v0", "a0", "a1", "M1", "v1", "m2", "a2", "a3", "v2"));
    // The place where it stopped, which lies behind its last frame.
    EXPECT_THAT(recorder_->TakeChanges(), ElementsAre(Begin(0), End(2)));
    recorder_->Interrupt();
    EXPECT_EQ(module_.Units().size(), 10u);
}

TEST_F(RecorderTest, PacketsWhosePictureAnOutageTookAreDroppedAndCounted) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 3600, {0xAA}));
    recorder_->Interrupt();
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 45 * 3600, {0xBB}));
    PutFrame(45, true);
    // The stop stands between the two frames.
    ASSERT_EQ(module_.metas.size(), 3u);
    EXPECT_THAT(Tail(2, 7), ElementsAre(10, 0, 1, 20, 0, 0x01, 0xBB));
    EXPECT_EQ(module_.metas[2].size(), module_.metas[0].size() + 2);
    EXPECT_EQ(recorder_->Past().droppedPackets, 1u);
}

TEST_F(RecorderTest, OfThePacketsInAGapOnlyThoseOfThePictureBehindItAreKept) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 3600, {0xAA}));
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 24 * 3600, {0xBB}));
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 24 * 3600 + 1, {0xCC}));
    PutFrame(25, true);
    ASSERT_EQ(module_.metas.size(), 3u);
    EXPECT_THAT(Tail(2, 7), ElementsAre(10, 0, 1, 0, 0, 0x01, 0xCC));
    EXPECT_EQ(module_.metas[2].size(), module_.metas[0].size() + 2);
    EXPECT_EQ(recorder_->Past().droppedPackets, 2u);
}

TEST_F(RecorderTest, PacketsOfNoRecordingAreDroppedWithoutALoss) {
    plan_.Stop();
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 3600, {0xAA}));
    recorder_->Interrupt();
    PutFrame(45, true);
    ASSERT_EQ(module_.metas.size(), 2u);
    EXPECT_EQ(module_.metas[1].size(), module_.metas[0].size());
    EXPECT_EQ(recorder_->Past().droppedPackets, 0u);
}

// The module may write one frame of audio more than there is in front of the gap.
TEST_F(RecorderTest, SilenceStandsInFrontOfTheAudioBehindAGap) {
    Make(Sync());
    PutFrame(0, true);
    PutFrame(1, false);
    recorder_->Put(MakeAudio(0));
    recorder_->Put(MakeAudio(1024));
    PutFrame(20, true);
    // Half a frame before that picture.
    SourceUnit behind = MakeAudio(20 * 1920 - 512);
    behind.passed = 18 * 1920;
    recorder_->Put(std::move(behind));
    PutLateAudio();
    EXPECT_THAT(module_.Units(),
                ElementsAre("M0", "v0", "a0", "a1", "M1", "v1", "m2", "a2", "a3", "a37", "M20", "v20"));
}

TEST_F(RecorderTest, AStopThatFindsTheSourceGoneHasEndedTheRecordingBehindItsLastFrame) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    PutFrame(1, false);
    std::future<CommandResult> stop = commands_.Post(RecordCommand::kStop);
    commands_.Apply(plan_);
    recorder_->Interrupt();
    PutFrame(50, true);
    EXPECT_EQ(stop.get(), (CommandResult{Timecode{10, 0, 0, 2, false}, {}}));
}

TEST_F(RecorderTest, AStopBehindTheLastFrameOfTheStreamHasEndedTheRecordingThere) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    std::future<CommandResult> stop = commands_.Post(RecordCommand::kStop);
    commands_.Apply(plan_);
    recorder_->NoteEnd();
    commands_.Close("over");
    EXPECT_EQ(stop.get(), (CommandResult{Timecode{10, 0, 0, 1, false}, {}}));
}

/// A picture of 1920 samples is missing, and the source has left out one frame of audio of 1024 for it.
TEST_F(RecorderTest, AudioThatAGapInThePicturesLeavesOverIsLeftOutWhereItIsMoreThanHalfAFrame) {
    Recorder& recorder = Make(Sync());
    for (const std::int64_t frame : {0, 1, 3, 4, 5}) {
        PutFrame(frame, frame == 0);
    }
    for (const std::int64_t audio : {0, 1, 2, 3, 5, 6, 7, 8, 9, 10}) {
        SourceUnit unit = MakeAudio(audio * 1024);
        unit.passed = audio == 5 ? 1920 : 0;
        recorder.Put(std::move(unit));
    }
    EXPECT_THAT(module_.Units(), ElementsAre("M0", "v0", "a0", "a1", "M1", "v1", "a2", "a3", "M3", "v3", "a6",
                                             "a7", "M4", "v4", "a8", "a9", "M5", "v5"));
}

TEST_F(RecorderTest, HalfASecondIsNoGap) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    PutFrame(12, false);
    EXPECT_THAT(module_.Units(), ElementsAre("M0", "v0", "M12", "v12"));
}

TEST_F(RecorderTest, TheLengthEndsTheRunWithTheFirstFrameBeyondIt) {
    Recorder::Settings settings = Sync();
    settings.length = 2 * 3600;
    Make(settings);
    PutLateAudio();
    PutFrame(0, true);
    PutFrame(1, false);
    EXPECT_FALSE(recorder_->Finishing());
    EXPECT_FALSE(recorder_->Done());
    PutFrame(2, true);
    EXPECT_THAT(module_.Units(), ElementsAre("M0", "v0", "M1", "v1", "m2", "v2"));
    EXPECT_TRUE(recorder_->Finishing());
    EXPECT_TRUE(recorder_->Done());
    EXPECT_EQ(recorder_->Elapsed(), 2 * 3600);
}

TEST_F(RecorderTest, AFinishTakesEffectWithTheNextFrame) {
    Make(Sync());
    PutLateAudio();
    PutFrame(0, true);
    recorder_->Finish();
    EXPECT_FALSE(recorder_->Done());
    PutFrame(1, false);
    EXPECT_TRUE(recorder_->Done());
}

TEST_F(RecorderTest, InModeOnTheHostIsOnlineWithTheFirstIdrFrameAndTheAudioInFrontOfIt) {
    Make(On());
    recorder_->Put(MakeAudio(0));
    PutFrame(0, false);
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 0, {0xAA}));
    recorder_->Put(MakeAudio(1024));
    PutFrame(1, true);
    recorder_->Put(MakeAudio(2048));
    EXPECT_THAT(module_.Units(), ElementsAre("online", "a1", "M1", "v1"));
    recorder_->Put(MakeAudio(3072));
    PutFrame(2, false);
    EXPECT_THAT(module_.Units(), ElementsAre("online", "a1", "M1", "v1", "a2", "a3"));
}

TEST_F(RecorderTest, InModeOnTheRunEndsWithTheLastFrameBeforeTheEnd) {
    Make(On());
    PutLateAudio();
    PutFrame(0, true);
    PutFrame(1, false);
    recorder_->Finish();
    EXPECT_FALSE(recorder_->Done());
    PutFrame(2, false);
    EXPECT_TRUE(recorder_->Done());
    PutFrame(3, true);
    EXPECT_THAT(module_.Units(), ElementsAre("online", "M0", "v0", "M1", "v1"));
}

TEST_F(RecorderTest, InModeOnAGapEndsTheRecordingAndWhatFollowsIsForAnotherRecorder) {
    Make(On());
    PutFrame(0, true);
    PutFrame(1, false);
    recorder_->Put(MakeAudio(0));
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 72000, {0xAA}));
    PutFrame(20, false);
    PutFrame(21, true);
    recorder_->Put(MakeAudio(20 * 1920 - 512));
    EXPECT_FALSE(recorder_->EndedByGap());
    PutLateAudio();
    EXPECT_TRUE(recorder_->EndedByGap());
    recorder_->Close();
    recorder_->NoteEnd();
    EXPECT_THAT(module_.Units(), ElementsAre("online", "M0", "v0", "a0", "M1", "v1", "a1", "a2"));
    EXPECT_THAT(recorder_->TakeChanges(), ElementsAre(Begin(0), End(2)));

    Recorder::Settings settings = On();
    settings.past = recorder_->Past();
    const std::vector<SourceUnit> rest = recorder_->TakeRest();
    std::vector<std::pair<Medium, std::int64_t>> kept;
    for (const SourceUnit& unit : rest) {
        kept.emplace_back(unit.medium, unit.time);
    }
    EXPECT_THAT(kept, ElementsAre(std::pair(Medium::kKlv, 72000), std::pair(Medium::kAudio, 37888),
                                  std::pair(Medium::kVideo, 72000), std::pair(Medium::kVideo, 75600),
                                  std::pair(Medium::kAudio, 1024 * 89)));
    Make(settings);
    for (const SourceUnit& unit : rest) {
        recorder_->Put(unit);
    }
    EXPECT_FALSE(recorder_->EndedByGap());
    EXPECT_THAT(recorder_->TakeChanges(), ElementsAre(Begin(21)));
    EXPECT_EQ(recorder_->Recorded(), 3u);
}

TEST_F(RecorderTest, InModeOnASourceThatIsAwayEndsTheRecording) {
    Make(On());
    PutFrame(0, true);
    recorder_->Put(MakeAudio(0));
    recorder_->Interrupt();
    EXPECT_TRUE(recorder_->EndedByGap());
    EXPECT_THAT(module_.Units(), ElementsAre("online", "M0", "v0", "a0", "a1", "a2"));
}

TEST_F(RecorderTest, InModeOnPacketsWhosePictureAnOutageTookAreDroppedAndCountedOverTheWholeRun) {
    Make(On());
    PutLateAudio();
    PutFrame(0, true);
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 3600, {0xAA}));
    recorder_->Interrupt();
    EXPECT_EQ(recorder_->Past().droppedPackets, 1u);
    Recorder::Settings settings = On();
    settings.past = recorder_->Past();
    for (const SourceUnit& unit : recorder_->TakeRest()) {
        EXPECT_NE(unit.medium, Medium::kKlv);
    }
    EXPECT_EQ(Make(settings).Past().droppedPackets, 1u);
}

// Silence ends the recording once.
TEST_F(RecorderTest, InModeOnASourceThatIsAwayBehindAGapLeavesWhatIsBehindItToTheNextRecorder) {
    Make(On());
    PutFrame(0, true);
    recorder_->Put(MakeAudio(0));
    // Waits for audio of its time.
    PutFrame(20, true);
    recorder_->Put(MakeSourceUnit(Medium::kKlv, 21 * 3600, {0xAA}));
    recorder_->Interrupt();
    EXPECT_TRUE(recorder_->EndedByGap());
    EXPECT_THAT(module_.Units(), ElementsAre("online", "M0", "v0", "a0", "a1", "a2"));
    const std::vector<SourceUnit> rest = recorder_->TakeRest();
    ASSERT_EQ(rest.size(), 2u);
    EXPECT_EQ(rest[0].time, 20 * 3600);
    EXPECT_EQ(rest[1].medium, Medium::kKlv);
}

// The source goes on meanwhile.
TEST_F(RecorderTest, InModeOnAGapWaitsForASlowDiskForAShorterTimeThanTheEnd) {
    EXPECT_EQ(Recorder::Settings{}.diskPatience, std::chrono::seconds(30));
    EXPECT_EQ(Recorder::Settings{}.gapPatience, std::chrono::seconds(5));
    // Frames that are held although a later one is not are chunks that wait.
    module_.keeps = 4;
    int asked = 0;
    Recorder::Settings settings = On();
    settings.gapPatience = 2 * StreamFeed::kMeanwhile;
    settings.meanwhile = [&asked] { ++asked; };
    Make(settings);
    PutLateAudio();
    for (std::int64_t frame = 0; frame <= 4; ++frame) {
        PutFrame(frame, frame == 0);
    }
    PutFrame(20, true);
    ASSERT_TRUE(recorder_->EndedByGap());
    recorder_->Close();
    EXPECT_GE(asked, 1);
    EXPECT_LE(asked, 2);
}

// What is still in there is lost when the host goes offline.
TEST_F(RecorderTest, TheEndWaitsForTheQueuesOfTheModule) {
    Make(Sync());
    PutFrame(0, true);
    recorder_->Close();
    EXPECT_THAT(module_.calls, ElementsAre("M0", "v0", "v-", "a-", "m-"));
}

}  // namespace
}  // namespace receiver
