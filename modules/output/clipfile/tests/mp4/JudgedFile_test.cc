// Recordings before judges that know nothing of us: ffprobe, ffmpeg's decoders, MediaInfo.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <map>
#include <memory>
#include <sstream>
#include <string>

#include "mp4/Mp4MuxerFactory.h"
#include "support/CodedMedia.h"
#include "support/FakePlatform.h"
#include "support/MuxerStream.h"

namespace clipfileModule {
namespace {

constexpr int kChunks = 40;
constexpr unsigned char kTimecode[4] = {1, 2, 3, 4};

struct Recording {
    const char* type;
    std::uint32_t key;  // frames per 1000 seconds
    std::uint32_t timescale;
    std::uint32_t duration;  // ticks of a frame
    const char* rate;        // as ffprobe writes it
    const char* shownRate;   // as MediaInfo writes it
    bool dropFrame;
};

std::ostream& operator<<(std::ostream& out, const Recording& recording) {
    return out << recording.type << recording.key;
}

/// The lines "key=value" of ffprobe's flat output.
std::map<std::string, std::string> parse(const std::string& output) {
    std::map<std::string, std::string> values;
    std::istringstream in(output);
    for (std::string line; std::getline(in, line);) {
        const std::size_t at = line.find('=');
        std::string value = line.substr(at + 1);
        if (value.size() >= 2 && value.front() == '"') {
            value = value.substr(1, value.size() - 2);
        }
        values[line.substr(0, at)] = value;
    }
    return values;
}

class JudgedFile : public ::testing::TestWithParam<Recording> {
 protected:
    /// 40 chunks of 8 pictures, with the audio that belongs to them and a unit of metadata a picture.
    void SetUp() override {
        const Recording& recording = GetParam();
        muxer_stream::StopTheClock(platform);
        media =
            MakeCodedMedia(work, recording.timescale, recording.duration, kChunks * 8, audioBefore(kChunks));
        OutputSettings settings = muxer_stream::MakeSettings(directory, recording.key);
        settings.width = kCodedWidth;
        settings.height = kCodedHeight;
        settings.sps = media.sps;
        settings.pps = media.pps;
        std::shared_ptr<Mp4Muxer> muxer;
        ASSERT_TRUE(Mp4MuxerFactory().Create(recording.type, muxer));
        ASSERT_TRUE(muxer->Initialize());
        ASSERT_TRUE(muxer->Open(settings, kTimecode, recording.dropFrame));
        for (std::size_t i = 0; i < kChunks; ++i) {
            const auto chunk = std::make_shared<ChunkData>();
            const auto at = [](const auto& list, std::size_t n) {
                return list.begin() + static_cast<std::ptrdiff_t>(n);
            };
            chunk->video.assign(at(media.video, 8 * i), at(media.video, 8 * i + 8));
            chunk->audio.assign(at(media.audio, audioBefore(i)), at(media.audio, audioBefore(i + 1)));
            for (std::size_t n = 0; n < 8; ++n) {
                chunk->meta.push_back(muxer_stream::MakeSample(64, static_cast<unsigned char>(8 * i + n)));
            }
            ASSERT_TRUE(muxer->Write(chunk));
        }
        ASSERT_TRUE(muxer->WriteTmcd(kTimecode));
        ASSERT_TRUE(muxer->Close());
        file = "'" + (directory.Path() / "01_02_03_04.MP4").string() + "'";
    }

    /// Audio frames that begin before the chunk.
    static std::size_t audioBefore(std::size_t chunk) {
        const Recording& recording = GetParam();
        return (chunk * 8 * recording.duration * 48000 + recording.timescale * 1024ULL - 1) /
               (recording.timescale * 1024ULL);
    }
    /// The place of a fragmented file's timecode holds no value.
    std::string firstTimecode() const {
        const std::string separator = GetParam().dropFrame ? ";" : ":";
        return fragmented() ? "00:00:00" + separator + "00" : "01:02:03" + separator + "04";
    }
    bool fragmented() const { return GetParam().type == std::string("fragment"); }

    FakePlatform platform;
    TempDir directory;
    TempDir work;
    CodedMedia media;
    std::string file;
};

TEST_P(JudgedFile, FfprobeFindsFourTracksWithTheirCountsAndDurationsAndNothingToWarnOf) {
    const Recording& recording = GetParam();
    const ProgramResult judged =
        RunProgram(work, "ffprobe -v warning -count_packets -show_streams -show_format -of flat " + file);
    EXPECT_EQ(judged.exitCode, 0);
    // What ffprobe says of every track that it has no decoder for.
    EXPECT_EQ(judged.errors,
              "Unsupported codec with id 0 for input stream 2\n"
              "Unsupported codec with id 0 for input stream 3\n");
    auto values = parse(judged.output);
    const auto stream = [&](int index, const std::string& name) {
        return values["streams.stream." + std::to_string(index) + "." + name];
    };
    EXPECT_EQ(values["format.nb_streams"], "4");
    EXPECT_EQ(values["format.tags.major_brand"], "ZQVC");

    EXPECT_EQ(stream(0, "codec_name"), "h264");
    EXPECT_EQ(stream(0, "codec_tag_string"), "avc1");
    EXPECT_EQ(stream(0, "width"), "320");
    EXPECT_EQ(stream(0, "height"), "180");
    EXPECT_EQ(stream(0, "r_frame_rate"), recording.rate);
    EXPECT_EQ(stream(0, "avg_frame_rate"), recording.rate);
    EXPECT_EQ(stream(0, "time_base"), "1/" + std::to_string(recording.timescale));
    EXPECT_EQ(stream(0, "nb_read_packets"), "320");
    EXPECT_EQ(stream(0, "duration_ts"), std::to_string(320 * recording.duration));
    EXPECT_EQ(stream(0, "start_pts"), "0");

    EXPECT_EQ(stream(1, "codec_name"), "aac");
    EXPECT_EQ(stream(1, "profile"), "LC");
    EXPECT_EQ(stream(1, "sample_rate"), "48000");
    EXPECT_EQ(stream(1, "channels"), "2");
    EXPECT_EQ(stream(1, "nb_read_packets"), std::to_string(audioBefore(kChunks)));
    EXPECT_EQ(stream(1, "duration_ts"), std::to_string(1024 * audioBefore(kChunks)));

    EXPECT_EQ(stream(2, "codec_type"), "data");
    EXPECT_EQ(stream(2, "codec_tag_string"), "tmcd");
    EXPECT_EQ(stream(2, "nb_read_packets"), "1");
    // In a fragmented file the sample stands in the last fragment, where ffprobe reads neither its value nor
    // its length.
    if (!fragmented()) {
        EXPECT_EQ(stream(2, "duration_ts"), std::to_string(320 * recording.duration));
        EXPECT_EQ(stream(2, "tags.timecode"), firstTimecode());
    }

    EXPECT_EQ(stream(3, "codec_type"), "data");
    EXPECT_EQ(stream(3, "codec_tag_string"), "rtmd");
    EXPECT_EQ(stream(3, "nb_read_packets"), "320");
    EXPECT_EQ(stream(3, "duration_ts"), std::to_string(320 * recording.duration));
    for (int index = 0; index < 4; ++index) {
        EXPECT_EQ(stream(index, "id"), "0x" + std::to_string(index + 1));
        EXPECT_EQ(stream(index, "tags.language"), "eng");
        EXPECT_EQ(stream(index, "tags.creation_time"), "2026-11-20T10:20:30.000000Z");
    }
}

TEST_P(JudgedFile, FfmpegDecodesItFromEndToEndWithoutAWord) {
    const ProgramResult judged =
        RunProgram(work, "ffmpeg -v warning -xerror -i " + file + " -map 0:v -map 0:a -f framecrc -");
    EXPECT_EQ(judged.exitCode, 0);
    EXPECT_EQ(judged.errors, "");
    std::istringstream in(judged.output);
    std::size_t pictures = 0;
    for (std::string line; std::getline(in, line);) {
        pictures += line.starts_with("0,") ? 1 : 0;
    }
    EXPECT_EQ(pictures, 320U);
}

TEST_P(JudgedFile, FfmpegCopiesItsSamplesOutByteForByte) {
    const std::string copy = (work.Path() / "copy").string();
    const ProgramResult judged = RunProgram(
        work, "ffmpeg -v warning -i " + file + " -map 0:v -c copy -f data '" + copy +
                  ".v' -map 0:a -c copy -f data '" + copy + ".a' -map 0:3 -c copy -f data '" + copy + ".m'");
    EXPECT_EQ(judged.exitCode, 0) << judged.errors;
    const auto joined = [](const auto& samples, std::size_t count) {
        muxer_stream::Bytes bytes;
        for (std::size_t i = 0; i < count; ++i) {
            bytes.insert(bytes.end(), samples[i]->GetData(),
                         samples[i]->GetData() + samples[i]->GetDataSize());
        }
        return bytes;
    };
    EXPECT_EQ(muxer_stream::ReadFile(copy + ".v"), joined(media.video, 320));
    EXPECT_EQ(muxer_stream::ReadFile(copy + ".a"), joined(media.audio, audioBefore(kChunks)));
    EXPECT_EQ(muxer_stream::ReadFile(copy + ".m").size(), 320U * 64);
}

TEST_P(JudgedFile, MediaInfoFindsTheTracksTheirLengthsAndTheTimecode) {
    const Recording& recording = GetParam();
    const auto ask = [&](const std::string& question) {
        const ProgramResult judged = RunProgram(work, "mediainfo '--Inform=" + question + "' " + file);
        EXPECT_EQ(judged.exitCode, 0);
        return judged.output.substr(0, judged.output.find('\n'));
    };
    const auto milliSec = [](std::uint64_t ticks, std::uint64_t timescale) {
        return std::to_string((ticks * 1000 + timescale / 2) / timescale);
    };
    const std::string pictures = milliSec(320ULL * recording.duration, recording.timescale);
    const std::string sound = milliSec(1024ULL * audioBefore(kChunks), 48000);
    EXPECT_EQ(ask("General;%VideoCount% %AudioCount% %OtherCount%|%IsTruncated%|%ConformanceErrors%"),
              "1 1 1||");
    EXPECT_EQ(
        ask("Video;%ID% %Format% %Width% %Height%|%FrameRate%|%FrameCount%|%Duration%|%Delay_DropFrame%"),
        std::string("1 AVC 320 180|") + recording.shownRate + "|320|" + pictures + "|" +
            (recording.dropFrame ? "Yes" : "No"));
    EXPECT_EQ(ask("Audio;%ID% %Format% %Format_AdditionalFeatures% %Channels% "
                  "%SamplingRate%|%FrameCount%|%Duration%"),
              "2 AAC LC 2 48000|" + std::to_string(audioBefore(kChunks)) + "|" + sound);
    EXPECT_EQ(ask("Other;%ID% %Type%|%FrameRate%|%Duration%|%TimeCode_FirstFrame%"),
              std::string("3 Time code|") + recording.shownRate + "|" + pictures + "|" + firstTimecode());
}

INSTANTIATE_TEST_SUITE_P(
    Rates, JudgedFile,
    ::testing::Values(Recording{"normal", 23980, 24000, 1001, "24000/1001", "23.976", false},
                      Recording{"normal", 24000, 24000, 1000, "24/1", "24.000", false},
                      Recording{"normal", 25000, 25000, 1000, "25/1", "25.000", false},
                      Recording{"normal", 29970, 30000, 1001, "30000/1001", "29.970", true},
                      Recording{"normal", 30000, 30000, 1000, "30/1", "30.000", false},
                      Recording{"normal", 50000, 50000, 1000, "50/1", "50.000", false},
                      Recording{"normal", 59940, 60000, 1001, "60000/1001", "59.940", true},
                      Recording{"normal", 60000, 60000, 1000, "60/1", "60.000", false},
                      Recording{"fragment", 23980, 24000, 1001, "24000/1001", "23.976", false},
                      Recording{"fragment", 24000, 24000, 1000, "24/1", "24.000", false},
                      Recording{"fragment", 25000, 25000, 1000, "25/1", "25.000", false},
                      Recording{"fragment", 29970, 30000, 1001, "30000/1001", "29.970", true},
                      Recording{"fragment", 30000, 30000, 1000, "30/1", "30.000", false},
                      Recording{"fragment", 50000, 50000, 1000, "50/1", "50.000", false},
                      Recording{"fragment", 59940, 60000, 1001, "60000/1001", "59.940", true},
                      Recording{"fragment", 60000, 60000, 1000, "60/1", "60.000", false}),
    [](const auto& recording) { return recording.param.type + std::to_string(recording.param.key); });

}  // namespace
}  // namespace clipfileModule
