// Sources that become another one in the middle of a connection.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>
#include <fstream>

#include "endtoend/ReceiverFixture.h"
#include "support/CodedMedia.h"
#include "support/Judges.h"
#include "support/Material.h"
#include "support/NumberedMedia.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

using ::testing::HasSubstr;
using ::testing::SizeIs;

class FormatChangesTest : public ReceiverFixture {
 protected:
    /// Two parts of one stream, one behind the other, the second without its first `header` bytes.
    std::filesystem::path Join(const MaterialOptions& first, const MaterialOptions& second,
                               std::streamoff header = 0) const {
        const auto whole = folder.Path() / "joined";
        std::ofstream out(whole, std::ios::binary);
        for (const MaterialOptions& options : {first, second}) {
            const auto part = MakeMaterial(folder, options);
            std::ifstream in(part, std::ios::binary);
            in.seekg(out.tellp() == 0 ? 0 : header);
            out << in.rdbuf();
            std::filesystem::remove(part);
        }
        return whole;
    }
};

TEST_F(FormatChangesTest, AnotherSizeAndRateGoOnInAFileOfTheirOwn) {
    MaterialOptions first;
    first.seconds = 2;
    MaterialOptions second = first;
    second.size = "256x144";
    second.rate = "50";
    second.more = {"-output_ts_offset", "2", "-mpegts_flags", "+initial_discontinuity"};
    const auto whole = Join(first, second);
    const Outcome outcome =
        RunReceiver({"--input", whole.string(), "--timecode", "10:00:00:00", "--speed", "4"});
    EXPECT_EQ(outcome.code, 8) << outcome.errors;
    EXPECT_THAT(
        outcome.errors,
        HasSubstr("the picture changed from 320x180 to 256x144: the recording goes on in a new file"));
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(2)) << outcome.errors;
    EXPECT_EQ(recordings[0].filename(), "10_00_00_00.MP4");
    EXPECT_EQ(recordings[1].filename(), "10_00_02_00.MP4");
    EXPECT_EQ(StreamOf(AskFfprobe(recordings[0]), "avc1").value("width", 0), 320);
    const auto after = StreamOf(AskFfprobe(recordings[1]), "avc1");
    EXPECT_EQ(after.value("width", 0), 256);
    EXPECT_EQ(after.value("avg_frame_rate", ""), "50/1");
    for (const auto& recording : recordings) {
        EXPECT_EQ(DecodeVideo(recording).messages, "") << recording;
    }
    EXPECT_GE(DecodeVideo(recordings[0]).checksums.size(), 40U);
    EXPECT_GE(DecodeVideo(recordings[1]).checksums.size(), 90U);
}

/// In containers that describe their streams at their beginning.
class ContainerChangesTest : public FormatChangesTest, public ::testing::WithParamInterface<const char*> {
 protected:
    /// Two seconds of 320x180, then two of 256x144.
    std::filesystem::path Make() const {
        MaterialOptions first;
        first.seconds = 2;
        MaterialOptions second = first;
        second.size = "256x144";
        second.more = {"-output_ts_offset", "2"};
        const auto whole = folder.Path() / ("changing." + std::string(GetParam()));
        if (whole.extension() == ".flv") {
            first.container = second.container = "flv";
            const auto joined = Join(first, second, kFlvHeader);
            std::filesystem::rename(joined, whole);
            return whole;
        }
        // A part begins with the priming of its audio, 1024 samples in front of its pictures.
        first.more = {"-muxdelay", "0"};
        second.more = {
            "-muxdelay", "0", "-output_ts_offset", "2.021333", "-mpegts_flags", "+initial_discontinuity"};
        const Outcome outcome = RunProgram(
            {"ffmpeg", "-v", "error", "-i", Join(first, second).string(), "-c", "copy", whole.string()});
        EXPECT_EQ(outcome.code, 0) << outcome.errors;
        return whole;
    }

 private:
    /// Of each part but the first; the first tag has the size of the one before in front.
    static constexpr std::streamoff kFlvHeader = 9 + 4;
};

TEST_P(ContainerChangesTest, GoOnInAFileOfTheirOwnAndMakeTheExitCode8) {
    const Outcome outcome =
        RunReceiver({"--input", Make().string(), "--timecode", "10:00:00:00", "--speed", "4"});
    EXPECT_EQ(outcome.code, 8) << outcome.errors;
    EXPECT_THAT(outcome.errors, HasSubstr(": the recording goes on in a new file"));
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(2)) << outcome.errors;
    EXPECT_EQ(StreamOf(AskFfprobe(recordings[0]), "avc1").value("width", 0), 320);
    EXPECT_EQ(StreamOf(AskFfprobe(recordings[1]), "avc1").value("width", 0), 256);
    for (const auto& recording : recordings) {
        const Decoded decoded = DecodeVideo(recording);
        EXPECT_EQ(decoded.messages, "") << recording;
        EXPECT_GE(decoded.checksums.size(), 40U) << recording;
    }
}

INSTANTIATE_TEST_SUITE_P(Containers, ContainerChangesTest, ::testing::Values("mp4", "mkv", "flv"),
                         [](const auto& container) { return std::string(container.param); });

/// A live stream that goes on in another format.
struct LiveChange {
    const char* name;
    NumberedPart before;
    NumberedPart after;
    const char* sentence;
    bool transcode = false;
    /// Pictures of what follows that the first file holds too.
    std::size_t unnoticed = 0;
};

/// A multiplexer sends sound up to half a second behind the pictures that it belongs to, and the receiver
/// holds it until the next stamp proves it.
constexpr std::size_t kUntilSound = 25;

std::ostream& operator<<(std::ostream& out, const LiveChange& change) {
    return out << change.name;
}

class LiveChangesTest : public ReceiverFixture, public ::testing::WithParamInterface<LiveChange> {};

TEST_P(LiveChangesTest, AreToldOnceAndGoOnInStepInAFileOfTheirOwn) {
    const NumberedPart& before = GetParam().before;
    NumberedPart after = GetParam().after;
    after.start = before.start + before.seconds;
    // FFmpeg's libraries look at HEVC for five seconds before they know it.
    after.seconds = GetParam().transcode ? 7 : 3;
    after.number = 1000;
    const auto first = folder.Path() / "before.ts";
    const auto second = folder.Path() / "after.ts";
    WriteNumbered(before, first);
    WriteNumbered(after, second);
    const FreePorts ports;
    std::vector<std::string> options{"--input",    "udp://127.0.0.1:" + std::to_string(ports.First()),
                                     "--timeout",  "3",
                                     "--timecode", "10:00:00:00"};
    if (GetParam().transcode) {
        options.emplace_back("--transcode");
    }
    const auto receiver = Start(options);
    ASSERT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
    SendFile(first, ports.First(), std::chrono::seconds(before.seconds));
    SendFile(second, ports.First(), std::chrono::seconds(after.seconds));
    ASSERT_TRUE(receiver->WaitForText("the source was lost")) << receiver->AllText();
    receiver->Signal(SIGINT);
    EXPECT_EQ(receiver->Wait(), 8) << receiver->AllText();

    const std::string told = receiver->Errors();
    const std::string sentence = std::string(GetParam().sentence) + ": the recording goes on in a new file";
    const std::size_t at = told.find(sentence);
    EXPECT_NE(at, std::string::npos) << told;
    EXPECT_EQ(told.find("the recording goes on in a new file", at + sentence.size()), std::string::npos)
        << told;
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(2)) << told;
    NumberedRecording one = ReadNumbered(recordings[0]);
    const std::size_t own = one.CountOf(before);
    EXPECT_LE(one.numbers.size() - own, GetParam().unnoticed) << told;
    one.numbers.resize(own);
    one.times.resize(own);
    ExpectInStep(one, before);
    const NumberedRecording other = ReadNumbered(recordings[1]);
    ExpectInStep(other, after);
    ASSERT_FALSE(one.numbers.empty() || other.numbers.empty());
    // All of it, but for the picture at whose end and the group in which it became another one.
    EXPECT_EQ(one.numbers.front(), before.number);
    EXPECT_GE(one.numbers.size(), static_cast<std::size_t>(before.seconds * before.rate - 1)) << told;
    EXPECT_LE(other.numbers.front(), after.number + GetParam().unnoticed + 10) << told;
    EXPECT_EQ(after.TimeOf(other.numbers.back() + 1), after.start + after.seconds) << told;
    for (const auto& recording : recordings) {
        EXPECT_EQ(DecodeVideo(recording).messages, "") << recording;
        EXPECT_EQ(DecodeAudio(recording).messages, "") << recording;
        EXPECT_EQ(StreamOf(AskFfprobe(recording), "video").value("codec_name", ""), "h264");
    }
}

const NumberedPart kPlain;

NumberedPart WithAudio(const std::vector<std::string>& audio) {
    NumberedPart part;
    part.audio = audio;
    return part;
}
NumberedPart WithVideo(const std::vector<std::string>& video) {
    NumberedPart part;
    part.video = video;
    return part;
}
NumberedPart WithRate(int rate) {
    NumberedPart part;
    part.rate = rate;
    return part;
}
NumberedPart WithSize(const char* size) {
    NumberedPart part;
    part.size = size;
    return part;
}

INSTANTIATE_TEST_SUITE_P(
    All, LiveChangesTest,
    ::testing::Values(
        LiveChange{"AudioRate", kPlain, WithAudio({"-c:a", "aac", "-ac", "2", "-ar", "44100"}),
                   "the audio is no longer AAC LC 48 kHz stereo", false, kUntilSound},
        LiveChange{"AudioChannels", kPlain, WithAudio({"-c:a", "aac", "-ac", "1", "-ar", "48000"}),
                   "the audio is no longer AAC LC 48 kHz stereo", false, kUntilSound},
        LiveChange{"AudioBegins", WithAudio({}), kPlain, "audio has begun", false, kUntilSound},
        LiveChange{"Rate", kPlain, WithRate(50), "the frame rate of the video changed"},
        LiveChange{"Size", kPlain, WithSize("256x144"), "the picture changed from 160x96 to 256x144"},
        LiveChange{"Reordered", kPlain,
                   WithVideo({"-c:v", "libx264", "-preset", "ultrafast", "-bf", "2", "-g", "10",
                              "-x264-params", "scenecut=0:open-gop=0"}),
                   // Known by the second of them.
                   "the video begins to send its pictures reordered (B frames)", false, 2},
        LiveChange{"Hevc", kPlain,
                   WithVideo({"-c:v", "libx265", "-preset", "ultrafast", "-x265-params",
                              "log-level=none:bframes=0:keyint=10:min-keyint=10:repeat-headers=1"}),
                   "the video changed from h264 to hevc", true}),
    ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
