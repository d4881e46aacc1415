// Whole runs, with the real module unless a test needs one that misbehaves.

#include "Receiver.h"

#include <dlfcn.h>
#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <filesystem>
#include <fstream>
#include <iterator>

#include "fakes/FakeDisplay.h"
#include "fakes/FakeSource.h"
#include "support/WaitUntil.h"

namespace receiver {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::IsEmpty;
using ::testing::Not;

class ReceiverTest : public ::testing::Test {
 protected:
    ReceiverTest() : folder_(::testing::TempDir() + "receiver_XXXXXX") {
        EXPECT_NE(mkdtemp(folder_.data()), nullptr);
        setenv("QX_SETTINGS", (folder_ + "/none.ini").c_str(), 1);
        setenv("QX_LOG", "/dev/null", 0);
        options_.output = folder_;
        options_.module = CLIPFILE_MODULE;
        options_.timecode = Timecode{10, 0, 0, 0, false};
    }
    ~ReceiverTest() override {
        unsetenv("FAKE_MODULE");
        std::filesystem::remove_all(folder_);
    }

    ExitCode Record(std::unique_ptr<FakeSource> source) {
        const auto open = [&](const SourceOptions&, SourceListenerInterface&, const StopCheck&) {
            return std::move(source);
        };
        return RunReceiver(options_, open, signals_, display_, -1);
    }
    ExitCode Record(std::int64_t frames) { return Record(std::make_unique<FakeSource>(frames)); }

    ExitCode RecordWith(const char* behaviour) {
        setenv("FAKE_MODULE", behaviour, 1);
        options_.module = FAKE_MODULE;
        return Record(60);
    }

    /// A source whose operator ends the run when all its units are read, so that nobody hears of it before
    /// the end waits for a module that keeps everything. That lets go when the operator has been answered.
    ExitCode RecordEndedBehind(std::int64_t frames) {
        setenv("FAKE_MODULE", "keep", 1);
        options_.module = FAKE_MODULE;
        display_.onNotice = [](const std::string& sentence) {
            if (sentence.starts_with("ending in order")) {
                // The module is in memory by now and stays there.
                void* const library = dlopen(FAKE_MODULE, RTLD_NOW | RTLD_NOLOAD);
                reinterpret_cast<void (*)()>(dlsym(library, "FakeModuleLetGo"))();
                dlclose(library);
            }
        };
        auto source = std::make_unique<FakeSource>(frames);
        source->Before([this, &units = source->Units()](std::size_t) {
            if (units.empty()) {
                kill(getpid(), SIGTERM);
                while (!signals_.QuitRequested()) {
                    std::this_thread::yield();
                }
            }
        });
        return Record(std::move(source));
    }

    /// Sends a signal to this process and waits until its command is there.
    static void Send(int number) {
        SendUntilTaken(number);
        // The thread that takes this one, which means nothing, has done with the one before.
        SendUntilTaken(SIGURG);
    }
    static void SendUntilTaken(int number) {
        kill(getpid(), number);
        EXPECT_TRUE(WaitUntil([number] {
            sigset_t pending;
            sigpending(&pending);
            return sigismember(&pending, number) != 1;
        }));
    }

    /// Frames of the files, in their order.
    std::vector<std::uint64_t> Frames() const {
        std::vector<std::uint64_t> frames;
        for (const RecordedFile& file : display_.summary.files) {
            EXPECT_EQ(file.problem, "") << file.path;
            frames.push_back(file.frames);
        }
        return frames;
    }
    std::vector<std::string> Starts() const {
        std::vector<std::string> starts;
        for (const RecordedFile& file : display_.summary.files) {
            starts.push_back(file.startTimecode);
        }
        return starts;
    }

    std::string folder_;
    Options options_;
    FakeDisplay display_;
    Signals signals_{[] {}};
};

TEST_F(ReceiverTest, RecordsWhatTheLengthAsksFor) {
    options_.seconds = 2;
    EXPECT_EQ(Record(150), ExitCode::kSuccess);
    EXPECT_THAT(Frames(), ElementsAre(50));
    // Of the pictures: 94 audio frames are 5.3 ms more.
    EXPECT_NEAR(display_.summary.files.front().seconds, 2, 0.0005);
    EXPECT_THAT(Starts(), ElementsAre("10:00:00:00"));
    EXPECT_EQ(display_.opened, display_.closed);
    EXPECT_THAT(display_.opened, ElementsAre(HasSubstr("/Unknown-Model/10_00_00_00.MP4")));
    EXPECT_EQ(display_.finished, 1);
    EXPECT_EQ(display_.failure, "");
    EXPECT_THAT(display_.notices, Contains("source: a source of the tests"));
    EXPECT_THAT(display_.statuses, ElementsAre(ModuleStatus{4, 0}, ModuleStatus{3, 0}));
    EXPECT_EQ(display_.summary.exitCode, ExitCode::kSuccess);
}

TEST_F(ReceiverTest, RangesGiveAFileEachFromTheIdrFrameAtOrAfterTheirBegin) {
    options_.record = {{90000, 2 * 90000}, {2 * 90000 + 1, 4 * 90000}};
    EXPECT_EQ(Record(200), ExitCode::kSuccess);
    EXPECT_THAT(Frames(), ElementsAre(25, 25));
    EXPECT_THAT(Starts(), ElementsAre("10:00:01:00", "10:00:03:00"));
}

TEST_F(ReceiverTest, ASourceThatEndsLeavesAllItsFramesInTheFile) {
    for (const std::int64_t frames : {1, 7, 96, 101}) {
        EXPECT_EQ(Record(frames), ExitCode::kSuccess);
        EXPECT_THAT(Frames(), ElementsAre(frames));
    }
}

TEST_F(ReceiverTest, FragmentedFilesAreListedWithTheirTimecodeToo) {
    options_.fileType = "fragment";
    options_.prefix = "CAM1";
    EXPECT_EQ(Record(96), ExitCode::kSuccess);
    EXPECT_THAT(Frames(), ElementsAre(96));
    EXPECT_THAT(Starts(), ElementsAre("10:00:00:00"));
    EXPECT_THAT(display_.closed, ElementsAre(HasSubstr("/CAM1/10_00_00_00.MP4")));
}

// Of a fragment for each 256 frames.
TEST_F(ReceiverTest, TheLengthOfAFragmentedFileIsThatOfAllItsFrames) {
    options_.fileType = "fragment";
    EXPECT_EQ(Record(304), ExitCode::kSuccess);
    EXPECT_THAT(Frames(), ElementsAre(304));
    EXPECT_NEAR(display_.summary.files.front().seconds, 12.16, 0.0005);
}

TEST_F(ReceiverTest, InModeOnARunWithoutAGapIsOneRecording) {
    options_.mode = OutputMode::kOn;
    options_.seconds = 1;
    EXPECT_EQ(Record(150), ExitCode::kSuccess);
    EXPECT_THAT(Frames(), ElementsAre(25));
    EXPECT_THAT(display_.statuses, ElementsAre(ModuleStatus{4, 0}, ModuleStatus{3, 0}));
}

/// A gap of two seconds behind three, and audio that begins 500 samples behind each picture's. The audio
/// behind the gap has bytes of its own.
class GapTest : public ReceiverTest {
 protected:
    static constexpr std::string_view kBehind = "audio behind it!";

    static std::unique_ptr<FakeSource> WithGap() {
        auto source = std::make_unique<FakeSource>(0);
        std::deque<SourceUnit>& units = source->Units();
        for (std::uint32_t frame = 0; frame < 200; frame = frame == 74 ? 125 : frame + 1) {
            units.push_back(MakeFrame(frame * FakeSource::kFrame, frame % FakeSource::kGroup == 0, frame));
        }
        // The pictures in front of the gap end at 144000.
        for (std::int64_t time = 500; time < 144000 - 512; time += 1024) {
            units.push_back(MakeAudio(time));
        }
        std::vector<unsigned char> bytes{0xFF, 0xF1, 0x4C, 0x80, 0x02, 0xFF, 0xFC};
        bytes.insert(bytes.end(), kBehind.begin(), kBehind.end());
        for (std::int64_t time = 240000 - 100; time < 384000; time += 1024) {
            units.push_back(MakeSourceUnit(Medium::kAudio, time, bytes));
        }
        std::stable_sort(units.begin(), units.end(), [](const SourceUnit& a, const SourceUnit& b) {
            return SecondsOf(a) < SecondsOf(b);
        });
        return source;
    }
    static double SecondsOf(const SourceUnit& unit) {
        return static_cast<double>(unit.time) /
               static_cast<double>(unit.medium == Medium::kAudio ? kAudioClock : kVideoClock);
    }
    static bool HoldsAudioBehind(const RecordedFile& file) {
        std::ifstream in(file.path, std::ios::binary);
        const std::string bytes{std::istreambuf_iterator<char>(in), {}};
        return bytes.find(kBehind) != std::string::npos;
    }
};

TEST_F(GapTest, WhatIsBehindItIsInAFileOfItsOwnWithItsTimecode) {
    for (const OutputMode mode : {OutputMode::kSync, OutputMode::kOn}) {
        options_.mode = mode;
        EXPECT_EQ(Record(WithGap()), ExitCode::kSuccess);
        EXPECT_THAT(Frames(), ElementsAre(75, 75));
        EXPECT_THAT(Starts(), ElementsAre("10:00:00:00", "10:00:05:00"));
        ASSERT_EQ(display_.summary.files.size(), 2u);
        EXPECT_FALSE(HoldsAudioBehind(display_.summary.files[0]));
        EXPECT_TRUE(HoldsAudioBehind(display_.summary.files[1]));
    }
}

/// Pictures with a first IDR frame each, and the audio beside them, which comes a second later.
class SpansTest : public ReceiverTest {
 protected:
    struct Span {
        std::int64_t begin;
        std::int64_t end;
    };

    static std::unique_ptr<FakeSource> Of(const std::vector<Span>& spans) {
        auto source = std::make_unique<FakeSource>(0);
        std::deque<SourceUnit>& units = source->Units();
        for (const Span& span : spans) {
            for (std::int64_t frame = span.begin; frame < span.end; ++frame) {
                units.push_back(MakeFrame(frame * FakeSource::kFrame, frame == span.begin,
                                          static_cast<std::uint32_t>(frame)));
            }
            for (std::int64_t time = span.begin * 1920; time < span.end * 1920; time += 1024) {
                units.push_back(MakeAudio(time));
            }
        }
        std::stable_sort(units.begin(), units.end(),
                         [](const SourceUnit& a, const SourceUnit& b) { return ComesAt(a) < ComesAt(b); });
        return source;
    }
    static void ChangeInFrontOf(std::int64_t frame, FakeSource& source) {
        const std::deque<SourceUnit>& units = source.Units();
        const auto change = std::find_if(units.begin(), units.end(), [frame](const SourceUnit& unit) {
            return unit.medium == Medium::kVideo && unit.time == frame * FakeSource::kFrame;
        });
        SourceDescription other = source.Description();
        other.width = 640;
        other.summary = "another source of the tests";
        source.ChangeBehind(static_cast<std::size_t>(change - units.begin()), other);
    }
    /// In ticks of 720000 a second.
    static std::int64_t ComesAt(const SourceUnit& unit) {
        return unit.medium == Medium::kAudio ? unit.time * 15 + 720000 : unit.time * 8;
    }
};

TEST_F(SpansTest, TwoGapsWithinTwoSecondsGiveThreeFiles) {
    for (const OutputMode mode : {OutputMode::kSync, OutputMode::kOn}) {
        options_.mode = mode;
        EXPECT_EQ(Record(Of({{0, 25}, {45, 55}, {75, 100}})), ExitCode::kSuccess);
        EXPECT_THAT(Frames(), ElementsAre(25, 10, 25));
        EXPECT_THAT(Starts(), ElementsAre("10:00:00:00", "10:00:01:20", "10:00:03:00"));
    }
}

TEST_F(SpansTest, AGapRightInFrontOfAChangeGivesThreeFiles) {
    for (const OutputMode mode : {OutputMode::kSync, OutputMode::kOn}) {
        options_.mode = mode;
        auto source = Of({{0, 25}, {45, 55}, {85, 110}});
        ChangeInFrontOf(85, *source);
        EXPECT_EQ(Record(std::move(source)), ExitCode::kSuccess);
        EXPECT_THAT(display_.notices, Contains("source: another source of the tests"));
        EXPECT_THAT(Frames(), ElementsAre(25, 10, 25));
        EXPECT_THAT(Starts(), ElementsAre("10:00:00:00", "10:00:01:20", "10:00:03:10"));
    }
}

// The pictures behind the gap have waited for audio in vain, without which the module writes none. The gap is
// found when the change ends the wait.
TEST_F(SpansTest, AGapThatIsFoundAtAChangeGoesBeforeIt) {
    for (const OutputMode mode : {OutputMode::kSync, OutputMode::kOn}) {
        options_.mode = mode;
        auto source = Of({{0, 25}, {45, 55}, {85, 110}});
        std::erase_if(source->Units(), [](const SourceUnit& unit) {
            return unit.medium == Medium::kAudio && unit.time >= 45 * 1920 && unit.time < 55 * 1920;
        });
        ChangeInFrontOf(85, *source);
        EXPECT_EQ(Record(std::move(source)), ExitCode::kLost);
        EXPECT_THAT(display_.notices, Contains("source: another source of the tests"));
        EXPECT_THAT(display_.notices, Contains("10 frames that should have been recorded are in no file"));
        EXPECT_THAT(Frames(), ElementsAre(25, 25));
        EXPECT_THAT(Starts(), ElementsAre("10:00:00:00", "10:00:03:10"));
    }
}

TEST_F(GapTest, AModuleThatRefusesBehindItStillLeavesASummary) {
    setenv("FAKE_MODULE", "refuse second", 1);
    options_.module = FAKE_MODULE;
    options_.mode = OutputMode::kOn;
    EXPECT_EQ(Record(WithGap()), ExitCode::kModule);
    EXPECT_EQ(display_.finished, 1);
    EXPECT_EQ(display_.summary.exitCode, ExitCode::kModule);
    EXPECT_EQ(display_.failureCode, ExitCode::kModule);
    EXPECT_THAT(display_.failure, HasSubstr("refuses to start"));
}

TEST_F(ReceiverTest, ASignalIsHeardWhileAFullModuleIsWaitedFor) {
    RecordEndedBehind(10);
    EXPECT_THAT(display_.notices, Contains("ending in order; a second signal ends at once"));
}

TEST_F(ReceiverTest, AnOperatorWhoEndsARunBehindItsSourceExcusesNothing) {
    EXPECT_EQ(RecordEndedBehind(0), ExitCode::kLost);
    EXPECT_THAT(display_.notices, Contains(HasSubstr("the source has sent no IDR frame")));
}

TEST_F(ReceiverTest, SigtermEndsInOrderWithTheFileClosed) {
    auto source = std::make_unique<FakeSource>(400);
    source->Before([this](std::size_t read) {
        if (read == 100) {
            kill(getpid(), SIGTERM);
            while (!signals_.QuitRequested()) {
                std::this_thread::yield();
            }
        }
    });
    EXPECT_EQ(Record(std::move(source)), ExitCode::kSuccess);
    ASSERT_EQ(display_.summary.files.size(), 1u);
    EXPECT_GT(Frames()[0], 25u);
    EXPECT_LT(Frames()[0], 100u);
    EXPECT_EQ(display_.closed.size(), 1u);
    EXPECT_THAT(display_.notices, Contains(HasSubstr("ending in order")));
}

TEST_F(ReceiverTest, UserSignalsStopAndStartARecording) {
    auto source = std::make_unique<FakeSource>(400);
    source->Before([](std::size_t read) {
        if (read == 120) {
            Send(SIGUSR2);
        } else if (read == 420) {
            Send(SIGUSR1);
        }
    });
    EXPECT_EQ(Record(std::move(source)), ExitCode::kSuccess);
    EXPECT_EQ(display_.summary.files.size(), 2u);
    EXPECT_EQ(display_.started.size(), 2u);
    EXPECT_EQ(display_.stopped.size(), 2u);
}

TEST_F(ReceiverTest, AStopWithAStartDirectlyBehindItBeginsAnotherFile) {
    auto source = std::make_unique<FakeSource>(150);
    source->Before([](std::size_t read) {
        if (read == 120) {
            kill(getpid(), SIGUSR2);
            Send(SIGUSR1);
        }
    });
    EXPECT_EQ(Record(std::move(source)), ExitCode::kSuccess);
    ASSERT_EQ(Frames().size(), 2u);
    // The second one from an IDR frame to the end.
    EXPECT_EQ(Frames()[1] % 25, 0u);
    EXPECT_LT(Frames()[0] + Frames()[1], 150u);
    EXPECT_GE(Frames()[0] + Frames()[1], 125u);
}

TEST_F(ReceiverTest, ASplitLosesNoFrame) {
    auto source = std::make_unique<FakeSource>(150);
    source->Before([](std::size_t read) {
        if (read == 120) {
            Send(SIGRTMIN);
        }
    });
    EXPECT_EQ(Record(std::move(source)), ExitCode::kSuccess);
    ASSERT_EQ(Frames().size(), 2u);
    EXPECT_EQ(Frames()[0] + Frames()[1], 150u);
    EXPECT_EQ(Frames()[0] % 25, 0u);
    EXPECT_EQ(display_.started[1], display_.stopped[0]);
}

TEST_F(ReceiverTest, AStreamWithoutAnIdrFrameIsToldAndIsALoss) {
    for (const OutputMode mode : {OutputMode::kSync, OutputMode::kOn}) {
        options_.mode = mode;
        auto source = std::make_unique<FakeSource>(50);
        for (SourceUnit& unit : source->Units()) {
            unit.keyFrame = false;
        }
        EXPECT_EQ(Record(std::move(source)), ExitCode::kLost);
        EXPECT_THAT(display_.notices, Contains(HasSubstr("no IDR frame came")));
        EXPECT_THAT(display_.summary.files, IsEmpty());
    }
}

TEST_F(ReceiverTest, SigtermDoesNotHideThatALiveSourceHasSentNoIdrFrame) {
    auto source = std::make_unique<FakeSource>(0);
    source->MakeEndless();
    source->ChangeCounts().earlyPictures = 50;
    source->Before([this, &ended = *source, sent = false](std::size_t) mutable {
        if (std::exchange(sent, true)) {
            ended.Stop();
            return;
        }
        kill(getpid(), SIGTERM);
        while (!signals_.QuitRequested()) {
            std::this_thread::yield();
        }
    });
    EXPECT_EQ(Record(std::move(source)), ExitCode::kLost);
    EXPECT_THAT(display_.notices, Contains("ending in order; a second signal ends at once"));
    EXPECT_THAT(display_.notices, Contains(HasSubstr("the source has sent no IDR frame")));
}

TEST_F(ReceiverTest, ARangeWithoutAnIdrFrameIsToldAndIsALoss) {
    // The only IDR frames are those of the whole seconds.
    options_.record = {{90000 / 2, 90000 * 8 / 10}, {90000, 90000 * 2}};
    EXPECT_EQ(Record(60), ExitCode::kLost);
    EXPECT_THAT(Frames(), ElementsAre(25));
    EXPECT_THAT(display_.notices, Contains("nothing was recorded from 00:00:00.500 to 00:00:00.800 of the "
                                           "stream: no IDR frame came in between"));
}

TEST_F(ReceiverTest, ARangeBehindTheEndOfTheStreamIsToldAndIsALoss) {
    options_.record = {{0, 90000}, {90000 * 10, 90000 * 20}};
    EXPECT_EQ(Record(51), ExitCode::kLost);
    EXPECT_THAT(display_.notices, Contains("nothing was recorded from 00:00:10.000 of the stream on: it has "
                                           "ended at 00:00:02.000"));
}

TEST_F(ReceiverTest, AFileThatIsDeletedDuringTheRunIsToldAndIsALoss) {
    options_.record = {{0, 90000}, {2 * 90000, 3 * 90000}};
    auto source = std::make_unique<FakeSource>(150);
    source->MakeEndless();
    source->Before([this, &ended = *source](std::size_t) {
        // The first file is complete, which takes the module a moment.
        if (!display_.closed.empty()) {
            std::filesystem::remove(display_.closed.front());
            ended.Stop();
        }
    });
    EXPECT_EQ(Record(std::move(source)), ExitCode::kLost);
    EXPECT_THAT(display_.notices, Contains(HasSubstr("is gone: it was deleted")));
}

TEST_F(ReceiverTest, ASourceThatDriesUpAtTheEndHoldsNobodyUp) {
    auto source = std::make_unique<FakeSource>(60);
    source->MakeEndless();
    // Interrupted when all units are read.
    source->Before([&units = source->Units(), sent = false](std::size_t) mutable {
        if (units.empty() && !std::exchange(sent, true)) {
            kill(getpid(), SIGINT);
        }
    });
    EXPECT_EQ(Record(std::move(source)), ExitCode::kSuccess);
    EXPECT_THAT(Frames(), ElementsAre(60));
}

TEST_F(ReceiverTest, SnapshotsTellOfTheRecording) {
    auto source = std::make_unique<FakeSource>(200);
    source->MakeEndless();
    source->Before([this, &ended = *source, before = std::optional<std::size_t>()](std::size_t) mutable {
        if (ended.Units().empty()) {
            before = before.value_or(display_.snapshots.size());
            if (display_.snapshots.size() > *before) {
                ended.Stop();
            }
        }
    });
    EXPECT_EQ(Record(std::move(source)), ExitCode::kSuccess);
    ASSERT_THAT(display_.snapshots, Not(IsEmpty()));
    const Snapshot& last = display_.snapshots.back();
    EXPECT_TRUE(last.recording);
    EXPECT_EQ(last.status, (ModuleStatus{4, 0}));
    EXPECT_EQ(last.framesPerSecond, 25);
    EXPECT_GT(last.freeBytes.value_or(0), 0u);
    EXPECT_EQ(last.lost, 0u);
}

TEST_F(ReceiverTest, SnapshotsTellThatTheFirstIdrFrameIsAwaited) {
    for (const OutputMode mode : {OutputMode::kSync, OutputMode::kOn}) {
        options_.mode = mode;
        display_.snapshots.clear();
        auto source = std::make_unique<FakeSource>(0);
        source->MakeEndless();
        source->ChangeCounts().earlyPictures = 50;
        source->Before([this, &ended = *source](std::size_t) {
            if (!display_.snapshots.empty()) {
                ended.Stop();
            }
        });
        EXPECT_EQ(Record(std::move(source)), ExitCode::kLost);
        ASSERT_THAT(display_.snapshots, Not(IsEmpty()));
        EXPECT_TRUE(display_.snapshots.front().waiting);
        EXPECT_FALSE(display_.snapshots.front().recording);
    }
}

TEST_F(ReceiverTest, SnapshotsOfARunWithoutACommandWaitForNothing) {
    options_.record = {{10 * 90000, 20 * 90000}};
    EXPECT_EQ(Record(50), ExitCode::kLost);
    ASSERT_THAT(display_.snapshots, Not(IsEmpty()));
    EXPECT_FALSE(display_.snapshots.front().waiting);
}

TEST_F(ReceiverTest, AModuleThatIsNotThereHasItsExitCode) {
    options_.module = "/no/such/module.so";
    EXPECT_EQ(Record(10), ExitCode::kModule);
    EXPECT_EQ(display_.failureCode, ExitCode::kModule);
    EXPECT_THAT(display_.failure, HasSubstr("/no/such/module.so"));
}

TEST_F(ReceiverTest, AModuleThatRefusesHasItsExitCode) {
    EXPECT_EQ(RecordWith("refuse"), ExitCode::kModule);
    EXPECT_THAT(display_.failure, HasSubstr("refuses to start"));
}

TEST_F(ReceiverTest, AModuleThatFailsEndsTheRun) {
    EXPECT_EQ(RecordWith("fail"), ExitCode::kRecordingFailed);
    EXPECT_THAT(display_.statuses, Contains(ModuleStatus{7, 26}));
    EXPECT_EQ(display_.summary.exitCode, ExitCode::kRecordingFailed);
}

TEST_F(ReceiverTest, LostUnitsMakeTheRunALoss) {
    EXPECT_EQ(RecordWith("overflow"), ExitCode::kLost);
    EXPECT_EQ(display_.summary.lost, 1u);
}

TEST_F(ReceiverTest, AMarkThatTheModuleHasNoRoomForIsNoLoss) {
    RecordWith("crowded");
    EXPECT_EQ(display_.summary.lost, 0u);
}

TEST_F(ReceiverTest, AFaultOfTheStreamMakesTheRunALoss) {
    EXPECT_EQ(RecordWith("fault"), ExitCode::kLost);
    EXPECT_THAT(display_.statuses, Contains(ModuleStatus{6, 22}));
}

TEST_F(ReceiverTest, AStopThatTheModuleDoesNotCarryOutIsToldAndMakesTheRunALoss) {
    options_.seconds = 1;
    EXPECT_EQ(RecordWith("hang"), ExitCode::kLost);
    EXPECT_THAT(display_.notices, Contains(HasSubstr("has not carried out a stop command within 1 s")));
}

TEST_F(ReceiverTest, WhatTheSourceLostIsALoss) {
    for (SourceCounts counts : {SourceCounts{2, 0, 0}, SourceCounts{0, 3, 0}, SourceCounts{0, 0, 1}}) {
        auto source = std::make_unique<FakeSource>(60);
        source->ChangeCounts() = counts;
        EXPECT_EQ(Record(std::move(source)), ExitCode::kLost);
        EXPECT_EQ(display_.summary.lost, counts.lostFrames + counts.damagedPackets);
    }
}

TEST_F(ReceiverTest, SilenceInThePlaceOfMissingAudioIsToldAndIsALoss) {
    auto source = std::make_unique<FakeSource>(60);
    source->ChangeCounts().silentFrames = 5;
    EXPECT_EQ(Record(std::move(source)), ExitCode::kLost);
    EXPECT_THAT(display_.notices, Contains(HasSubstr("5 audio frames of the source did not come")));
    EXPECT_EQ(display_.summary.lost, 0u);
}

TEST_F(ReceiverTest, GoingOfflineAtTheEndIsNoFault) {
    setenv("FAKE_MODULE", "", 1);
    options_.module = FAKE_MODULE;
    Record(60);
    EXPECT_THAT(display_.statuses, ElementsAre(ModuleStatus{4, 0}, ModuleStatus{3, 0}));
    // All that is wrong with this module: it writes nothing.
    EXPECT_THAT(display_.notices, Contains("60 frames that should have been recorded are in no file"));
    EXPECT_EQ(display_.notices.size(), 2u);
}

TEST_F(ReceiverTest, AnOutputThatCannotBeUsedIsFoundBeforeAnythingElse) {
    options_.output = folder_ + "/a/b";
    options_.module = "/no/such/module.so";
    EXPECT_EQ(Record(10), ExitCode::kOutput);
    EXPECT_THAT(display_.failure, HasSubstr("/a/b"));
}

TEST_F(ReceiverTest, AMissingOutputFolderIsMadeWithANotice) {
    options_.output = folder_ + "/new/";
    EXPECT_EQ(Record(60), ExitCode::kSuccess);
    EXPECT_THAT(display_.notices, Contains("made the output folder " + folder_ + "/new"));
    EXPECT_THAT(display_.closed, ElementsAre(HasSubstr(folder_ + "/new/20")));
}

TEST_F(ReceiverTest, BackslashesOfTheOutputFolderAreSlashes) {
    options_.output = folder_ + "\\new\\";
    EXPECT_EQ(Record(60), ExitCode::kSuccess);
    EXPECT_THAT(display_.notices, Contains("made the output folder " + folder_ + "/new"));
    EXPECT_THAT(display_.closed, ElementsAre(HasSubstr(folder_ + "/new/20")));
}

TEST_F(ReceiverTest, AFolderMayBeCalledNone) {
    std::filesystem::current_path(folder_);
    options_.output = "none";
    EXPECT_EQ(Record(60), ExitCode::kSuccess);
    EXPECT_THAT(display_.closed, ElementsAre(HasSubstr("./none/20")));
    std::filesystem::current_path("/");
}

TEST_F(ReceiverTest, ASourceThatCannotBeOpenedEndsTheRunWithItsSentence) {
    const auto open = [](const SourceOptions&, SourceListenerInterface&,
                         const StopCheck&) -> std::unique_ptr<SourceInterface> {
        throw ReceiverError(ExitCode::kSourceUnavailable, "no answer from 'udp://:9'.");
    };
    EXPECT_EQ(RunReceiver(options_, open, signals_, display_, -1), ExitCode::kSourceUnavailable);
    EXPECT_EQ(display_.failure, "no answer from 'udp://:9'.");
}

TEST_F(ReceiverTest, AnEndDuringTheOpeningIsOrderly) {
    const auto open = [this](const SourceOptions&, SourceListenerInterface&,
                             const StopCheck& stop) -> std::unique_ptr<SourceInterface> {
        EXPECT_FALSE(stop());
        kill(getpid(), SIGINT);
        while (!stop()) {
            std::this_thread::yield();
        }
        EXPECT_TRUE(signals_.QuitRequested());
        return nullptr;
    };
    EXPECT_EQ(RunReceiver(options_, open, signals_, display_, -1), ExitCode::kSuccess);
    EXPECT_EQ(display_.finished, 1);
}

TEST_F(ReceiverTest, ASourceThatTurnsUnsuitableStillClosesItsFile) {
    auto source = std::make_unique<FakeSource>(100);
    source->Before([](std::size_t read) {
        if (read == 180) {
            throw ReceiverError(ExitCode::kSourceUnsuitable,
                                "the source came back with another picture size.");
        }
    });
    EXPECT_EQ(Record(std::move(source)), ExitCode::kSourceUnsuitable);
    EXPECT_EQ(display_.summary.files.size(), 1u);
    EXPECT_EQ(display_.closed.size(), 1u);
    EXPECT_EQ(display_.failure, "the source came back with another picture size.");
    EXPECT_EQ(display_.summary.exitCode, ExitCode::kSourceUnsuitable);
}

TEST_F(ReceiverTest, ATimecodeThatTheRateDoesNotHaveIsAUsageError) {
    options_.timecode = Timecode{10, 0, 0, 25, false};
    EXPECT_EQ(Record(10), ExitCode::kUsage);
    EXPECT_THAT(display_.failure, HasSubstr("--timecode 10:00:00:25"));
    options_.timecode = Timecode{10, 0, 0, 0, true};
    EXPECT_EQ(Record(10), ExitCode::kUsage);
}

TEST_F(ReceiverTest, AUserWithoutAShareIsAUsageError) {
    options_.user = "joe";
    EXPECT_EQ(Record(10), ExitCode::kUsage);
    EXPECT_THAT(display_.failure, HasSubstr("--user goes with a folder on a network share"));
    EXPECT_THAT(display_.failure, HasSubstr(folder_));
}

TEST_F(ReceiverTest, ASettingsFileThatIsMissingIsAUsageError) {
    options_.settings = folder_ + "/missing.ini";
    EXPECT_EQ(Record(10), ExitCode::kUsage);
    EXPECT_THAT(display_.failure, HasSubstr("missing.ini' cannot be read"));
}

}  // namespace
}  // namespace receiver
