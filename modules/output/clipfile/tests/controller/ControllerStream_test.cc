#include <gtest/gtest.h>

#include <algorithm>
#include <functional>
#include <memory>
#include <optional>
#include <string>
#include <thread>
#include <vector>

#include "LogCapture.h"
#include "buffer/StreamBuffer.h"
#include "controller/Controller.h"
#include "support/ControllerPeer.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/FileOutputRecorder.h"
#include "support/HeldQueueThreads.h"
#include "support/LogLines.h"
#include "support/SettleEventLoop.h"
#include "support/StreamUnits.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

using stream_units::MetaFields;
using stream_units::MetaUnit;
using stream_units::Timecode;
using Texts = std::vector<std::string>;

constexpr std::size_t kVideo = 0;
constexpr std::size_t kAudio = 1;
constexpr std::size_t kMeta = 2;

MetaFields recFlag(bool on, std::optional<Timecode> timecode = std::nullopt) {
    return {on, timecode};
}

/// A controller that runs in the mode of the test, with file outputs that only record what they are given.
class ControllerStreamTest : public testing::Test {
 protected:
    ControllerStreamTest() { registry_.Set("MP4OutputPath", "a"); }

    void Run(const std::string& outputMode, const std::string& naluType = "normal") {
        host_.texts["-outputMode"] = outputMode;
        host_.texts["-naluType"] = naluType;
        log_.Clear();
        ASSERT_TRUE(controller_.Initialize(&host_));
        running_ = true;
        ASSERT_TRUE(settleEventLoop(controller_, host_, log_));
        log_.Clear();
    }
    void TearDown() override {
        if (running_) {
            controller_.Uninitialize();
        }
    }
    /// Posts an event and waits until it and all before it have run.
    void RunEvent(std::shared_ptr<Event> event) {
        controller_.PostEvent(std::move(event));
        const FakeHost::StatusMap behind = {{"behind", std::to_string(++events_)}};
        controller_.PostEvent(std::make_shared<TransferStatusNotifyEvent>(behind));
        ASSERT_TRUE(waitUntil([&] {
            const auto sent = host_.Transmissions();
            return std::find(sent.begin(), sent.end(), behind) != sent.end();
        }));
    }
    /// Puts two units into each queue, whose threads are held.
    void FillQueues() {
        for (const std::size_t queue : {kVideo, kAudio, kMeta}) {
            ASSERT_TRUE(peer_.Queue(queue).Push(MetaUnit(2, 180, 2, recFlag(true))));
            ASSERT_TRUE(peer_.Queue(queue).Push(MetaUnit(3, 270, 3, recFlag(true))));
            ASSERT_EQ(peer_.Queue(queue).Size(), 2U);
        }
    }
    void ExpectEmptyQueues() {
        for (const std::size_t queue : {kVideo, kAudio, kMeta}) {
            EXPECT_EQ(peer_.Queue(queue).Size(), 0U);
        }
    }
    /// Pushes metadata units and waits until the last of them was handed to the recordings.
    void PushMeta(const std::shared_ptr<StreamData>& unit) {
        controller_.PushMeta(unit);
        ASSERT_TRUE(waitUntil([&] { return unit.use_count() == 1 || Handed(unit); }));
    }
    bool Handed(const std::shared_ptr<StreamData>& unit) {
        return log_.Contains("ST: [M]\t" + std::to_string(unit->rtp_timestamp));
    }
    std::size_t CountLines(const std::string& operation, const std::string& text) {
        return log_.CountIf([&](const CapturedLine& line) {
            return line.function == controllerFunction(operation) && line.text == text;
        });
    }
    /// Texts that `operation` logged, each checked for priority and source.
    Texts TextsOf(const std::string& operation) {
        Texts texts;
        for (const CapturedLine& line : log_.Lines()) {
            if (line.function == controllerFunction(operation)) {
                EXPECT_EQ(line.priority, LOG_PRIORITY_TRACE) << line;
                EXPECT_EQ(line.file,
                          "modules/output/clipfile/src/clipfileModule/controller/ControllerStream.cc")
                    << line;
                texts.push_back(line.text);
            }
        }
        return texts;
    }
    /// The operator lines of record commands, each checked for priority and its missing place.
    Texts RecordLines() {
        Texts texts;
        for (const CapturedLine& line : log_.Lines()) {
            if (line.text.rfind("OP: RE", 0) == 0) {
                EXPECT_EQ(line.priority, LOG_PRIORITY_OPERATOR) << line;
                EXPECT_EQ(line.file, std::nullopt) << line;
                EXPECT_EQ(line.function, std::nullopt) << line;
                EXPECT_EQ(line.line, 0) << line;
                texts.push_back(line.text);
            }
        }
        return texts;
    }
    std::vector<std::pair<std::int64_t, std::int64_t>> Recordings() {
        std::vector<std::pair<std::int64_t, std::int64_t>> result;
        for (const auto& buffer : peer_.StreamBuffers()) {
            result.emplace_back(buffer->GetStartTimestamp(), buffer->GetStopTimestamp());
        }
        return result;
    }
    using Ranges = std::vector<std::pair<std::int64_t, std::int64_t>>;

    LogCapture log_;
    FakeRegistry registry_;
    FileOutputRecorder outputs_;
    FakeHost host_;
    Controller controller_;
    ControllerPeer peer_{controller_};
    bool running_ = false;
    int events_ = 0;
};

// Intake.

TEST_F(ControllerStreamTest, PushReservedHasNoEffectOnAnyQueue) {
    Run("off");
    MutexLock held(peer_.StreamBuffersMutex());
    const auto unit = MetaUnit(1, 90, 1);
    controller_.PushReserved(unit);
    EXPECT_EQ(unit.use_count(), 1);
    ExpectEmptyQueues();
}

TEST_F(ControllerStreamTest, The51stUnitOfAHeldUpQueueIsRefusedAndLoggedAndThe50BeforeArriveInOrder) {
    Run("on");
    controller_.BufferingStart();
    struct Medium {
        std::size_t queue;
        void (Controller::*push)(const std::shared_ptr<StreamData>&);
        const char* operation;
        const char* overflow;
        std::string statistics;
    };
    const Medium media[] = {
        {kVideo, &Controller::PushVideo, "PushVideo", "queue overflow (video)", "ST: [V]\t"},
        {kAudio, &Controller::PushAudio, "PushAudio", "queue overflow (audio)", "ST: [A]\t"},
        {kMeta, &Controller::PushMeta, "PushMeta", "queue overflow (meta)", "ST: [M]\t"},
    };
    for (const Medium& medium : media) {
        log_.Clear();
        Texts expected;
        {
            MutexLock held(peer_.StreamBuffersMutex());
            // The queue thread takes the first unit and stands in front of the recordings with it.
            (controller_.*medium.push)(MetaUnit(0, 0, 0));
            expected.push_back(medium.statistics + "0");
            ASSERT_TRUE(waitUntil([&] { return peer_.Queue(medium.queue).Size() == 0; }));
            for (std::uint64_t i = 1; i <= 50; ++i) {
                (controller_.*medium.push)(MetaUnit(i, i, 0));
                expected.push_back(medium.statistics + std::to_string(i));
            }
            EXPECT_EQ(log_.CountIf([&](const CapturedLine& line) { return line.text == medium.overflow; }),
                      0U);
            (controller_.*medium.push)(MetaUnit(51, 51, 0));
            EXPECT_EQ(log_.Count(LOG_PRIORITY_WARNING, controllerFunction(medium.operation).c_str(),
                                 medium.overflow),
                      1U);
        }
        ASSERT_TRUE(log_.WaitForText(expected.back()));
        Texts handed;
        for (const CapturedLine& line : log_.Lines()) {
            if (line.text.rfind(medium.statistics, 0) == 0) {
                handed.push_back(line.text);
            }
        }
        EXPECT_EQ(handed, expected);
    }
    EXPECT_EQ(host_.Statuses(), (std::vector<FakeHost::Status>{{4, 0}}));
}

TEST_F(ControllerStreamTest, WithStatus7UnitsAreDroppedWithoutALine) {
    Run("sync");
    host_.ForceStatus(7);
    log_.Clear();
    const auto unit = MetaUnit(1, 90, 1, recFlag(true));
    controller_.PushVideo(unit);
    controller_.PushAudio(unit);
    controller_.PushMeta(unit);
    EXPECT_EQ(unit.use_count(), 1);
    EXPECT_TRUE(log_.Lines().empty());
}

TEST_F(ControllerStreamTest, AUnitWithoutPayloadReachesNoRecording) {
    Run("sync");
    PushMeta(MetaUnit(1, 90, 1, recFlag(true)));
    log_.Clear();
    const auto empty = std::make_shared<StreamData>();
    controller_.PushVideo(empty);
    controller_.PushAudio(empty);
    controller_.PushMeta(empty);
    ASSERT_TRUE(waitUntil([&] { return empty.use_count() == 1; }));
    EXPECT_EQ(log_.CountIf([](const CapturedLine& line) { return line.text.rfind("ST: [", 0) == 0; }), 0U);
}

TEST_F(ControllerStreamTest, APictureInDecodingOrderThatCannotBeShownWhenItSaysIsToldOnceALife) {
    for (int life = 0; life < 2; ++life) {
        host_.texts["-pictureOrder"] = "decoding";
        Run("on");
        for (const std::uint64_t rtp : {180000, 183600, 187200}) {
            const auto unit = stream_units::VideoUnit(1, rtp, rtp / 90);
            unit->presentation_timestamp = rtp == 180000 ? rtp : 0;
            controller_.PushVideo(unit);
        }
        ASSERT_TRUE(log_.WaitForText(
            "presentation_timestamp 0 of rtp_timestamp 183600 is not followed. shown when decoded."));
        controller_.Uninitialize();
        running_ = false;
        EXPECT_EQ(log_.CountIf([](const CapturedLine& line) {
            return line.text.starts_with("presentation_timestamp ");
        }),
                  1U);
        EXPECT_EQ(
            log_.Find("presentation_timestamp 0 of rtp_timestamp 183600 is not followed. shown when decoded.")
                ->priority,
            LOG_PRIORITY_WARNING);
    }
}

TEST_F(ControllerStreamTest, InTheOrderOfShowingNoPictureHasToSayWhenItIsShown) {
    Run("on");
    const auto unit = stream_units::VideoUnit(1, 180000, 2000);
    controller_.PushVideo(unit);
    ASSERT_TRUE(waitUntil([&] { return unit.use_count() == 1; }));
    EXPECT_EQ(log_.CountIf(
                  [](const CapturedLine& line) { return line.text.starts_with("presentation_timestamp "); }),
              0U);
}

// Record flag.

TEST_F(ControllerStreamTest, AFirstMetadataUnitWithTheFlagOnStartsARecordingAndReachesIt) {
    Run("sync");
    PushMeta(MetaUnit(1, 180000, 2000, recFlag(true, Timecode{1, 2, 3, 4})));
    EXPECT_EQ(RecordLines(),
              (Texts{"OP: REC FLAG OFF -> ON.", "OP: REC START. 01:02:03:04. RTPTS = 180000. -> -1"}));
    EXPECT_EQ(Recordings(), (Ranges{{180000, -1}}));
    EXPECT_TRUE(log_.Contains("ST: [M]\t180000"));
    EXPECT_EQ(TextsOf("StartStream"), (Texts{"start.", "end."}));
}

TEST_F(ControllerStreamTest, AFirstMetadataUnitWithTheFlagOffOnlyLogsAndPostsAStopThatFindsNothing) {
    Run("sync");
    controller_.PushMeta(MetaUnit(1, 180000, 2000, recFlag(false, Timecode{1, 2, 3, 4})));
    ASSERT_TRUE(waitUntil([&] { return CountLines("OnStopStream", "end.") == 1; }));
    EXPECT_EQ(RecordLines(), Texts{"OP: REC FLAG ON -> OFF."});
    EXPECT_EQ(TextsOf("StopStream"), (Texts{"start.", "end."}));
    EXPECT_TRUE(Recordings().empty());
}

TEST_F(ControllerStreamTest, WithoutATimecodeTheStartLineShowsZeros) {
    Run("sync");
    PushMeta(MetaUnit(1, 180000, 2000, recFlag(true)));
    EXPECT_EQ(RecordLines().back(), "OP: REC START. 00:00:00:00. RTPTS = 180000. -> -1");
}

TEST_F(ControllerStreamTest, TheFlagActsOnlyWhenItChanges) {
    Run("sync");
    for (std::uint64_t i = 1; i <= 3; ++i) {
        PushMeta(MetaUnit(i, i * 90, i, recFlag(true)));
    }
    EXPECT_EQ(Recordings(), (Ranges{{90, -1}}));
    EXPECT_EQ(log_.Count("OP: REC FLAG OFF -> ON."), 1U);
}

TEST_F(ControllerStreamTest, TheFlagOffStopsTheRecordingThroughTheEventThread) {
    Run("sync");
    PushMeta(MetaUnit(1, 180000, 2000, recFlag(true)));
    {
        auto gate = log_.BlockAt(
            [](const CapturedLine& line) { return line.function == controllerFunction("OnStopStream"); });
        PushMeta(MetaUnit(2, 270000, 3000, recFlag(false, Timecode{23, 59, 59, 24})));
        ASSERT_TRUE(gate.WaitReached());
        // The metadata thread has gone on; the stop waits for the event thread.
        EXPECT_EQ(Recordings(), (Ranges{{180000, -1}}));
    }
    ASSERT_TRUE(waitUntil([&] { return CountLines("OnStopStream", "end.") == 1; }));
    EXPECT_EQ(Recordings(), (Ranges{{180000, 270000}}));
    EXPECT_EQ(RecordLines().back(), "OP: REC STOP. 23:59:59:24. RTPTS = 180000 -> 270000.");
    EXPECT_EQ(TextsOf("OnStopStream"), (Texts{"start.", "end."}));
}

TEST_F(ControllerStreamTest, AStopWithoutATimecodeLeavesItOut) {
    Run("sync");
    PushMeta(MetaUnit(1, 180000, 2000, recFlag(true)));
    PushMeta(MetaUnit(2, 270000, 3000, recFlag(false)));
    ASSERT_TRUE(waitUntil([&] { return CountLines("OnStopStream", "end.") == 1; }));
    EXPECT_EQ(RecordLines().back(), "OP: REC STOP. RTPTS = 180000 -> 270000.");
}

TEST_F(ControllerStreamTest, AStopWithAnEmptyUnitIsHandled) {
    Run("sync");
    RunEvent(std::make_shared<StopStreamingEvent>(std::make_shared<StreamData>()));
    EXPECT_EQ(TextsOf("StopStream"), (Texts{"start.", "end."}));
}

TEST_F(ControllerStreamTest, AStopDoesNotTouchARecordingThatHasItsStop) {
    Run("sync");
    PushMeta(MetaUnit(1, 180000, 2000, recFlag(true)));
    RunEvent(std::make_shared<StopStreamingEvent>(MetaUnit(2, 270000, 3000)));
    RunEvent(std::make_shared<StopStreamingEvent>(MetaUnit(3, 360000, 4000)));
    EXPECT_EQ(Recordings(), (Ranges{{180000, 270000}}));
}

TEST_F(ControllerStreamTest, ASecondStartClosesTheOpenRecordingAtItsOwnStartAndBothCoexist) {
    Run("sync");
    PushMeta(MetaUnit(1, 180000, 2000, recFlag(true)));
    RunEvent(std::make_shared<StartStreamingEvent>(
        MetaUnit(2, 270000, 3000, {std::nullopt, Timecode{9, 8, 7, 6}})));
    EXPECT_EQ(Recordings(), (Ranges{{180000, 270000}, {270000, -1}}));
    EXPECT_EQ(RecordLines().back(), "OP: REC START. 09:08:07:06. RTPTS = 270000. -> -1");
    EXPECT_EQ(TextsOf("OnStartStream"), (Texts{"start.", "end."}));
}

TEST_F(ControllerStreamTest, AStartLeavesTheStopOfAClosedRecordingAlone) {
    Run("sync");
    PushMeta(MetaUnit(1, 180000, 2000, recFlag(true)));
    RunEvent(std::make_shared<StopStreamingEvent>(MetaUnit(2, 270000, 3000)));
    RunEvent(std::make_shared<StartStreamingEvent>(MetaUnit(3, 360000, 4000)));
    EXPECT_EQ(Recordings(), (Ranges{{180000, 270000}, {360000, -1}}));
}

TEST_F(ControllerStreamTest, AnyOtherOutputModeRecordsNothingAndNeverReadsTheFlag) {
    for (const char* mode : {"off", "", "ON", "Sync"}) {
        Run(mode);
        const auto unit = MetaUnit(1, 180000, 2000, recFlag(true));
        controller_.PushMeta(unit);
        // The metadata thread has let go of it.
        ASSERT_TRUE(waitUntil([&] { return unit.use_count() == 1; }));
        controller_.BufferingStart();
        EXPECT_TRUE(Recordings().empty()) << mode;
        EXPECT_TRUE(RecordLines().empty()) << mode;
        controller_.Uninitialize();
        running_ = false;
    }
}

TEST_F(ControllerStreamTest, InOnModeTheFlagIsNotRead) {
    Run("on");
    const auto unit = MetaUnit(1, 180000, 2000, recFlag(true));
    controller_.PushMeta(unit);
    ASSERT_TRUE(waitUntil([&] { return unit.use_count() == 1; }));
    EXPECT_TRUE(RecordLines().empty());
}

TEST_F(ControllerStreamTest, AfterABufferingStopWithTheFlagOnNoRecordingBeginsUntilTheFlagWentOffAndOn) {
    Run("sync");
    PushMeta(MetaUnit(1, 90, 1, recFlag(true)));
    controller_.BufferingStop();
    PushMeta(MetaUnit(2, 180, 2, recFlag(true)));
    EXPECT_EQ(log_.Count("OP: REC FLAG OFF -> ON."), 1U);
    PushMeta(MetaUnit(3, 270, 3, recFlag(false)));
    PushMeta(MetaUnit(4, 360, 4, recFlag(true)));
    EXPECT_EQ(log_.Count("OP: REC FLAG OFF -> ON."), 2U);
    EXPECT_EQ(peer_.StreamBuffers().size(), 2U);
}

TEST_F(ControllerStreamTest, InitializeForgetsTheFlag) {
    Run("sync");
    PushMeta(MetaUnit(1, 90, 1, recFlag(true)));
    controller_.Uninitialize();
    Run("sync");
    EXPECT_TRUE(Recordings().empty());
    PushMeta(MetaUnit(2, 180, 2, recFlag(true)));
    EXPECT_EQ(log_.Count("OP: REC FLAG OFF -> ON."), 1U);
    EXPECT_EQ(Recordings(), (Ranges{{180, -1}}));
}

// Buffering.

TEST_F(ControllerStreamTest, BufferingStartInOnModeStartsARecordingAt0TwiceOver) {
    Run("on");
    controller_.BufferingStart();
    EXPECT_EQ(RecordLines(), Texts{"OP: REC START. 00:00:00:00. RTPTS = 0. -> -1"});
    EXPECT_EQ(Recordings(), (Ranges{{0, -1}}));
    EXPECT_EQ(TextsOf("BufferingStart"), (Texts{"start.", "stream buffering start.", "end."}));
    EXPECT_EQ(host_.Statuses(), (std::vector<FakeHost::Status>{{4, 0}}));
    // The buffer of the first call is started again by the second, which it takes as nothing to do.
    EXPECT_EQ(log_.Count(LOG_PRIORITY_TRACE, "clipfileModule::StreamBuffer::Start", "start."), 2U);
    EXPECT_EQ(log_.Count("OP: CHANGE STATE stop -> wait_state."), 1U);
}

TEST_F(ControllerStreamTest, BufferingStartInSyncModeStartsTheStoppedRecordingsOfTheList) {
    Run("sync");
    PushMeta(MetaUnit(1, 90, 1, recFlag(true)));
    controller_.BufferingStop();
    EXPECT_EQ(Recordings(), (Ranges{{0, -1}}));
    log_.Clear();
    controller_.BufferingStart();
    EXPECT_EQ(log_.Count("OP: CHANGE STATE stop -> wait_state."), 1U);
    EXPECT_EQ(RecordLines(), Texts{});
}

TEST_F(ControllerStreamTest, BufferingStartAfterTheEndTouchesNeitherTheHostNorTheList) {
    Run("sync");
    PushMeta(MetaUnit(1, 90, 1, recFlag(true)));
    controller_.BufferingStop();
    const auto statuses = host_.Statuses();
    log_.Clear();
    peer_.SetTerminated(true);
    controller_.BufferingStart();
    EXPECT_EQ(TextsOf("BufferingStart"),
              (Texts{"start.", "stream buffering start.", "process is terminated."}));
    EXPECT_EQ(host_.Statuses(), statuses);
    EXPECT_EQ(log_.Count("OP: CHANGE STATE stop -> wait_state."), 0U);
}

TEST_F(ControllerStreamTest, WithStatus7BufferingSetsNoStatus) {
    Run("off");
    host_.ForceStatus(7);
    controller_.BufferingStart();
    controller_.BufferingStop();
    EXPECT_TRUE(host_.Statuses().empty());
}

TEST_F(ControllerStreamTest, BufferingStopStopsEveryRecordingKeepsTheListAndFlushesTheQueues) {
    Run("sync");
    PushMeta(MetaUnit(1, 90, 1, recFlag(true)));
    log_.Clear();
    {
        HeldQueueThreads held(peer_);
        ASSERT_TRUE(held.WaitReached());
        FillQueues();
        controller_.BufferingStop();
        ExpectEmptyQueues();
    }
    EXPECT_EQ(TextsOf("BufferingStop"), (Texts{"start.", "stream buffering stop.", "end."}));
    EXPECT_EQ(host_.Statuses(), (std::vector<FakeHost::Status>{{3, 0}}));
    EXPECT_EQ(peer_.StreamBuffers().size(), 1U);
    EXPECT_EQ(log_.Count("OP: CHANGE STATE wait_state -> stop."), 1U);
}

// Events of recordings.

TEST_F(ControllerStreamTest, ARestartStopsAndStartsTheRecordingAndFlushesTheQueues) {
    Run("sync");
    PushMeta(MetaUnit(1, 90, 1, recFlag(true)));
    RunEvent(std::make_shared<StopStreamingEvent>(MetaUnit(2, 900, 10)));
    log_.Clear();
    const auto buffer = peer_.StreamBuffers().at(0);
    {
        HeldQueueThreads held(peer_);
        ASSERT_TRUE(held.WaitReached());
        FillQueues();
        RunEvent(std::make_shared<RestartStreamingEvent>(buffer));
        ExpectEmptyQueues();
    }
    EXPECT_EQ(RecordLines(), Texts{"OP: REC RESTART. RTPTS = 90 -> 900."});
    EXPECT_EQ(log_.Count("OP: CHANGE STATE wait_state -> stop."), 1U);
    EXPECT_EQ(log_.Count("OP: CHANGE STATE stop -> wait_state."), 1U);
    EXPECT_EQ(Recordings(), (Ranges{{0, -1}}));
    EXPECT_EQ(TextsOf("OnRetartStream"), (Texts{"start.", "end."}));
}

TEST_F(ControllerStreamTest, ARestartFlushesTheQueuesAlsoWhenTheRecordingHasLeftTheList) {
    Run("sync");
    const auto stranger = std::make_shared<StreamBuffer>(&controller_, 5, 6);
    {
        HeldQueueThreads held(peer_);
        ASSERT_TRUE(held.WaitReached());
        FillQueues();
        RunEvent(std::make_shared<RestartStreamingEvent>(stranger));
        ExpectEmptyQueues();
    }
    EXPECT_EQ(RecordLines(), Texts{"OP: REC RESTART. RTPTS = 5 -> 6."});
    EXPECT_EQ(TextsOf("OnRetartStream"), (Texts{"start.", "end."}));
    EXPECT_EQ(log_.CountIf([](const CapturedLine& line) { return line.text.rfind("OP: CHANGE", 0) == 0; }),
              0U);
}

TEST_F(ControllerStreamTest, ARemovedRecordingLeavesTheListIsLoggedAndStopped) {
    Run("sync");
    PushMeta(MetaUnit(1, 90, 1, recFlag(true)));
    RunEvent(std::make_shared<StopStreamingEvent>(MetaUnit(2, 900, 10)));
    log_.Clear();
    RunEvent(std::make_shared<RemoveStreamingEvent>(peer_.StreamBuffers().at(0)));
    EXPECT_TRUE(peer_.StreamBuffers().empty());
    EXPECT_EQ(RecordLines(), Texts{"OP: REMOVE STREAM. RTPTS = 90 -> 900."});
    EXPECT_EQ(log_.Count("OP: CHANGE STATE wait_state -> stop."), 1U);
    EXPECT_EQ(TextsOf("OnRemoveStreaming"), (Texts{"start.", "end."}));
    EXPECT_EQ(TextsOf("RemoveStream"), (Texts{"start.", "end."}));
}

TEST_F(ControllerStreamTest, ARecordIsCancelledBeforeItsFirstPictureAndRemovesItself) {
    Run("sync");
    PushMeta(MetaUnit(1, 90000, 1000, recFlag(true)));
    PushMeta(MetaUnit(2, 180000, 2000, recFlag(false)));
    ASSERT_TRUE(waitUntil([&] { return CountLines("OnStopStream", "end.") == 1; }));
    controller_.PushMeta(MetaUnit(3, 270000, 3000, recFlag(false)));
    ASSERT_TRUE(log_.WaitForText("OP: REMOVE STREAM. RTPTS = 90000 -> 180000."));
    ASSERT_TRUE(waitUntil([&] { return CountLines("OnRemoveStreaming", "end.") == 1; }));
    EXPECT_TRUE(peer_.StreamBuffers().empty());
    EXPECT_TRUE(log_.Contains("OP: REC CANCEL. RTPTS = 90000. -> 180000"));
}

// Connected inputs.

std::shared_ptr<ChangeInStreamInfoEvent> makeInput() {
    OutputSettings input;
    input.filePrefix = "OTHER";
    input.framerate = 25000;
    input.bitrate = 8000;
    input.width = 1920;
    input.height = 1080;
    return std::make_shared<ChangeInStreamInfoEvent>(input);
}

TEST_F(ControllerStreamTest, WithNaluTypeNormalAConnectChangesOnlyTheFrameRate) {
    Run("off", "normal");
    RunEvent(makeInput());
    const OutputSettings settings = peer_.Settings();
    EXPECT_EQ(settings.framerate, 25000U);
    EXPECT_EQ(settings.bitrate, 60000U);
    EXPECT_EQ(settings.width, 1280U);
    EXPECT_EQ(settings.height, 720U);
    EXPECT_EQ(settings.filePrefix, "Unknown-Model");
    EXPECT_EQ(TextsOf("OnChangeInStreamInfo"),
              (Texts{"start.", "input settings.", "framerate : 25000.", "bitrate   : 60000.",
                     "width     : 1280.", "height    : 720.", "end."}));
}

TEST_F(ControllerStreamTest, WithNaluTypeDirectAConnectChangesBitRateAndPictureSizeToo) {
    Run("off", "direct");
    RunEvent(makeInput());
    const OutputSettings settings = peer_.Settings();
    EXPECT_EQ(settings.framerate, 25000U);
    EXPECT_EQ(settings.bitrate, 8000U);
    EXPECT_EQ(settings.width, 1920U);
    EXPECT_EQ(settings.height, 1080U);
    EXPECT_EQ(settings.filePrefix, "Unknown-Model");
    EXPECT_EQ(TextsOf("OnChangeInStreamInfo"),
              (Texts{"start.", "input settings.", "framerate : 25000.", "bitrate   : 8000.",
                     "width     : 1920.", "height    : 1080.", "end."}));
}

TEST_F(ControllerStreamTest, AnInputMayConnectWhileRecordingsStart) {
    Run("on");
    std::thread starter([&] {
        for (int i = 0; i < 50; ++i) {
            controller_.BufferingStart();
            controller_.BufferingStop();
        }
    });
    for (int i = 0; i < 200; ++i) {
        controller_.PostEvent(makeInput());
    }
    starter.join();
    EXPECT_EQ(peer_.StreamBuffers().size(), 50U);
}

// The end.

TEST_F(ControllerStreamTest, UninitializeStopsEveryRecording) {
    Run("on");
    controller_.BufferingStart();
    controller_.BufferingStart();
    controller_.Uninitialize();
    running_ = false;
    EXPECT_TRUE(peer_.StreamBuffers().empty());
    EXPECT_EQ(log_.Count("OP: CHANGE STATE wait_state -> stop."), 2U);
}

TEST_F(ControllerStreamTest, ARecordFlagThatArrivesDuringUninitializeLeavesNoRecordingBehind) {
    Run("sync");
    {
        auto gate =
            log_.BlockAt([](const CapturedLine& line) { return line.text == "OP: REC FLAG OFF -> ON."; });
        controller_.PushMeta(MetaUnit(1, 90, 1, recFlag(true)));
        ASSERT_TRUE(gate.WaitReached());
        std::thread ender([&] { controller_.Uninitialize(); });
        // The recordings of the list have been stopped when the queues are closed.
        ASSERT_TRUE(waitUntil([&] { return !peer_.Queue(kVideo).Push(std::make_shared<StreamData>()); }));
        gate.Release();
        ender.join();
        running_ = false;
    }
    EXPECT_EQ(log_.Count("OP: CHANGE STATE stop -> wait_state."), 1U);
    EXPECT_EQ(log_.Count("OP: CHANGE STATE wait_state -> stop."), 1U);
    EXPECT_TRUE(peer_.StreamBuffers().empty());
}

}  // namespace
}  // namespace clipfileModule
