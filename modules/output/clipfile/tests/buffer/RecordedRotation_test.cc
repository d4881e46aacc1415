// Long streams of pictures in decoding order, recorded in many files: one behind the other they show the
// source.

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <ostream>
#include <string>
#include <tuple>
#include <utility>
#include <vector>

#include "boxlib/support/IsoReader.h"
#include "buffer/StreamBuffer.h"
#include "support/ChunkPace.h"
#include "support/ControllerRecorder.h"
#include "support/MuxerStream.h"
#include "support/ReorderedStream.h"
#include "support/ShownPictures.h"
#include "support/TempDir.h"

namespace clipfileModule {
namespace {

using reordered_stream::Pattern;
using reordered_stream::Picture;
using stream_units::FrameRate;

/// Of an audio frame.
constexpr double kMilliSec = 1024.0 / 48;

struct Plan {
    const char* name;
    FrameRate rate;
    Pattern pattern;
    std::uint64_t gop;
    std::uint64_t minutes;
    std::uint64_t pictures;
    /// The number of a picture that is lost, in decoding order; 0 for none.
    std::uint64_t lost;
    /// Pictures of each file.
    std::vector<std::size_t> files;
};

std::ostream& operator<<(std::ostream& out, const Plan& plan) {
    return out << plan.name;
}

const Plan kPlans[] = {
    // 64 s: where an IDR frame meets the cadence of 1280 pictures.
    {"EachMinute",
     stream_units::kFrameRates[6],
     reordered_stream::kPyramid,
     60,
     1,
     3840 + 100,
     0,
     {3840, 100}},
    // 64 s at 29.97: where it meets that of 640.
    {"EachMinuteAt2997",
     stream_units::kRate2997,
     reordered_stream::kTwoB,
     30,
     1,
     2 * 1920 + 77,
     0,
     {1920, 1920, 77}},
    // IDR frames meet the cadence of 8 pictures every 200.
    {"WhereIdrFramesMeetTheCadence",
     stream_units::kRate25,
     reordered_stream::kPyramid,
     25,
     0,
     650,
     0,
     {200, 200, 200, 50}},
    // The IDR frames stand at 24 n - 1 and never meet it: two minutes are 3000 pictures, the next one is 3000
    // - 1
    // + 24.
    {"BehindALostPicture", stream_units::kRate25, reordered_stream::kPyramid, 24, 0, 3100, 10, {3023, 76}},
    // None comes in four minutes: 6000 pictures and the rest of a chunk, which are closed behind 1 + 4 n.
    {"WithoutIdrFrames", stream_units::kRate25, reordered_stream::kPyramid, 100000, 0, 6100, 0, {6005, 95}},
};

class RecordedRotation : public ::testing::TestWithParam<std::tuple<Plan, const char*>> {
 protected:
    RecordedRotation() {
        clock.rate = plan.rate;
        settings.framerate = plan.rate.key;
        settings.fileType = std::get<1>(GetParam());
        settings.filePrefix = "Cam";
        settings.outputPath = directory.ModulePath();
        settings.width = 64;
        settings.height = 48;
        settings.maxFileSize = plan.minutes;
        settings.recordRules = RecordRules::kExact;
        settings.pictureOrder = PictureOrder::kDecoding;
    }
    ~RecordedRotation() override {
        buffer->Stop();
        controller.Clear();
    }

    void pushOthersBefore(std::uint64_t picture) {
        for (; nextAudio < clock.AudioBefore(picture); ++nextAudio) {
            buffer->PushAudio(clock.Audio(nextAudio));
        }
        for (; nextMeta < picture; ++nextMeta) {
            buffer->PushMeta(clock.Meta(nextMeta));
        }
    }
    void record(const std::vector<Picture>& pictures) {
        const std::uint64_t delay = reordered_stream::DelayOf(plan.pattern);
        buffer->Start(settings);
        for (std::size_t n = 0; n < pictures.size(); ++n) {
            ASSERT_TRUE(pace.WaitForRoom(n));
            pushOthersBefore(n + 1);
            if (plan.lost == 0 || n != plan.lost) {
                buffer->PushVideo(reordered_stream::MakeUnit(clock, n, pictures[n], delay));
            }
        }
        pushOthersBefore(pictures.size() + delay + 2);
        ASSERT_TRUE(pace.WaitForWriter());
        buffer->Stop();
    }

    struct File {
        std::vector<std::uint64_t> pictures;  // in the order in which they are shown
        std::vector<std::uint64_t> audio;
        iso::Movie movie;
    };
    /// All files, in the order of the stream.
    std::vector<File> files(const std::vector<Picture>& pictures) const {
        std::vector<File> all;
        for (const auto& entry : std::filesystem::recursive_directory_iterator(directory.Path())) {
            if (entry.is_directory()) {
                continue;
            }
            const auto bytes = muxer_stream::ReadFile(entry.path());
            File file;
            file.movie = iso::ReadMovie(bytes);
            const auto numberOf = [&](char medium, const iso::Sample& sample) {
                return stream_units::NumberIn(medium, bytes.data() + sample.offset, sample.size).value();
            };
            const auto duration = static_cast<std::uint32_t>(plan.rate.duration);
            for (const std::size_t sample : ShownSamples(file.movie, duration)) {
                file.pictures.push_back(
                    pictures.at(numberOf('V', file.movie.track(1).samples.at(sample))).shown);
            }
            for (const iso::Sample& sample : file.movie.track(2).samples) {
                file.audio.push_back(numberOf('A', sample));
            }
            // Up to half a frame at each end.
            ExpectOthersAsLong(file.movie, file.pictures.size(), duration, plan.rate.timescale,
                               kMilliSec + 0.1);
            all.push_back(std::move(file));
        }
        std::sort(all.begin(), all.end(),
                  [](const File& a, const File& b) { return a.pictures.front() < b.pictures.front(); });
        return all;
    }

    const Plan plan = std::get<0>(GetParam());
    const TempDir directory;
    const ChunkPace pace;
    stream_units::StreamClock clock;
    OutputSettings settings;
    ControllerRecorder controller;
    std::shared_ptr<StreamBuffer> buffer = std::make_shared<StreamBuffer>(&controller, 0, -1);
    std::uint64_t nextAudio = 0;
    std::uint64_t nextMeta = 0;
};

TEST_P(RecordedRotation, AllFilesTogetherShowTheSource) {
    const auto pictures = reordered_stream::MakePictures(plan.pattern, plan.gop, plan.pictures);
    record(pictures);
    const auto recorded = files(pictures);
    std::vector<std::uint64_t> shown;
    std::vector<std::uint64_t> audio;
    std::vector<std::size_t> counts;
    for (const File& file : recorded) {
        // Each file begins in step: half an audio frame at the most.
        const double begins = 1000.0 * static_cast<double>(shown.size() * plan.rate.duration) /
                              static_cast<double>(plan.rate.timescale);
        EXPECT_LE(std::abs(static_cast<double>(audio.size()) * kMilliSec - begins), kMilliSec / 2 + 0.1);
        shown.insert(shown.end(), file.pictures.begin(), file.pictures.end());
        audio.insert(audio.end(), file.audio.begin(), file.audio.end());
        counts.push_back(file.pictures.size());
    }
    std::vector<std::uint64_t> source;
    for (std::uint64_t i = 0; i < plan.pictures; ++i) {
        if (plan.lost == 0 || i != pictures[plan.lost].shown) {
            source.push_back(i);
        }
    }
    EXPECT_EQ(shown, source);
    for (std::size_t i = 1; i < audio.size(); ++i) {
        ASSERT_EQ(audio[i], audio[i - 1] + 1);
    }
    EXPECT_EQ(counts, plan.files);
    for (std::size_t i = 0; i < recorded.size(); ++i) {
        EXPECT_EQ(recorded[i].movie.track(1).samples.at(0).isSync, i == 0 || plan.gop < 1000);
    }
}

INSTANTIATE_TEST_SUITE_P(
    Streams, RecordedRotation,
    ::testing::Combine(::testing::ValuesIn(kPlans), ::testing::Values("normal", "fragment")),
    [](const auto& tested) {
        return std::get<0>(tested.param).name +
               std::string(std::get<1>(tested.param) == std::string("normal") ? "Normal" : "Fragmented");
    });

}  // namespace
}  // namespace clipfileModule
