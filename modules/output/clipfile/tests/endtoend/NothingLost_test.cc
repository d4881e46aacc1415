// Units go in at the host's end of the module, files come out at the other: not one unit may be missing.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdint>
#include <cstdio>
#include <memory>
#include <ostream>
#include <string>
#include <vector>

#include "LogCapture.h"
#include "controller/Mp4FileOutput.h"
#include "endtoend/NumberedStream.h"
#include "endtoend/PacedPush.h"
#include "endtoend/RecordedFiles.h"
#include "support/ControllerPeer.h"
#include "support/FakeHost.h"
#include "support/FakeRegistry.h"
#include "support/LogLines.h"
#include "support/SettleEventLoop.h"
#include "support/StreamBufferPeer.h"
#include "support/TempDir.h"
#include "support/WaitUntil.h"

namespace clipfileModule {
namespace {

using stream_units::FrameRate;
using ::testing::IsEmpty;

struct Recording {
    const char* type;
    FrameRate rate;
    std::uint32_t maxMinutes;
    /// Pictures in each file but the last one.
    std::uint64_t picturesPerFile;
    /// Pictures between the commands to start and to stop.
    std::uint64_t pictures;
};

void PrintTo(const Recording& recording, std::ostream* out) {
    *out << recording.type << ' ' << recording.rate << ", " << recording.maxMinutes << " min";
}

// The flag goes on between two IDR pictures.
constexpr std::uint64_t kCommand = 37;
constexpr std::uint64_t kFirstPicture = 45;

class NothingLost : public ::testing::TestWithParam<Recording> {
 protected:
    void SetUp() override {
        registry_.Set("MP4MaxFileSize", GetParam().maxMinutes);
        host_.texts = {{"-outputPath", directory_.Path().string()},
                       {"-filePrefix", "Cam"},
                       {"-fileType", GetParam().type},
                       {"-outputMode", "sync"}};
        host_.numbers["-encodedFPS"] = static_cast<int>(GetParam().rate.key);
        ASSERT_TRUE(module_.Initialize(&host_));
        ASSERT_TRUE(module_.GetStreamInterface(&push_));
        // An event that is posted before the event thread first waits lies until the next one comes.
        ASSERT_TRUE(settleEventLoop(static_cast<Controller&>(*push_), host_, log_));
        settled_ = host_.Transmissions().size();
        pace_ = std::make_unique<PacedPush>(*push_);
    }

    /// Frame `n` of all media, the picture last.
    void pushFrame(std::uint64_t n) {
        pushSoundAndMeta(n);
        pace_->Video(*stream_.Video(n));
    }
    void pushSoundAndMeta(std::uint64_t n) {
        for (std::uint64_t k = stream_.clock.AudioBefore(n); k < stream_.clock.AudioBefore(n + 1); ++k) {
            pace_->Audio(*stream_.Audio(k));
        }
        pace_->Meta(*stream_.Meta(n, recFlag_));
    }
    /// Waits until what was pushed stands in the caches of the recording.
    void waitForCaches(std::size_t audio, std::size_t meta) {
        ControllerPeer controller(static_cast<Controller&>(*push_));
        ASSERT_TRUE(waitUntil([&] {
            const auto buffers = controller.StreamBuffers();
            return buffers.size() == 1 && StreamBufferPeer::Cached(*buffers[0])[1] == audio &&
                   StreamBufferPeer::Cached(*buffers[0])[2] == meta;
        }));
    }
    /// From before the command to start until the recording has ended. Returns the frame of the command to
    /// stop.
    std::uint64_t record() {
        recFlag_ = false;
        for (std::uint64_t n = 0; n < kCommand; ++n) {
            pushFrame(n);
        }
        // A flag that is off at first counts as a stop, and one that is carried out late would reach the
        // recording that follows.
        EXPECT_TRUE(log_.WaitFor([](const auto& lines) {
            return std::any_of(lines.begin(), lines.end(), [](const CapturedLine& line) {
                return line.function == "clipfileModule::Controller::OnStopStream" && line.text == "end.";
            });
        }));
        recFlag_ = true;
        pace_->Meta(*stream_.Meta(kCommand, true));
        EXPECT_TRUE(log_.WaitForText("OP: CHANGE STATE stop -> wait_state."));
        const std::uint64_t firstAudio = stream_.clock.AudioBefore(kCommand);
        for (std::uint64_t k = firstAudio; k < stream_.clock.AudioBefore(kFirstPicture); ++k) {
            pace_->Audio(*stream_.Audio(k));
        }
        for (std::uint64_t n = kCommand + 1; n < kFirstPicture; ++n) {
            pace_->Meta(*stream_.Meta(n, true));
        }
        for (std::uint64_t n = kCommand; n < kFirstPicture; ++n) {
            pace_->Video(*stream_.Video(n));
        }
        // What is on its way to a cache when the IDR picture comes is not cut back with the rest.
        pushSoundAndMeta(kFirstPicture);
        waitForCaches(stream_.clock.AudioBefore(kFirstPicture + 1) - firstAudio,
                      kFirstPicture + 1 - kCommand);
        pace_->Video(*stream_.Video(kFirstPicture));

        const std::uint64_t stop = kFirstPicture + GetParam().pictures;
        for (std::uint64_t n = kFirstPicture + 1; n < stop; ++n) {
            pushFrame(n);
        }
        recFlag_ = false;
        pushFrame(stop);
        EXPECT_TRUE(waitForPrefix(log_, "OP: REC STOP."));
        // Enough for the chunk that the stop falls in, and one picture more.
        for (std::uint64_t n = stop + 1; n < stop + 40; ++n) {
            pushFrame(n);
        }
        EXPECT_TRUE(waitForPrefix(log_, "OP: END SYNC REC."));
        EXPECT_TRUE(waitForPrefix(log_, "OP: REMOVE STREAM."));
        // "output", and "standby" once the last file is closed.
        EXPECT_TRUE(host_.WaitForTransmissions(settled_ + 2));
        EXPECT_THAT(host_.Statuses(), IsEmpty());
        EXPECT_TRUE(module_.Uninitialize());
        return stop;
    }
    /// What the lines of the chunks add up to: video, audio, metadata.
    std::array<std::uint64_t, 3> chunkSums() const {
        std::array<std::uint64_t, 3> sums = {};
        for (const CapturedLine& line : log_.Lines()) {
            std::array<int, 3> counts = {};
            if (std::sscanf(line.text.c_str(), "ST: [C]\t%d\t%d\t%d", &counts[0], &counts[1], &counts[2]) ==
                3) {
                for (std::size_t i = 0; i < sums.size(); ++i) {
                    sums[i] += static_cast<std::uint64_t>(counts[i]);
                }
            }
        }
        return sums;
    }
    std::vector<RecordedFile> files() {
        names_ = RecordedNames(log_);
        std::vector<RecordedFile> files;
        for (const std::string& name : names_) {
            files.emplace_back(FindRecording(directory_.Path(), name));
        }
        return files;
    }
    /// Takes the samples of a track from a file and compares them with the stream, from `number` on.
    template <typename Expected>
    void follow(const RecordedFile& file, RecordedTrack track, std::uint64_t& number, Expected expected) {
        for (const iso::Sample& sample : file.Samples(track)) {
            ASSERT_EQ(file.BytesOf(sample), expected(number)) << "track " << track << ", unit " << number;
            ++number;
        }
    }

    LogCapture log_{LOG_PRIORITY_TRACE};
    FakeRegistry registry_;
    FakeHost host_;
    TempDir directory_;
    Mp4FileOutput module_;
    QxModuleStreamInterface* push_ = nullptr;
    std::size_t settled_ = 0;
    std::unique_ptr<PacedPush> pace_;
    const NumberedStream stream_{GetParam().rate};
    bool recFlag_ = false;
    std::vector<std::string> names_;
};

TEST_P(NothingLost, TheFilesTogetherHoldEachUnitFromTheFirstIdrPictureToTheEndOfTheLastChunkOnce) {
    const std::uint64_t stop = record();
    ASSERT_EQ(log_.CountIf([](const CapturedLine& line) { return line.priority == LOG_PRIORITY_WARNING; }),
              0U);

    // Eight pictures a chunk, and the last chunk is the one that begins at or before the stop.
    const std::uint64_t pictures = 8 * ((stop - kFirstPicture) / 8 + 1);
    const auto [chunkedVideo, chunkedAudio, chunkedMeta] = chunkSums();
    EXPECT_EQ(chunkedVideo, pictures);
    EXPECT_EQ(chunkedMeta, pictures);

    // Sound begins with the first frame that is not more than half a frame ahead of the picture.
    std::uint64_t firstAudio = 0;
    while (stream_.clock.AudioMilliSec(firstAudio) + 10 < stream_.clock.VideoMilliSec(kFirstPicture)) {
        ++firstAudio;
    }
    std::uint64_t nextPicture = kFirstPicture;
    std::uint64_t nextAudio = firstAudio;
    std::uint64_t nextMeta = kFirstPicture;
    const std::vector<RecordedFile> recorded = files();
    for (std::size_t i = 0; i < recorded.size(); ++i) {
        SCOPED_TRACE(names_[i]);
        const RecordedFile& file = recorded[i];
        EXPECT_EQ(names_[i], stream_.FileName(nextPicture));
        const std::uint64_t begin = nextPicture;
        ASSERT_NO_FATAL_FAILURE(follow(file, kRecordedVideo, nextPicture,
                                       [&](std::uint64_t n) { return stream_.VideoSample(n); }));
        ASSERT_NO_FATAL_FAILURE(
            follow(file, kRecordedAudio, nextAudio, [&](std::uint64_t n) { return stream_.AudioSample(n); }));
        ASSERT_NO_FATAL_FAILURE(follow(file, kRecordedMeta, nextMeta,
                                       [&](std::uint64_t n) { return stream_.MetaSample(n, n < stop); }));
        EXPECT_EQ(nextMeta, nextPicture);
        EXPECT_EQ(file.Samples(kRecordedTimecode).size(), 1U);
        const iso::Sample& timecode = file.Samples(kRecordedTimecode)[0];
        EXPECT_EQ(timecode.duration, (nextPicture - begin) * GetParam().rate.duration);
        if (i + 1 < recorded.size()) {
            EXPECT_EQ(nextPicture - begin, GetParam().picturesPerFile);
            // Every file but the last ends where sound and picture meet.
            EXPECT_EQ((nextAudio - firstAudio) * 1024 * GetParam().rate.timescale,
                      (nextPicture - kFirstPicture) * GetParam().rate.duration * 48000);
        }
        for (const iso::Sample& sample : file.Samples(kRecordedVideo)) {
            EXPECT_EQ(sample.isSync,
                      NumberedStream::IsIdr(begin + sample.decodeTime / GetParam().rate.duration));
        }
    }
    EXPECT_EQ(nextPicture, kFirstPicture + pictures);
    EXPECT_EQ(nextAudio, firstAudio + chunkedAudio);
    EXPECT_EQ(recorded.size(), (pictures + GetParam().picturesPerFile - 1) / GetParam().picturesPerFile);
}

INSTANTIATE_TEST_SUITE_P(Recordings, NothingLost,
                         ::testing::Values(Recording{"normal", stream_units::kRate25, 0, 8, 330},
                                           Recording{"fragment", stream_units::kRate25, 0, 8, 330},
                                           Recording{"normal", stream_units::kRate2997, 0, 640, 2000},
                                           Recording{"fragment", stream_units::kRate2997, 0, 640, 2000},
                                           // The first point in step at or after 1500 pictures.
                                           Recording{"normal", stream_units::kRate25, 1, 1504, 3100},
                                           Recording{"fragment", stream_units::kRate25, 1, 1504, 3100}),
                         [](const auto& tested) {
                             const Recording& recording = tested.param;
                             return std::string(recording.type) + std::to_string(recording.rate.key) +
                                    "Minutes" + std::to_string(recording.maxMinutes);
                         });

}  // namespace
}  // namespace clipfileModule
