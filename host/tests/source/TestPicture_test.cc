#include <chrono>

#include "SourceTesting.h"

namespace receiver {
namespace {

struct Rate {
    const char* name;
    std::uint32_t key;
    std::int64_t numerator;
    std::int64_t denominator;
};
void PrintTo(const Rate& rate, std::ostream* out) {
    *out << rate.name;
}

class TestPictureRate : public SourceTest, public testing::WithParamInterface<Rate> {};

TEST_P(TestPictureRate, GivesFramesAtTheirTimesAndIdrFramesAtTheirCadence) {
    const Rate rate = GetParam();
    SourceOptions options = Fast("test:");
    options.frameRate = ParseFrameRate(rate.name);
    options.width = 128;
    options.height = 96;
    options.bitrate = 300;
    options.pictureGroup = 7;
    const auto source = OpenSource(options, notices_, nullptr);
    EXPECT_EQ(source->Description().frameRate.key, rate.key);
    EXPECT_EQ(source->Description().width, 128u);
    EXPECT_EQ(source->Description().height, 96u);
    EXPECT_EQ(source->Description().bitrate, 300u);

    const auto units = ReadAll(*source, 90);
    const auto video = Of(Medium::kVideo, units);
    ASSERT_GT(video.size(), 25u);
    for (std::size_t n = 0; n < video.size(); ++n) {
        const auto index = static_cast<std::int64_t>(n);
        const double exact =
            static_cast<double>(index * 90000 * rate.denominator) / static_cast<double>(rate.numerator);
        EXPECT_NEAR(static_cast<double>(video[n].time), exact, 0.5);
        EXPECT_EQ(video[n].keyFrame, n % 7 == 0);
        const auto types = NalTypes(video[n]);
        EXPECT_EQ(std::count(types.begin(), types.end(), 7), n % 7 == 0 ? 1 : 0);
        EXPECT_EQ(std::count(types.begin(), types.end(), 8), n % 7 == 0 ? 1 : 0);
        EXPECT_EQ(std::count(types.begin(), types.end(), 5) > 0, n % 7 == 0);
        EXPECT_FALSE(video[n].timecode);
    }
    const auto audio = Of(Medium::kAudio, units);
    ASSERT_GT(audio.size(), 10u);
    for (std::size_t n = 0; n < audio.size(); ++n) {
        EXPECT_EQ(audio[n].time, static_cast<std::int64_t>(n) * 1024);
        // ADTS: LC, 48 kHz, stereo, and its own length.
        const unsigned char* const header = audio[n].data.get();
        EXPECT_EQ(header[0], 0xFF);
        EXPECT_EQ(header[1], 0xF1);
        EXPECT_EQ(header[2], 0x4C);
        EXPECT_EQ(header[3] & 0xFCU, 0x80U);
        const std::size_t length =
            (header[3] & 3U) << 11 | static_cast<unsigned int>(header[4]) << 3 | header[5] >> 5U;
        EXPECT_EQ(length, audio[n].size);
    }
    // Media go together.
    const double videoSeconds = static_cast<double>(video.back().time) / 90000;
    const double audioSeconds = static_cast<double>(audio.back().time) / 48000;
    EXPECT_NEAR(videoSeconds, audioSeconds, 0.07);
}

INSTANTIATE_TEST_SUITE_P(All, TestPictureRate,
                         testing::Values(Rate{"23.98", 23980, 24000, 1001}, Rate{"24", 24000, 24, 1},
                                         Rate{"25", 25000, 25, 1}, Rate{"29.97", 29970, 30000, 1001},
                                         Rate{"30", 30000, 30, 1}, Rate{"50", 50000, 50, 1},
                                         Rate{"59.94", 59940, 60000, 1001}, Rate{"60", 60000, 60, 1}));

class TestPictureTest : public SourceTest {};

TEST_F(TestPictureTest, IsDecodedByOthersWithoutAMessage) {
    SourceOptions options = Fast("test:");
    options.width = 320;
    options.height = 180;
    const auto units = ReadAll(*OpenSource(options, notices_, nullptr), 100);
    const auto video = Of(Medium::kVideo, units);
    std::FILE* const file = std::fopen(Path("video.h264").c_str(), "wb");
    const std::string bytes = BytesOf(video);
    ASSERT_EQ(std::fwrite(bytes.data(), 1, bytes.size(), file), bytes.size());
    ASSERT_EQ(std::fclose(file), 0);
    EXPECT_EQ(Shell("ffmpeg -loglevel warning -f h264 -i video.h264 -f null - 2>&1"), "");
    EXPECT_EQ(Shell("ffprobe -loglevel error -count_frames -of csv=p=0 "
                    "-show_entries stream=width,height,has_b_frames,nb_read_frames video.h264"),
              "320,180,0," + std::to_string(video.size()) + "\n");
}

TEST_F(TestPictureTest, Is25FramesASecondAt1280x720WithAGroupOfASecondUnlessTold) {
    const auto source = OpenSource(Fast("test:"), notices_, nullptr);
    EXPECT_EQ(source->Description().summary,
              "test picture and tone, H.264 1280x720 25 fps, AAC LC 48 kHz stereo");
    const auto video = Of(Medium::kVideo, ReadAll(*source, 80));
    ASSERT_GT(video.size(), 26u);
    for (std::size_t n = 0; n < video.size(); ++n) {
        EXPECT_EQ(video[n].keyFrame, n % 25 == 0);
    }
}

TEST_F(TestPictureTest, ComesInRealTime) {
    SourceOptions options;
    options.width = 64;
    options.height = 64;
    options.speed = 2;
    const auto source = OpenSource(options, notices_, nullptr);
    const auto begin = std::chrono::steady_clock::now();
    std::int64_t reached = 0;
    while (reached < 45000) {
        for (const SourceUnit& unit : Of(Medium::kVideo, ReadAll(*source, 1))) {
            reached = unit.time;
        }
    }
    // Half a second of stream at twice the speed. Later is the machine's doing, earlier would be ours.
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(240));
}

TEST_F(TestPictureTest, ASizeThatCannotBeEncodedIsRefused) {
    SourceOptions options;
    options.width = 321;
    const auto error = Refusal(options);
    EXPECT_EQ(error.Code(), ExitCode::kSourceUnsuitable);
    EXPECT_STREQ(error.what(),
                 "a picture of 321x720 cannot be encoded: give a width and a height that are even numbers");
}

TEST_F(TestPictureTest, StopEndsReading) {
    SourceOptions options;
    options.width = 64;
    options.height = 64;
    const auto source = OpenSource(options, notices_, nullptr);
    source->Stop();
    SourceUnit unit;
    EXPECT_EQ(source->Read(unit), SourceInterface::Result::kStopped);
    EXPECT_EQ(source->Read(unit), SourceInterface::Result::kStopped);
}

}  // namespace
}  // namespace receiver
