#include "fileout/FileOutput.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>
#include <pthread.h>

#include <future>
#include <memory>
#include <string>
#include <system_error>
#include <thread>
#include <vector>

#include "support/FileOutputHarness.h"

namespace clipfileModule {
namespace {

using ::testing::Contains;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Pair;
using ::testing::UnorderedElementsAre;

const std::string kSource = "modules/output/clipfile/src/clipfileModule/fileout/";

TEST_F(FileOutputTest, InitializeMakesAMuxer) {
    EXPECT_TRUE(Initialize("fragment"));
    EXPECT_THAT(muxers.Calls(), ElementsAre("create 1 fragment", "1 Initialize"));
    EXPECT_THAT(TextsOf("Initialize"), ElementsAre("start.", "end. func_result = 1."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "Initialize", "start."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "Initialize", "end. func_result = 1."));
    EXPECT_EQ(log.Find("end. func_result = 1.")->file, kSource + "FileWriterTarget.cc");
    EXPECT_THAT(controller.Calls(), IsEmpty());
}

TEST_F(FileOutputTest, InitializeReportsAMuxerThatCannotBeInitialized) {
    muxers.SetHooks([](FakeMuxers::Hooks& hooks) { hooks.initialize = [] { return false; }; });
    EXPECT_FALSE(Initialize());
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "createMp4FileObject", "mp4 file initialize error."));
    EXPECT_THAT(TextsOf("Initialize"), ElementsAre("start.", "end. func_result = 0."));
    EXPECT_THAT(controller.Calls(), ElementsAre("status 7 2"));
}

TEST_F(FileOutputTest, InitializeReportsThatThereIsNoMuxerAtAll) {
    muxers.SetHooks(
        [](FakeMuxers::Hooks& hooks) { hooks.create = [](const std::string&) { return false; }; });
    EXPECT_FALSE(Initialize());
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "createMp4FileObject", "mp4 file initialize error."));
    EXPECT_THAT(controller.Calls(), ElementsAre("status 7 2"));
}

TEST_F(FileOutputTest, UninitializeReleasesTheMuxer) {
    ASSERT_TRUE(Initialize());
    log.Clear();
    EXPECT_TRUE(output->Uninitialize());
    EXPECT_THAT(MuxerCalls("1 "), ElementsAre("create 1 normal", "1 Initialize", "1 Uninitialize", "1 gone"));
    EXPECT_THAT(log.Texts(),
                ElementsAre("start.", "start.", "end. func_result = 1.", "end. func_result = 1."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "Uninitialize", "start."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "Uninitialize", "end. func_result = 1."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "deleteMp4FileObject", "end. func_result = 1."));
}

TEST_F(FileOutputTest, AnObjectThatWasNeverOpenedIsReplacedAtTheFirstFile) {
    Start();
    Push(0);
    Finish();
    EXPECT_THAT(muxers.Calls(), ElementsAre("create 1 normal", "1 Initialize", "1 Uninitialize", "1 gone",
                                            "create 2 normal", "2 Initialize", "2 Open", "2 Write 0",
                                            "2 WriteTmcd", "2 Close", "2 Uninitialize", "2 gone"));
}

TEST_F(FileOutputTest, WritesItsChunksInOrderToOneFile) {
    Start();
    for (std::uint64_t chunk = 0; chunk < 4; ++chunk) {
        Push(chunk, true);
    }
    Finish();
    EXPECT_THAT(Disk(), UnorderedElementsAre(
                            Pair("20261120/", ""), Pair("20261120/Cam/", ""),
                            Pair(kToday + "1.txt",
                                 "open, chunk 0, chunk 1, chunk 2, chunk 3, tmcd 01:02:03:00, closed")));
    EXPECT_THAT(Statuses(), IsEmpty());
    EXPECT_THAT(Errors(), IsEmpty());
}

TEST_F(FileOutputTest, TellsTheHostWhenItWritesAndWhenItRests) {
    Start();
    EXPECT_TRUE(controller.WaitForCall("post 6"));
    EXPECT_THAT(TransferStatuses(), ElementsAre("output"));
    Push(0);
    output->Stop();
    EXPECT_THAT(TransferStatuses(), ElementsAre("output", "standby"));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "post 6"));
}

TEST_F(FileOutputTest, WithoutAChunkThereIsNoFile) {
    Start();
    Finish();
    EXPECT_THAT(Disk(), IsEmpty());
    EXPECT_THAT(MuxerCalls("Open"), IsEmpty());
    EXPECT_THAT(MuxerCalls("Close"), IsEmpty());
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "post 6"));
}

TEST_F(FileOutputTest, StopTellsItsSteps) {
    Start();
    output->Stop();
    EXPECT_THAT(TextsOf("Start"), ElementsAre("start.", "end."));
    EXPECT_THAT(TextsOf("Stop"), ElementsAre("start.", "wait thread start...", "wait thread end...", "end."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "Start", "start."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "Start", "end."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "Stop", "start."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "Stop", "wait thread start..."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "Stop", "wait thread end..."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "Stop", "end."));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputThread", "end."));
    EXPECT_EQ(log.Find("wait thread start...")->file, kSource + "FileOutput.cc");
}

TEST_F(FileOutputTest, StartThrowsWhenNoThreadCanBeMadeAndCanBeTriedAgain) {
    ASSERT_TRUE(Initialize());
    pthread_attr_t before;
    ASSERT_EQ(pthread_getattr_default_np(&before), 0);
    pthread_attr_t tooLarge;
    ASSERT_EQ(pthread_attr_init(&tooLarge), 0);
    // More than there are addresses.
    ASSERT_EQ(pthread_attr_setstacksize(&tooLarge, std::size_t{1} << 47), 0);
    ASSERT_EQ(pthread_setattr_default_np(&tooLarge), 0);
    EXPECT_THROW(output->Start(settings), std::system_error);
    ASSERT_EQ(pthread_setattr_default_np(&before), 0);
    pthread_attr_destroy(&tooLarge);
    pthread_attr_destroy(&before);
    output->Stop();
    EXPECT_THAT(TextsOf("Stop"), ElementsAre("start.", "end."));
    EXPECT_THAT(controller.Calls(), IsEmpty());

    output->Start(settings);
    Push(0);
    Finish();
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00, closed")));
}

TEST_F(FileOutputTest, StopWithoutStartDoesNothing) {
    ASSERT_TRUE(Initialize());
    output->Stop();
    EXPECT_THAT(TextsOf("Stop"), ElementsAre("start.", "end."));
    EXPECT_THAT(controller.Calls(), IsEmpty());
}

TEST_F(FileOutputTest, ASecondStopFindsTheThreadGone) {
    Start();
    output->Stop();
    log.Clear();
    output->Stop();
    EXPECT_THAT(TextsOf("Stop"), ElementsAre("start.", "wait thread start...", "wait thread end...", "end."));
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(FileOutputTest, StopWritesTheChunksThatAreStillQueuedBeforeTheFileIsClosed) {
    std::promise<void> writing;
    std::promise<void> release;
    muxers.SetHooks([&](FakeMuxers::Hooks& hooks) {
        hooks.write = [&](std::uint64_t chunk) {
            if (chunk == 0) {
                writing.set_value();
                release.get_future().wait();
            }
            return true;
        };
    });
    Start();
    Push(0);
    writing.get_future().wait();
    for (std::uint64_t chunk = 1; chunk < 4; ++chunk) {
        EXPECT_EQ(output->PushChunk(MakeChunk(chunk)), chunk);
    }
    std::thread stopper([&] { output->Stop(); });
    EXPECT_TRUE(log.WaitForText("wait thread start..."));
    release.set_value();
    stopper.join();
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt",
                                      "open, chunk 0, chunk 1, chunk 2, chunk 3, tmcd 01:02:03:00, closed")));
}

TEST_F(FileOutputTest, AChunkThatComesWhileAnotherIsWrittenWaitsForNoFurtherSignal) {
    std::promise<void> writing;
    std::promise<void> release;
    muxers.SetHooks([&](FakeMuxers::Hooks& hooks) {
        hooks.write = [&](std::uint64_t chunk) {
            if (chunk == 0) {
                writing.set_value();
                release.get_future().wait();
            }
            return true;
        };
    });
    Start();
    Push(0);
    writing.get_future().wait();
    Push(1);
    release.set_value();
    EXPECT_TRUE(muxers.WaitForCall("2 Write 1"));
}

TEST_F(FileOutputTest, ChunksMayBeEmptyAfterAWakeUp) {
    Start();
    Push(0);
    ASSERT_TRUE(muxers.WaitForCall("2 Write 0"));
    // The signal of Stop comes without a chunk.
    Finish();
    EXPECT_THAT(MuxerCalls("Write "), ElementsAre("2 Write 0"));
    EXPECT_THAT(Statuses(), IsEmpty());
}

TEST_F(FileOutputTest, StopRightAfterStartNeitherHangsNorGivesUp) {
    settings.outputPath = dir.ModulePath();
    ASSERT_TRUE(Initialize());
    // A signal or a lock that is missed even once costs 3500 ms and a status.
    for (int round = 0; round < 3000; ++round) {
        output->Start(settings);
        output->Stop();
    }
    EXPECT_THAT(Statuses(), IsEmpty());
    EXPECT_FALSE(log.Contains("wait thread timeout..."));
}

TEST_F(FileOutputTest, StopAfterAChunkNeitherHangsNorLosesIt) {
    ASSERT_TRUE(Initialize());
    constexpr std::uint64_t kRounds = 300;
    for (std::uint64_t round = 0; round < kRounds; ++round) {
        output->Start(settings);
        Push(round);
        output->Stop();
    }
    EXPECT_THAT(Statuses(), IsEmpty());
    EXPECT_EQ(MuxerCalls(" Write ").size(), kRounds);
    EXPECT_EQ(MuxerCalls(" Close").size(), kRounds);
}

TEST_F(FileOutputTest, StartForgetsTheChunksThatWereLeft) {
    muxers.SetHooks(
        [](FakeMuxers::Hooks& hooks) { hooks.write = [](std::uint64_t chunk) { return chunk != 0; }; });
    Start();
    Push(0);
    WaitForEnd();
    Push(1);
    output->Stop();
    output->Start(settings);
    EXPECT_EQ(output->PushChunk(MakeChunk(2)), 1u);
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "), ElementsAre("2 Write 0", "3 Write 2"));
}

TEST_F(FileOutputTest, CountsTheChunksThatWait) {
    ASSERT_TRUE(Initialize());
    EXPECT_EQ(output->PushChunk(MakeChunk(0)), 1u);
    EXPECT_EQ(output->PushChunk(MakeChunk(1)), 2u);
}

TEST_F(FileOutputTest, ALengthOfZeroMakesANewFileAfterEachSyncChunk) {
    settings.maxFileSize = 0;
    Start();
    Push(0, true);
    Push(1, false);
    Push(2, true);
    Push(3, true);
    Push(4, false);
    Finish();
    EXPECT_THAT(Disk(), UnorderedElementsAre(
                            Pair("20261120/", ""), Pair("20261120/Cam/", ""),
                            Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00, closed"),
                            Pair(kToday + "2.txt", "open, chunk 1, chunk 2, tmcd 01:02:03:01, closed"),
                            Pair(kToday + "3.txt", "open, chunk 3, tmcd 01:02:03:03, closed"),
                            Pair(kToday + "4.txt", "open, chunk 4, tmcd 01:02:03:04, closed")));
    EXPECT_EQ(log.Count(LOG_PRIORITY_TRACE, "clipfileModule::FileOutput::outputFile", "mp4 file over 0 min."),
              3u);
    EXPECT_EQ(log.Count(LOG_PRIORITY_OPERATOR, nullptr, "OP: FILE ROTATION."), 3u);
    EXPECT_EQ(log.Find("OP: FILE ROTATION.")->file, std::nullopt);
    EXPECT_EQ(log.Find("OP: FILE ROTATION.")->line, 0);
}

TEST_F(FileOutputTest, AFileOutgrowsItsLengthUntilAudioAndVideoAreInStep) {
    // A chunk lasts half a minute; the length is one minute.
    muxers.SetChunkDuration(25000 * 30);
    settings.maxFileSize = 1;
    Start();
    for (std::uint64_t chunk = 0; chunk < 6; ++chunk) {
        Push(chunk, chunk == 0 || chunk == 4);
    }
    Finish();
    EXPECT_THAT(Disk(),
                UnorderedElementsAre(
                    Pair("20261120/", ""), Pair("20261120/Cam/", ""),
                    Pair(kToday + "1.txt",
                         "open, chunk 0, chunk 1, chunk 2, chunk 3, chunk 4, tmcd 01:02:03:00, closed"),
                    Pair(kToday + "2.txt", "open, chunk 5, tmcd 01:02:03:05, closed")));
    // Chunks 2, 3 and 4 came too late for the old file and too early for a new one.
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "mp4 file over. no a/v sync. 16"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "mp4 file over. no a/v sync. 24"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "mp4 file over. no a/v sync. 32"));
    EXPECT_EQ(log.CountIf([](const CapturedLine& line) {
        return line.text.rfind("mp4 file over. no a/v sync.", 0) == 0;
    }),
              3u);
    EXPECT_TRUE(Logged(LOG_PRIORITY_TRACE, "outputFile", "mp4 file over 1 min."));
}

class ExactFileOutputTest : public FileOutputTest {
 protected:
    ExactFileOutputTest() { settings.recordRules = RecordRules::kExact; }
    ~ExactFileOutputTest() override { EndOutput(); }

    void push(std::uint64_t number, bool sync, bool idr) {
        output->PushChunk(MakeChunk(number, sync, 10, idr));
    }
};

TEST_F(ExactFileOutputTest, AFileEndsWhereTheNextOneBeginsWithAnIdrFrame) {
    settings.maxFileSize = 0;
    Start();
    push(0, true, true);
    push(1, true, false);  // in step behind chunk 0, but no IDR frame
    push(2, false, false);
    push(3, true, true);  // an IDR frame, but not in step behind chunk 2
    push(4, true, true);
    push(5, true, false);
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "),
                ElementsAre("2 Write 0", "2 Write 1", "2 Write 2", "2 Write 3", "3 Write 4", "3 Write 5"));
    EXPECT_EQ(log.Count(LOG_PRIORITY_DETAIL, "clipfileModule::FileOutput::outputFile",
                        "mp4 file over. no idr frame. 8"),
              1u);
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "mp4 file over. no idr frame. 16"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "mp4 file over. no a/v sync. 24"));
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "mp4 file over. no idr frame. 40"));
    EXPECT_EQ(log.Count("OP: FILE ROTATION."), 1u);
}

TEST_F(ExactFileOutputTest, AFileWaitsTwoMinutesForAnIdrFrame) {
    // A chunk lasts half a minute; the length is one minute.
    muxers.SetChunkDuration(25000 * 30);
    settings.maxFileSize = 1;
    Start();
    for (std::uint64_t chunk = 0; chunk < 9; ++chunk) {
        // The three minutes end with chunk 5, and the cadence is met behind chunk 6.
        push(chunk, chunk != 5, chunk == 0);
    }
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "),
                ElementsAre("2 Write 0", "2 Write 1", "2 Write 2", "2 Write 3", "2 Write 4", "2 Write 5",
                            "2 Write 6", "3 Write 7", "3 Write 8"));
}

TEST_F(ExactFileOutputTest, InDecodingOrderAFileNeverEndsInFrontOfAnythingButAnIdrFrame) {
    // As above; the next IDR frame comes with chunk 8, where audio and video are not quite in step.
    settings.pictureOrder = PictureOrder::kDecoding;
    muxers.SetChunkDuration(25000 * 30);
    settings.maxFileSize = 1;
    Start();
    for (std::uint64_t chunk = 0; chunk < 10; ++chunk) {
        push(chunk, chunk != 3 && chunk != 7, chunk == 0 || chunk == 4 || chunk == 8);
    }
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "),
                ElementsAre("2 Write 0", "2 Write 1", "2 Write 2", "2 Write 3", "2 Write 4", "2 Write 5",
                            "2 Write 6", "2 Write 7", "3 Write 8", "3 Write 9"));
}

TEST_F(ExactFileOutputTest, InDecodingOrderAFileEndsWithoutAnIdrFrameAfterFourMinutesWhereTheOrderIsClosed) {
    // As above, without another IDR frame. The five minutes end with chunk 9.
    settings.pictureOrder = PictureOrder::kDecoding;
    muxers.SetChunkDuration(25000 * 30);
    settings.maxFileSize = 1;
    Start();
    for (std::uint64_t chunk = 0; chunk < 13; ++chunk) {
        const auto pushed = MakeChunk(chunk, chunk != 10, 10, chunk == 0);
        pushed->isOrderClosed = chunk != 9;
        output->PushChunk(pushed);
    }
    Finish();
    EXPECT_THAT(MuxerCalls("3 Write "), ElementsAre("3 Write 11", "3 Write 12"));
    EXPECT_EQ(log.Count(LOG_PRIORITY_WARNING, "clipfileModule::FileOutput::outputFile",
                        "no idr frame comes. the next file begins without one."),
              1u);
}

TEST_F(ExactFileOutputTest, InDecodingOrderAnIdrFrameNeedsNoSuchLine) {
    settings.pictureOrder = PictureOrder::kDecoding;
    settings.maxFileSize = 0;
    Start();
    push(0, true, true);
    push(1, true, true);
    Finish();
    EXPECT_THAT(MuxerCalls("3 Write "), ElementsAre("3 Write 1"));
    EXPECT_FALSE(log.Contains("no idr frame comes. the next file begins without one."));
}

TEST_F(FileOutputTest, InDecodingOrderKeptRulesWaitForAnIdrFrameToo) {
    settings.pictureOrder = PictureOrder::kDecoding;
    settings.maxFileSize = 0;
    Start();
    output->PushChunk(MakeChunk(0, true, 10, true));
    output->PushChunk(MakeChunk(1, true, 10, false));
    output->PushChunk(MakeChunk(2, true, 10, true));
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "), ElementsAre("2 Write 0", "2 Write 1", "3 Write 2"));
}

TEST_F(FileOutputTest, WithKeptRulesAFileEndsAtTheFirstCadencePoint) {
    settings.maxFileSize = 0;
    Start();
    Push(0, true);
    Push(1, true);
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "), ElementsAre("2 Write 0", "3 Write 1"));
    EXPECT_FALSE(log.Contains("mp4 file over. no idr frame. 8"));
}

TEST_F(FileOutputTest, TheThreadThatIsBroughtToItsOwnStopGetsTheErrorAndEndsAllTheSame) {
    muxers.SetHooks(
        [](FakeMuxers::Hooks& hooks) { hooks.write = [](std::uint64_t chunk) { return chunk != 1; }; });
    std::promise<std::error_code> thrown;
    controller.SetStatusHook([&] {
        try {
            output->Stop();
        } catch (const std::system_error& error) {
            thrown.set_value(error.code());
        }
    });
    Start();
    Push(0);
    Push(1);
    EXPECT_EQ(thrown.get_future().get(), std::errc::resource_deadlock_would_occur);
    WaitForEnd();
    Finish();
    EXPECT_THAT(Statuses(), ElementsAre("7 26"));
    EXPECT_FALSE(log.Contains("wait thread timeout..."));
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00, closed")));
}

TEST_F(FileOutputTest, TheLimitIsReachedAtExactlyTheLengthAndNotOneTickBelow) {
    settings.maxFileSize = 1;
    muxers.SetHooks([this](FakeMuxers::Hooks& hooks) {
        hooks.write = [this](std::uint64_t chunk) {
            muxers.SetChunkDuration(chunk == 0 ? 25000 * 60 - 1 : 1);
            return true;
        };
    });
    Start();
    Push(0, true);
    Push(1, true);
    Push(2, true);
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "), ElementsAre("2 Write 0", "2 Write 1", "3 Write 2"));
}

TEST_F(FileOutputTest, CountsVideoSamplesAcrossFiles) {
    settings.maxFileSize = 0;
    Start();
    Push(0, true);
    Push(1, true);
    Push(2, true);
    output->Stop();
    for (const char* line : {"write chunk. 8", "write chunk. 16", "write chunk. 24"}) {
        EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", line)) << line;
    }
    log.Clear();
    output->Start(settings);
    Push(3);
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "write chunk. 8"));
}

TEST_F(FileOutputTest, TellsLengthsAndSizesOfTheOpenFile) {
    settings.maxFileSize = 2;
    muxers.SetBoxSize(1000);
    Start();
    Push(0);
    Push(1);
    Finish();
    // 120 s and one chunk of 8 frames in ticks of 1/25000 s; 200 MiB, 5 + 11 + 11 bytes in the file and 1000
    // to come.
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile", "file size. 3000000\t8000\t209716227\t1000."));
}

TEST_F(FileOutputTest, TellsLengthsThatNeed64Bits) {
    settings.maxFileSize = 10000000;
    muxers.SetBoxSize(5000000000);
    muxers.SetChunkDuration(6000000000);
    Start();
    Push(0);
    Push(1);
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_DETAIL, "outputFile",
                       "file size. 15000000000000\t6000000000\t5209715227\t5000000000."));
}

TEST_F(FileOutputTest, AFailureWhenTheLastFileIsClosedIsReported) {
    muxers.SetHooks([](FakeMuxers::Hooks& hooks) { hooks.close = [] { return false; }; });
    Start();
    Push(0);
    Finish();
    EXPECT_TRUE(Logged(LOG_PRIORITY_ERROR, "outputThread", "mp4 file close error."));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 27", "post 6"));
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00")));
}

TEST_F(FileOutputTest, AFailureToWriteTheTimecodeSampleIsNotRead) {
    muxers.SetHooks([](FakeMuxers::Hooks& hooks) { hooks.writeTmcd = [] { return false; }; });
    Start();
    Push(0);
    Finish();
    EXPECT_THAT(Statuses(), IsEmpty());
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 0, closed")));
}

TEST_F(FileOutputTest, TheTimecodeSampleIsZeroWhereTheBufferHasNone) {
    buffer.SetResults(false, false, false);
    Start();
    Push(9);
    Finish();
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 9, tmcd 00:00:00:00, closed")));
}

TEST_F(FileOutputTest, ChunksThatComeAfterAFaultAreNotWritten) {
    muxers.SetHooks(
        [](FakeMuxers::Hooks& hooks) { hooks.write = [](std::uint64_t chunk) { return chunk != 1; }; });
    Start();
    Push(0);
    Push(1);
    WaitForEnd();
    EXPECT_EQ(output->PushChunk(MakeChunk(2)), 1u);
    EXPECT_EQ(output->PushChunk(MakeChunk(3)), 2u);
    Finish();
    EXPECT_THAT(MuxerCalls(" Write "), ElementsAre("2 Write 0", "2 Write 1"));
    EXPECT_THAT(Disk(), Contains(Pair(kToday + "1.txt", "open, chunk 0, tmcd 01:02:03:00, closed")));
    EXPECT_THAT(controller.Calls(), ElementsAre("post 6", "status 7 26", "post 6"));
}

}  // namespace
}  // namespace clipfileModule
