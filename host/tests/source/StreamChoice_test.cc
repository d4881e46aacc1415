#include "SourceTesting.h"

namespace receiver {
namespace {

using std::string;

/// Two programs: 1 with a video of 128x96 and two sounds, 2 with a video of 160x112 and one sound.
class StreamChoiceTest : public SourceTest {
 protected:
    void Make() const {
        const string picture = " -f lavfi -i testsrc2=rate=25:duration=1:size=";
        const string tone = " -f lavfi -i sine=sample_rate=48000:duration=1:frequency=";
        Ffmpeg(picture + "128x96" + picture + "160x112" + tone + "500" + tone + "700" + tone + "900" +
               " -map 0 -map 2 -map 3 -map 1 -map 4 " + kPlainH264 + kPlainAac +
               " -metadata:s:a:0 language=eng -metadata:s:a:1 language=deu"
               " -program program_num=1:st=0:st=1:st=2 -program program_num=2:st=3:st=4 a.ts");
    }
    /// The frequency of the tone that comes.
    double ToneOf(const std::vector<SourceUnit>& units) const {
        std::FILE* const file = std::fopen(Path("out.aac").c_str(), "wb");
        const string bytes = BytesOf(Of(Medium::kAudio, units));
        std::fwrite(bytes.data(), 1, bytes.size(), file);
        EXPECT_EQ(std::fclose(file), 0);
        const string stats =
            Shell("ffmpeg -ss 0.2 -t 0.5 -i out.aac -af astats=measure_overall=none -f null - 2>&1");
        const std::size_t at = stats.find("Zero crossings rate: ");
        EXPECT_NE(at, string::npos) << stats;
        return at == string::npos ? 0 : std::stod(stats.substr(at + 21)) * 48000 / 2;
    }
    void Expect(const SourceOptions& options, std::uint32_t width, double tone) {
        const auto source = OpenSource(options, notices_, nullptr);
        EXPECT_EQ(source->Description().width, width);
        EXPECT_NEAR(ToneOf(ReadAll(*source)), tone, 20);
    }
};

TEST_F(StreamChoiceTest, AProgramIsChosenByItsNumber) {
    Make();
    SourceOptions options = Fast("a.ts");
    options.program = 1;
    Expect(options, 128, 500);
    EXPECT_EQ(
        notices_.CountOf("recorded: video 1 (h264 128x96) and audio 1 (AAC LC 48 kHz stereo, eng); left out: "
                         "audio 2 (AAC LC 48 kHz stereo, deu)"),
        1u)
        << testing::PrintToString(notices_.sentences);
    options.program = 2;
    Expect(options, 160, 900);
}

TEST_F(StreamChoiceTest, VideoAndAudioAreChosenByTheirPlace) {
    Make();
    SourceOptions options = Fast("a.ts");
    options.video = 1;
    options.audio = 3;
    Expect(options, 128, 900);
    options.video = 2;
    options.audio = 2;
    Expect(options, 160, 700);
    options.video.reset();
    options.program = 1;
    Expect(options, 128, 700);
}

TEST_F(StreamChoiceTest, WithoutAWordOneProgramIsTakenAndTheRestIsTold) {
    Make();
    Expect(Fast("a.ts"), 160, 900);
    EXPECT_EQ(notices_.CountOf(
                  "recorded: video 2 (h264 160x112) and audio 3 (AAC LC 48 kHz stereo); left out: video 1"),
              1u)
        << testing::PrintToString(notices_.sentences);
}

TEST_F(StreamChoiceTest, WhatIsNotThereIsRefused) {
    Make();
    SourceOptions options = Fast("a.ts");
    options.program = 7;
    EXPECT_EQ(string(Refusal(options).what()), "'" + Path("a.ts") + "' has no program 7: it has 1 and 2");
    options.program = 2;
    options.audio = 2;
    EXPECT_EQ(string(Refusal(options).what()), "'" + Path("a.ts") + "' has no audio 2: it has 1");
    options.program.reset();
    options.video = 3;
    const ReceiverError error = Refusal(options);
    EXPECT_EQ(error.Code(), ExitCode::kSourceUnsuitable);
    EXPECT_EQ(string(error.what()), "'" + Path("a.ts") + "' has no video 3: it has 2");
}

TEST_F(StreamChoiceTest, InterlacedVideoIsRecordedAsSuchAndTold) {
    Ffmpeg(string(kPicture) + kPlainH264 + "-flags +ildct -x264-params tff=1 a.ts");
    Ffmpeg("-i a.ts -map 0:v -c copy -f data video.bin");
    const auto video = Of(Medium::kVideo, ReadFile("a.ts"));
    EXPECT_EQ(video.size(), 25u);
    EXPECT_EQ(BytesOf(video), FileBytes(Path("video.bin")));
    EXPECT_EQ(notices_.CountOf("the video is interlaced and is recorded as such"), 1u);
}

}  // namespace
}  // namespace receiver
