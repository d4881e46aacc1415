// The built-in test picture, judged by what ffmpeg draws and plays: which picture stands in the file, and
// where the beep is that begins with each second.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <cstdlib>

#include "common/FrameRate.h"
#include "endtoend/ReceiverFixture.h"
#include "support/CodedMedia.h"

namespace endtoend {
namespace {

using ::testing::SizeIs;

constexpr std::size_t kWidth = 320;
constexpr std::size_t kHeight = 180;
constexpr double kAudioRate = 48000;
constexpr double kHalfAudioFrame = 512 / kAudioRate;

std::string FfmpegOutput(const std::vector<std::string>& arguments) {
    std::vector<std::string> command = {"ffmpeg", "-v", "error", "-nostdin"};
    command.insert(command.end(), arguments.begin(), arguments.end());
    command.emplace_back("-");
    const Outcome outcome = RunProgram(command);
    EXPECT_EQ(outcome.code, 0) << outcome.errors;
    return outcome.output;
}

/// Grey pictures.
std::vector<std::string> Pictures(std::vector<std::string> input) {
    input.insert(input.end(), {"-fps_mode", "passthrough", "-pix_fmt", "gray", "-f", "rawvideo"});
    const std::string bytes = FfmpegOutput(input);
    std::vector<std::string> pictures;
    for (std::size_t at = 0; at + kWidth * kHeight <= bytes.size(); at += kWidth * kHeight) {
        pictures.push_back(bytes.substr(at, kWidth * kHeight));
    }
    return pictures;
}

/// The number of the picture of `all` that is most like `picture`.
std::size_t NumberOf(const std::string& picture, const std::vector<std::string>& all) {
    const auto distance = [&picture](const std::string& other) {
        long sum = 0;
        for (std::size_t i = 0; i < picture.size(); ++i) {
            sum += std::abs(static_cast<unsigned char>(picture[i]) - static_cast<unsigned char>(other[i]));
        }
        return sum;
    };
    const auto nearest = std::min_element(
        all.begin(), all.end(),
        [&](const std::string& one, const std::string& other) { return distance(one) < distance(other); });
    return static_cast<std::size_t>(nearest - all.begin());
}

/// When the first beep begins in the sound of a file, in seconds, to 2 ms: where it becomes much louder.
double FirstBeep(const std::filesystem::path& file) {
    const std::string bytes = FfmpegOutput({"-i", file.string(), "-map", "0:a", "-ac", "1", "-f", "s16le"});
    // A period of the tone of 440 Hz.
    constexpr std::size_t kWindow = 109;
    std::vector<double> loudness;
    for (std::size_t at = 0; at + 2 * kWindow <= bytes.size(); at += 2 * kWindow) {
        double sum = 0;
        for (std::size_t i = 0; i < kWindow; ++i) {
            const double sample = static_cast<unsigned char>(bytes[at + 2 * i]) +
                                  256.0 * static_cast<signed char>(bytes[at + 2 * i + 1]);
            sum += sample * sample;
        }
        loudness.push_back(std::sqrt(sum / kWindow));
    }
    std::vector<double> sorted = loudness;
    std::sort(sorted.begin(), sorted.end());
    const double tone = sorted[sorted.size() / 2];
    const auto beep =
        std::find_if(loudness.begin(), loudness.end(), [tone](double window) { return window > 1.4 * tone; });
    return static_cast<double>(beep - loudness.begin()) * kWindow / kAudioRate;
}

struct TestPictureCase {
    const char* name;
    const char* rate;
    const char* exactRate;
};

std::ostream& operator<<(std::ostream& out, const TestPictureCase& parameters) {
    return out << parameters.name;
}

class TestPictureRangesTest : public ReceiverFixture,
                              public ::testing::WithParamInterface<TestPictureCase> {};

// A range that ends with the run, and an IDR frame in each twelve pictures.
TEST_P(TestPictureRangesTest, TheFileHoldsThePicturesFromTheFirstIdrFrameToTheStop) {
    const Outcome outcome = RunReceiver({"--size", "320x180", "--bitrate", "2000", "--gop", "12", "--fps",
                                         GetParam().rate, "--record", "1.1-", "--seconds", "2.5"});
    ASSERT_EQ(outcome.code, 0) << outcome.errors << Log();
    ASSERT_THAT(Recordings(), SizeIs(1));
    const auto recording = Recordings().front();

    const receiver::FrameRate rate = *receiver::ParseFrameRate(GetParam().rate);
    const double period = static_cast<double>(rate.denominator) / static_cast<double>(rate.numerator);
    const auto commanded = static_cast<std::size_t>(std::ceil(1.1 / period));
    const std::size_t first = (commanded + 11) / 12 * 12;
    const auto stop = static_cast<std::size_t>(std::ceil(2.5 / period));

    const std::vector<std::string> recorded = Pictures({"-i", recording.string(), "-map", "0:v"});
    const std::vector<std::string> drawn = Pictures(
        {"-f", "lavfi", "-i", std::string("testsrc2=size=320x180:rate=") + GetParam().exactRate, "-t", "3"});
    ASSERT_THAT(recorded, SizeIs(stop - first));
    EXPECT_EQ(NumberOf(recorded.front(), drawn), first);
    EXPECT_EQ(NumberOf(recorded.back(), drawn), stop - 1);

    const double begin = static_cast<double>(first) * period;
    EXPECT_NEAR(FirstBeep(recording), std::ceil(begin) - begin, kHalfAudioFrame + 0.004);
    const double sound = static_cast<double>(ReadCodedMedia(recording).audio.size()) * 1024 / kAudioRate;
    EXPECT_NEAR(sound, static_cast<double>(stop - first) * period, kHalfAudioFrame + 0.0005);
}

INSTANTIATE_TEST_SUITE_P(Rates, TestPictureRangesTest,
                         ::testing::Values(TestPictureCase{"Fps25", "25", "25"},
                                           TestPictureCase{"Fps2997", "29.97", "30000/1001"},
                                           TestPictureCase{"Fps50", "50", "50"},
                                           TestPictureCase{"Fps5994", "59.94", "60000/1001"}),
                         ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
