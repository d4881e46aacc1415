// Recordings before judges that know nothing of us: ffprobe, ffmpeg's decoders, MediaInfo.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cstdio>
#include <map>
#include <sstream>
#include <string>

#include "support/CodedRecording.h"

namespace clipfileModule {
namespace {

constexpr std::size_t kChunks = 40;

struct Recording {
    RecordingPlan plan;
    const char* rate;       // as ffprobe writes it
    const char* shownRate;  // as MediaInfo writes it
};

Recording recordingOf(const char* type, std::uint32_t key, std::uint32_t timescale, std::uint32_t duration,
                      const char* rate, const char* shownRate, bool dropFrame,
                      RecordRules rules = RecordRules::kKept) {
    return {{type, rules, key, timescale, duration, dropFrame, kChunks}, rate, shownRate};
}

std::string nameOf(const RecordingPlan& plan) {
    return plan.type + std::to_string(plan.key) + (plan.rules == RecordRules::kExact ? "Exact" : "");
}

std::ostream& operator<<(std::ostream& out, const Recording& recording) {
    return out << nameOf(recording.plan);
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
    void SetUp() override {
        recorded.Record(plan);
        recorded.Close();
        file = "'" + recorded.Path().string() + "'";
    }

    /// With the kept rules the place of a fragmented file's timecode holds no value.
    std::string firstTimecode() const {
        const std::string separator = plan.dropFrame ? ";" : ":";
        return hasTimecode() ? "01:02:03" + separator + "04" : "00:00:00" + separator + "00";
    }
    bool hasTimecode() const {
        return plan.type == std::string("normal") || plan.rules == RecordRules::kExact;
    }

    const RecordingPlan plan = GetParam().plan;
    CodedRecording recorded;
    const TempDir& work = recorded.Work();
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
    EXPECT_EQ(stream(0, "time_base"), "1/" + std::to_string(plan.timescale));
    EXPECT_EQ(stream(0, "nb_read_packets"), "320");
    EXPECT_EQ(stream(0, "duration_ts"), std::to_string(320 * plan.duration));
    EXPECT_EQ(stream(0, "start_pts"), "0");

    EXPECT_EQ(stream(1, "codec_name"), "aac");
    EXPECT_EQ(stream(1, "profile"), "LC");
    EXPECT_EQ(stream(1, "sample_rate"), "48000");
    EXPECT_EQ(stream(1, "channels"), "2");
    EXPECT_EQ(stream(1, "nb_read_packets"), std::to_string(recorded.AudioBefore(kChunks)));
    EXPECT_EQ(stream(1, "duration_ts"), std::to_string(1024 * recorded.AudioBefore(kChunks)));

    EXPECT_EQ(stream(2, "codec_type"), "data");
    EXPECT_EQ(stream(2, "codec_tag_string"), "tmcd");
    EXPECT_EQ(stream(2, "nb_read_packets"), "1");
    // In a fragmented file the sample stands in the last fragment, where ffprobe does not read its length.
    if (plan.type == std::string("normal")) {
        EXPECT_EQ(stream(2, "duration_ts"), std::to_string(320 * plan.duration));
    }
    EXPECT_EQ(stream(2, "tags.timecode"), firstTimecode());

    EXPECT_EQ(stream(3, "codec_type"), "data");
    EXPECT_EQ(stream(3, "codec_tag_string"), "rtmd");
    EXPECT_EQ(stream(3, "nb_read_packets"), "320");
    EXPECT_EQ(stream(3, "duration_ts"), std::to_string(320 * plan.duration));
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
    EXPECT_EQ(muxer_stream::ReadFile(copy + ".v"), joined(recorded.Media().video, 320));
    EXPECT_EQ(muxer_stream::ReadFile(copy + ".a"),
              joined(recorded.Media().audio, recorded.AudioBefore(kChunks)));
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
    const std::string pictures = milliSec(320ULL * plan.duration, plan.timescale);
    const std::string sound = milliSec(1024ULL * recorded.AudioBefore(kChunks), 48000);
    EXPECT_EQ(ask("General;%VideoCount% %AudioCount% %OtherCount%|%IsTruncated%|%ConformanceErrors%"),
              "1 1 1||");
    EXPECT_EQ(
        ask("Video;%ID% %Format% %Width% %Height%|%FrameRate%|%FrameCount%|%Duration%|%Delay_DropFrame%"),
        std::string("1 AVC 320 180|") + recording.shownRate + "|320|" + pictures + "|" +
            (plan.dropFrame ? "Yes" : "No"));
    EXPECT_EQ(ask("Audio;%ID% %Format% %Format_AdditionalFeatures% %Channels% "
                  "%SamplingRate%|%FrameCount%|%Duration%"),
              "2 AAC LC 2 48000|" + std::to_string(recorded.AudioBefore(kChunks)) + "|" + sound);
    EXPECT_EQ(ask("Other;%ID% %Type%|%FrameRate%|%Duration%|%TimeCode_FirstFrame%"),
              std::string("3 Time code|") + recording.shownRate + "|" + pictures + "|" + firstTimecode());
}

INSTANTIATE_TEST_SUITE_P(
    Rates, JudgedFile,
    ::testing::Values(
        recordingOf("normal", 23980, 24000, 1001, "24000/1001", "23.976", false),
        recordingOf("normal", 24000, 24000, 1000, "24/1", "24.000", false),
        recordingOf("normal", 25000, 25000, 1000, "25/1", "25.000", false),
        recordingOf("normal", 29970, 30000, 1001, "30000/1001", "29.970", true),
        recordingOf("normal", 30000, 30000, 1000, "30/1", "30.000", false),
        recordingOf("normal", 50000, 50000, 1000, "50/1", "50.000", false),
        recordingOf("normal", 59940, 60000, 1001, "60000/1001", "59.940", true),
        recordingOf("normal", 60000, 60000, 1000, "60/1", "60.000", false),
        recordingOf("fragment", 23980, 24000, 1001, "24000/1001", "23.976", false),
        recordingOf("fragment", 24000, 24000, 1000, "24/1", "24.000", false),
        recordingOf("fragment", 25000, 25000, 1000, "25/1", "25.000", false),
        recordingOf("fragment", 29970, 30000, 1001, "30000/1001", "29.970", true),
        recordingOf("fragment", 30000, 30000, 1000, "30/1", "30.000", false),
        recordingOf("fragment", 50000, 50000, 1000, "50/1", "50.000", false),
        recordingOf("fragment", 59940, 60000, 1001, "60000/1001", "59.940", true),
        recordingOf("fragment", 60000, 60000, 1000, "60/1", "60.000", false),
        recordingOf("fragment", 25000, 25000, 1000, "25/1", "25.000", false, RecordRules::kExact),
        recordingOf("fragment", 59940, 60000, 1001, "60000/1001", "59.940", true, RecordRules::kExact)),
    [](const auto& recording) { return nameOf(recording.param.plan); });

}  // namespace
}  // namespace clipfileModule
