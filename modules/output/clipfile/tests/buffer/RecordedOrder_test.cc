// Pictures in decoding order on their whole way from a push to a file, before a decoder: what it shows of the
// file is what it shows of the encoder's own, picture by picture and at the same times.

#include <gtest/gtest.h>

#include <algorithm>
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
#include "support/ChunkPace.h"
#include "support/CodedMedia.h"
#include "support/ControllerRecorder.h"
#include "support/ElementaryStreams.h"
#include "support/MuxerStream.h"
#include "support/ShownPictures.h"
#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::FrameRate;

/// 38 chunks and more: `moov` and one fragment.
constexpr std::uint64_t kPictures = 300;
constexpr std::uint32_t kWidth = 160;
constexpr std::uint32_t kHeight = 96;

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
    FrameRate rate;
    Encoding encoding;
};

std::string nameOf(const Plan& plan) {
    return plan.encoding.name + std::string("At") + std::to_string(plan.rate.key);
}

std::ostream& operator<<(std::ostream& out, const Plan& plan) {
    return out << nameOf(plan);
}

/// A picture of the source, in decoding order, in pictures.
struct Times {
    std::int64_t shown;
    std::int64_t decoded;
};

ProgramResult run(const TempDir& work, const std::string& command) {
    ProgramResult result = RunProgram(work, command);
    EXPECT_EQ(result.exitCode, 0) << result.errors;
    return result;
}

/// Times and digests of what FFmpeg tells of a file in lines of "stream, dts, pts, duration, size, digest".
struct Line {
    std::int64_t dts;
    std::int64_t pts;
    std::string digest;
};

std::vector<Line> linesOf(const std::string& output) {
    std::vector<Line> lines;
    std::istringstream in(output);
    for (std::string text; std::getline(in, text);) {
        if (text.empty() || text.front() == '#') {
            continue;
        }
        std::replace(text.begin(), text.end(), ',', ' ');
        std::istringstream fields(text);
        std::string stream, duration, size;
        Line line;
        fields >> stream >> line.dts >> line.pts >> duration >> size >> line.digest;
        lines.push_back(line);
    }
    return lines;
}

/// What a decoder shows of a file, in its order.
std::vector<Line> shownOf(const TempDir& work, const std::filesystem::path& path) {
    return linesOf(run(work, "ffmpeg -v error -threads 1 -i '" + path.string() +
                                 "' -map 0:v -vsync passthrough -f framemd5 -")
                       .output);
}

/// An encoder's stream with its own times.
struct Source {
    std::vector<stream_units::Bytes> units;
    std::vector<Times> times;
    /// Of each picture, in the order in which they are shown.
    std::vector<std::string> digests;
};

Source encode(const FrameRate& rate, const Encoding& encoding) {
    const TempDir work;
    const std::string stream = (work.Path() / "source.h264").string();
    const std::string packets = (work.Path() / "packets.txt").string();
    run(work, "ffmpeg -v error -f lavfi -i testsrc2=size=" + std::to_string(kWidth) + "x" +
                  std::to_string(kHeight) + ":rate=" + std::to_string(rate.timescale) + "/" +
                  std::to_string(rate.duration) + " -frames:v " + std::to_string(kPictures) +
                  " -map 0:v -c:v libx264 -threads 1 -preset ultrafast -pix_fmt yuv420p -x264-params "
                  "keyint=50:scenecut=0:b-adapt=0:open-gop=0:aud=1:repeat-headers=1:" +
                  encoding.options + " -f tee '[f=h264]" + stream + "|[f=framecrc]" + packets + "'");
    Source source;
    for (const auto& unit : elementary_streams::ReadAccessUnits(stream)) {
        source.units.emplace_back(unit->payload, unit->payload + unit->size);
    }
    const stream_units::Bytes told = elementary_streams::ReadBytes(packets);
    for (const Line& line : linesOf(std::string(told.begin(), told.end()))) {
        source.times.push_back({line.pts, line.dts});
    }
    for (const Line& line : shownOf(work, stream)) {
        source.digests.push_back(line.digest);
    }
    return source;
}

class RecordedOrder : public ::testing::TestWithParam<Plan> {
 protected:
    RecordedOrder() {
        settings.framerate = plan.rate.key;
        settings.filePrefix = "Cam";
        settings.outputPath = directory.ModulePath();
        settings.width = kWidth;
        settings.height = kHeight;
        settings.maxFileSize = 60;
        settings.recordRules = RecordRules::kExact;
        settings.pictureOrder = PictureOrder::kDecoding;
        clock.rate = plan.rate;
    }
    void SetUp() override {
        ASSERT_EQ(source.units.size(), kPictures);
        ASSERT_EQ(source.times.size(), kPictures);
        ASSERT_EQ(source.digests.size(), kPictures);
    }

    std::shared_ptr<StreamData> unit(std::size_t n) const {
        const auto decoded = static_cast<std::uint64_t>(rtpOf(source.times[n].decoded));
        auto made = stream_units::MakeUnit(source.units[n], decoded, decoded / 90);
        made->presentation_timestamp = static_cast<std::uint64_t>(rtpOf(source.times[n].shown));
        return made;
    }
    /// Records the first `count` pictures to a file of a type, with all pictures pushed.
    void record(const std::string& type, std::size_t count) {
        std::filesystem::remove_all(directory.Path());
        std::filesystem::create_directory(directory.Path());
        settings.fileType = type;
        ControllerRecorder controller;
        const auto buffer = std::make_shared<StreamBuffer>(&controller, 0, -1);
        buffer->Start(settings);
        if (count < kPictures) {
            buffer->SetEndTimestamp(rtpOf(source.times[0].shown + static_cast<std::int64_t>(count)));
        }
        push(*buffer);
        EXPECT_TRUE(count == kPictures || controller.WaitForCall("post 5"));
        buffer->Stop();
        controller.Clear();
    }
    /// Pushes all pictures with all that belongs to as many.
    void push(StreamBuffer& buffer) const {
        const ChunkPace pace;
        for (std::size_t n = 0; n < kPictures; ++n) {
            ASSERT_TRUE(pace.WaitForRoom(n));
            buffer.PushMeta(clock.Meta(n, {{}, stream_units::Timecode{1, 2, 3, 4, false}}));
            for (std::uint64_t k = clock.AudioBefore(n); k < clock.AudioBefore(n + 1); ++k) {
                buffer.PushAudio(clock.Audio(k));
            }
            buffer.PushVideo(unit(n));
        }
        ASSERT_TRUE(pace.WaitForWriter());
    }
    std::filesystem::path recording() const {
        for (const auto& entry : std::filesystem::recursive_directory_iterator(directory.Path())) {
            if (!entry.is_directory()) {
                return entry.path();
            }
        }
        throw std::runtime_error("no file");
    }
    /// The source's pictures begin with the other media, those that wait for others earlier.
    std::int64_t rtpOf(std::int64_t picture) const {
        return static_cast<std::int64_t>(clock.videoRtp) + (picture - source.times[0].shown) * 90000 *
                                                               static_cast<std::int64_t>(plan.rate.duration) /
                                                               static_cast<std::int64_t>(plan.rate.timescale);
    }
    /// A decoder shows the first pictures of the source at their times, and behind these none, or such as
    /// they need: FFmpeg does not obey the end of the edit of a fragmented file.
    void judgeShown(std::size_t count) const {
        const TempDir work;
        const std::vector<Line> file = shownOf(work, recording());
        ASSERT_GE(file.size(), count);
        for (std::size_t i = 0; i < count; ++i) {
            ASSERT_EQ(file[i].pts, static_cast<std::int64_t>(i));
            ASSERT_EQ(file[i].digest, source.digests[i]) << i;
        }
        if (settings.fileType == "normal") {
            EXPECT_EQ(file.size(), count);
        }
    }
    /// The same before a reader of the standard, which knows the end of an edit; other media are in step.
    void judgeTables(std::size_t count) const {
        const iso::Movie movie = iso::ReadMovie(muxer_stream::ReadFile(recording()));
        const auto duration = static_cast<std::uint32_t>(plan.rate.duration);
        const std::vector<std::size_t> shown = ShownSamples(movie, duration);
        ASSERT_EQ(shown.size(), count);
        for (std::size_t i = 0; i < count; ++i) {
            EXPECT_EQ(source.times.at(shown[i]).shown - source.times[0].shown, static_cast<std::int64_t>(i));
        }
        ExpectOthersAsLong(movie, count, duration, plan.rate.timescale, 10.7);
    }

    const Plan plan = GetParam();
    const Source source = encode(plan.rate, plan.encoding);
    const TempDir directory;
    stream_units::StreamClock clock;
    OutputSettings settings;
};

TEST_P(RecordedOrder, AWholeStreamIsShownAsItsEncoderMeantIt) {
    for (const char* const type : {"normal", "fragment"}) {
        SCOPED_TRACE(type);
        record(type, kPictures);
        judgeShown(kPictures);
        judgeTables(kPictures);
        EXPECT_EQ(recording().filename(), "01_02_03_04.MP4");
    }
}

TEST_P(RecordedOrder, ARecordIsShownUpToItsEndWhateverThePicturesThereNeed) {
    for (const char* const type : {"normal", "fragment"}) {
        for (const std::size_t end : {281, 282, 283, 284}) {
            SCOPED_TRACE(type + std::to_string(end));
            record(type, end);
            judgeTables(end);
            if (end == 282) {
                judgeShown(end);
            }
        }
    }
}

std::vector<Plan> plans() {
    std::vector<Plan> all;
    for (const FrameRate& rate : {stream_units::kFrameRates[0], stream_units::kRate2997}) {
        all.push_back({rate, kPyramid});
    }
    for (const Encoding& encoding : {kNone, kOne, kTwo, kThree, kPyramid, kInterlaced}) {
        all.push_back({stream_units::kRate25, encoding});
    }
    all.push_back({stream_units::kFrameRates[5], kPyramid});
    for (const Encoding& encoding : {kSixteen, kSixteenPyramid}) {
        all.push_back({stream_units::kFrameRates[6], encoding});
    }
    return all;
}

INSTANTIATE_TEST_SUITE_P(Encodings, RecordedOrder, ::testing::ValuesIn(plans()),
                         [](const auto& tested) { return nameOf(tested.param); });

}  // namespace
}  // namespace clipfileModule
