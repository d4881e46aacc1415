// Pictures in decoding order on their whole way from a push to a file, before a decoder: what it shows of the
// file is what it shows of the encoder's own, picture by picture and at the same times.

#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <filesystem>
#include <memory>
#include <ostream>
#include <sstream>
#include <string>
#include <vector>

#include "boxlib/support/IsoReader.h"
#include "buffer/StreamBuffer.h"
#include "support/CodedMedia.h"
#include "support/ControllerRecorder.h"
#include "support/ElementaryStreams.h"
#include "support/MuxerStream.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::FrameRate;

/// 38 chunks: `moov` and one fragment. The module takes up to 48 without a disk.
constexpr std::uint64_t kPictures = 300;

struct Encoding {
    const char* name;
    const char* options;  // of x264
};

constexpr Encoding kNone = {"NoneReordered", "bframes=0"};
constexpr Encoding kOne = {"One", "bframes=1:b-pyramid=none"};
constexpr Encoding kTwo = {"Two", "bframes=2:b-pyramid=none"};
constexpr Encoding kThree = {"Three", "bframes=3:b-pyramid=none"};
constexpr Encoding kPyramid = {"ThreeInAPyramid", "bframes=3:b-pyramid=normal"};
constexpr Encoding kSixteen = {"Sixteen", "bframes=16:b-pyramid=none"};
constexpr Encoding kSixteenPyramid = {"SixteenInAPyramid", "bframes=16:b-pyramid=normal"};
constexpr Encoding kInterlaced = {"InterlacedFrames", "bframes=3:b-pyramid=normal:tff=1:interlaced=1"};

struct Plan {
    const char* type;
    FrameRate rate;
    Encoding encoding;
};

std::string nameOf(const Plan& plan) {
    return plan.encoding.name + std::string("At") + std::to_string(plan.rate.key) +
           (plan.type == std::string("normal") ? "Normal" : "Fragmented");
}

std::ostream& operator<<(std::ostream& out, const Plan& plan) {
    return out << nameOf(plan);
}

/// A picture as a decoder shows it.
struct Shown {
    std::int64_t time;  // in pictures
    std::string digest;

    bool operator==(const Shown&) const = default;
};

std::ostream& operator<<(std::ostream& out, const Shown& shown) {
    return out << shown.time << " " << shown.digest;
}

/// When a picture is shown and decoded, in pictures.
struct Times {
    std::int64_t shown;
    std::int64_t decoded;
};

class RecordedOrder : public ::testing::TestWithParam<Plan> {
 protected:
    RecordedOrder() {
        settings.framerate = plan.rate.key;
        settings.fileType = plan.type;
        settings.filePrefix = "Cam";
        settings.outputPath = directory.ModulePath();
        settings.width = kCodedWidth;
        settings.height = kCodedHeight;
        settings.maxFileSize = 60;
        settings.recordRules = RecordRules::kExact;
        settings.pictureOrder = PictureOrder::kDecoding;
        clock.rate = plan.rate;
        encode();
    }
    ~RecordedOrder() override {
        buffer->Stop();
        controller.Clear();
    }

    /// Pushes the pictures from the `first`th in decoding order on with all that belongs to as many.
    void push(std::size_t first) {
        for (std::size_t n = first; n < units.size(); ++n) {
            buffer->PushMeta(clock.Meta(n, {{}, stream_units::Timecode{1, 2, 3, 4, false}}));
            for (std::uint64_t k = clock.AudioBefore(n); k < clock.AudioBefore(n + 1); ++k) {
                buffer->PushAudio(clock.Audio(k));
            }
            buffer->PushVideo(units[n]);
        }
    }
    std::filesystem::path recording() const {
        for (const auto& entry : std::filesystem::recursive_directory_iterator(directory.Path())) {
            if (!entry.is_directory()) {
                return entry.path();
            }
        }
        throw std::runtime_error("no file");
    }
    std::int64_t rtpOf(std::int64_t picture) const {
        return static_cast<std::int64_t>(clock.videoRtp) + picture * 90000 *
                                                               static_cast<std::int64_t>(plan.rate.duration) /
                                                               static_cast<std::int64_t>(plan.rate.timescale);
    }
    std::vector<Shown> shownOf(const std::filesystem::path& path) {
        const ProgramResult decoded = run("ffmpeg -v error -threads 1 -i '" + path.string() +
                                          "' -map 0:v -vsync passthrough -f framemd5 -");
        std::vector<Shown> pictures;
        std::istringstream in(decoded.output);
        for (std::string line; std::getline(in, line);) {
            if (line.empty() || line.front() == '#') {
                continue;
            }
            std::istringstream fields(line);
            std::string stream, dts, pts, duration, size, digest;
            fields >> stream >> dts >> pts >> duration >> size >> digest;
            pictures.push_back({std::stoll(pts), digest});
        }
        return pictures;
    }
    /// The file shows the first pictures of the source, and nothing else. FFmpeg does not obey the end of an
    /// edit of a fragmented file, and shows there what the last pictures need, too.
    void judgeShown(std::size_t count) {
        const std::vector<Shown> source = shownOf(work.Path() / "source.mp4");
        const std::vector<Shown> file = shownOf(recording());
        ASSERT_EQ(source.size(), kPictures);
        for (std::size_t i = 0; i < count && i < file.size(); ++i) {
            ASSERT_EQ(file[i], source[i]) << i;
        }
        const bool obeysEnd = plan.type == std::string("normal");
        EXPECT_EQ(file.size(), obeysEnd ? count : movie().track(1).samples.size());
    }
    iso::Movie movie() const { return iso::ReadMovie(muxer_stream::ReadFile(recording())); }
    /// The tables, before a reader of the standard: places that are filled once, and other media in step.
    void judgeTables(const iso::Movie& read, std::uint64_t shown) const {
        const auto& video = read.track(1).samples;
        ASSERT_EQ(read.track(1).edits.size(), 1U);
        const iso::Edit& edit = read.track(1).edits[0];
        EXPECT_EQ(edit.segmentDuration, shown * plan.rate.duration);
        std::vector<bool> filled(video.size());
        for (const iso::Sample& sample : video) {
            const auto time =
                static_cast<std::int64_t>(sample.decodeTime) + sample.compositionOffset - edit.mediaTime;
            ASSERT_GE(time, 0);
            ASSERT_EQ(time % static_cast<std::int64_t>(plan.rate.duration), 0);
            const auto place = static_cast<std::size_t>(time) / plan.rate.duration;
            if (place < filled.size()) {
                EXPECT_FALSE(filled[place]) << "doubled";
                filled[place] = true;
            }
        }
        EXPECT_TRUE(std::all_of(filled.begin(), filled.begin() + static_cast<std::ptrdiff_t>(shown),
                                [](bool isFilled) { return isFilled; }));
        EXPECT_EQ(read.track(4).samples.size(), shown);
        EXPECT_EQ(read.track(3).samples.at(0).duration, shown * plan.rate.duration);
        const auto audio = static_cast<double>(read.track(2).samples.size()) * 1024 / 48;
        const auto pictures = 1000.0 * static_cast<double>(shown * plan.rate.duration) /
                              static_cast<double>(plan.rate.timescale);
        EXPECT_LE(std::abs(audio - pictures), 10.7) << "milliseconds";
    }

    const Plan plan = GetParam();
    const TempDir directory;
    const TempDir work;
    stream_units::StreamClock clock;
    OutputSettings settings;
    ControllerRecorder controller;
    std::shared_ptr<StreamBuffer> buffer = std::make_shared<StreamBuffer>(&controller, 0, -1);
    std::vector<std::shared_ptr<StreamData>> units;
    std::vector<Times> times;

 private:
    ProgramResult run(const std::string& command) const {
        ProgramResult result = RunProgram(work, command);
        EXPECT_EQ(result.exitCode, 0) << result.errors;
        return result;
    }
    void encode() {
        const std::string source = "'" + (work.Path() / "source.mp4").string() + "'";
        const std::string stream = (work.Path() / "source.h264").string();
        run("ffmpeg -v error -f lavfi -i testsrc2=size=" + std::to_string(kCodedWidth) + "x" +
            std::to_string(kCodedHeight) + ":rate=" + std::to_string(plan.rate.timescale) + "/" +
            std::to_string(plan.rate.duration) + " -frames:v " + std::to_string(kPictures) +
            " -c:v libx264 -threads 1 -preset ultrafast -pix_fmt yuv420p -x264-params keyint=50:scenecut=0:"
            "b-adapt=0:open-gop=0:aud=1:repeat-headers=1:" +
            plan.encoding.options + " -video_track_timescale " + std::to_string(plan.rate.timescale) + " " +
            source);
        run("ffmpeg -v error -i " + source + " -c copy -bsf:v h264_mp4toannexb -f h264 '" + stream + "'");
        units = elementary_streams::ReadAccessUnits(stream);
        std::istringstream in(
            run("ffprobe -v error -select_streams v -show_entries packet=pts,dts -of csv=p=0 " + source)
                .output);
        for (std::string line; std::getline(in, line);) {
            std::istringstream fields(line);
            std::int64_t shown = 0;
            std::int64_t decoded = 0;
            char comma = 0;
            fields >> shown >> comma >> decoded;
            const auto duration = static_cast<std::int64_t>(plan.rate.duration);
            times.push_back({shown / duration, decoded / duration});
        }
        ASSERT_EQ(units.size(), kPictures);
        ASSERT_EQ(times.size(), kPictures);
        for (std::size_t n = 0; n < units.size(); ++n) {
            StreamData& unit = *units[n];
            unit.rtp_timestamp = static_cast<std::uint64_t>(rtpOf(times[n].decoded));
            unit.timestamp = unit.rtp_timestamp / 90;
            unit.presentation_timestamp = static_cast<std::uint64_t>(rtpOf(times[n].shown));
        }
    }
};

TEST_P(RecordedOrder, AWholeStreamIsShownAsItsEncoderMeantIt) {
    buffer->Start(settings);
    push(0);
    buffer->Stop();
    judgeShown(kPictures);
    judgeTables(movie(), kPictures);
    EXPECT_EQ(recording().filename(), "01_02_03_04.MP4");
}

TEST_P(RecordedOrder, ARecordIsShownUpToItsEndWhateverThePicturesThereNeed) {
    for (const std::size_t end : {281, 282, 283, 284}) {
        SCOPED_TRACE(end);
        std::filesystem::remove_all(directory.Path());
        std::filesystem::create_directory(directory.Path());
        buffer = std::make_shared<StreamBuffer>(&controller, 0, -1);
        buffer->Start(settings);
        buffer->SetEndTimestamp(rtpOf(static_cast<std::int64_t>(end)));
        push(0);
        ASSERT_TRUE(controller.WaitForCall("post 5"));
        buffer->Stop();
        controller.Clear();
        judgeShown(end);
        judgeTables(movie(), end);
    }
}

std::vector<Plan> plans() {
    std::vector<Plan> all;
    for (const char* type : {"normal", "fragment"}) {
        for (const FrameRate& rate : {stream_units::kRate2997, stream_units::kFrameRates[5]}) {
            all.push_back({type, rate, kPyramid});
        }
        for (const Encoding& encoding : {kNone, kOne, kTwo, kThree, kPyramid, kInterlaced}) {
            all.push_back({type, stream_units::kRate25, encoding});
        }
        for (const Encoding& encoding : {kThree, kSixteen, kSixteenPyramid}) {
            all.push_back({type, stream_units::kFrameRates[6], encoding});
        }
    }
    return all;
}

INSTANTIATE_TEST_SUITE_P(Encodings, RecordedOrder, ::testing::ValuesIn(plans()),
                         [](const auto& tested) { return nameOf(tested.param); });

}  // namespace
}  // namespace clipfileModule
