// Sources that send their pictures in another order than they are shown in, recorded as they come. A decoder
// shows the recording as it shows the source: the same pictures at the same times, in step with the sound.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <algorithm>
#include <sstream>
#include <string>
#include <vector>

#include "endtoend/ReceiverFixture.h"
#include "support/FrameJudge.h"
#include "support/FreePorts.h"
#include "support/Material.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::SizeIs;

struct ReorderedCase {
    const char* name;
    const char* rate;       // as ffmpeg writes it
    double frames;          // a second
    const char* container;  // of a file; "udp" is live
    const char* fileType;
    const char* encoder;  // parameters of x264
};

std::ostream& operator<<(std::ostream& out, const ReorderedCase& parameters) {
    return out << parameters.name;
}

/// A picture that a decoder shows.
struct Shown {
    std::int64_t time = 0;  // in ticks of the decoder
    std::string checksum;
};

std::vector<Shown> ShownOf(const std::filesystem::path& file) {
    const Outcome outcome = RunProgram({"ffmpeg", "-v", "error", "-i", file.string(), "-map", "0:v", "-vsync",
                                        "passthrough", "-f", "framemd5", "-"});
    EXPECT_EQ(outcome.errors, "");
    std::vector<Shown> shown;
    std::istringstream lines(outcome.output);
    for (std::string line; std::getline(lines, line);) {
        if (line.empty() || line.front() == '#') {
            continue;
        }
        std::istringstream fields(line);
        std::string stream, dts, pts, duration, size, checksum;
        fields >> stream >> dts >> pts >> duration >> size >> checksum;
        shown.push_back({std::stoll(pts), checksum});
    }
    return shown;
}

class ReorderedTest : public ReceiverFixture, public ::testing::WithParamInterface<ReorderedCase> {
 protected:
    /// Of the source.
    static constexpr std::size_t kPictures = 100;
    static constexpr std::size_t kGroup = 20;

    bool isFragmented() const { return std::string(GetParam().fileType) == "fragment"; }
    double secondsOf(double pictures) const { return pictures / GetParam().frames; }
    std::filesystem::path makeSource(const std::string& container) const {
        MaterialOptions material;
        material.rate = GetParam().rate;
        material.size = "128x96";
        material.sound = "anoisesrc=sample_rate=48000:seed=7:amplitude=0.2";
        material.seconds = secondsOf(kPictures + 0.5);
        material.pictureGroup = static_cast<int>(kGroup);
        material.container = container;
        material.more = {
            "-frames:v",    std::to_string(kPictures),
            "-bf",          "3",
            "-x264-params", std::string("scenecut=0:open-gop=0:b-adapt=0:") + GetParam().encoder};
        return MakeMaterial(folder, material);
    }
    std::vector<std::string> options(std::vector<std::string> more) const {
        more.insert(more.end(), {"--file-type", GetParam().fileType, "--timecode", "10:00:00:00"});
        return more;
    }
    /// The recording shows `count` pictures of the source in a row from `first` on and no more than `most`,
    /// each a picture's time after the one before, in step with the sound. FFmpeg shows what lies behind the
    /// end of the edit of a fragmented file, too.
    void judge(const std::filesystem::path& recording, const std::filesystem::path& source, std::size_t first,
               std::size_t count, std::size_t most) const {
        const std::vector<Shown> sent = ShownOf(source);
        const std::vector<Shown> shown = ShownOf(recording);
        ASSERT_GE(shown.size(), count);
        EXPECT_LE(shown.size(), isFragmented() ? most + 4 : most);
        ASSERT_GE(sent.size(), first + count);
        for (std::size_t i = 0; i < count; ++i) {
            ASSERT_EQ(shown[i].checksum, sent[first + i].checksum) << "picture " << i;
            EXPECT_EQ(shown[i].time, static_cast<std::int64_t>(i) * (shown[1].time - shown[0].time));
        }
        FrameJudge judge;
        judge.AddSent(source);
        const FrameJudge::Verdict verdict = judge.Judge(recording);
        EXPECT_EQ(verdict.unknownPictures + verdict.missingPictures + verdict.missingSounds, 0u);
        EXPECT_GT(verdict.sounds, 10u);
        EXPECT_LE(verdict.outOfStep, 512.0 / 48000 + 0.001);
    }
};

TEST_P(ReorderedTest, RecordsBeginAndEndWithThePicturesThatWereCommanded) {
    const auto source = makeSource(GetParam().container);
    // From the first picture to number 32, in the middle of what a later one is needed for, and from the IDR
    // frame at 60 to the end.
    const std::string ranges =
        "0-" + std::to_string(secondsOf(32.9)) + "," + std::to_string(secondsOf(kGroup * 3 - 1.5)) + "-";
    const Outcome outcome =
        RunReceiver(options({"--input", source.string(), "--speed", "16", "--record", ranges}));
    EXPECT_EQ(outcome.code, 0) << outcome.errors;
    EXPECT_THAT(outcome.output + outcome.errors, Not(HasSubstr("converted")));
    ASSERT_THAT(Recordings(), SizeIs(2)) << outcome.errors;
    EXPECT_EQ(Recordings()[0].filename(), "10_00_00_00.MP4");
    // The table at the end counts pictures that are shown.
    EXPECT_THAT(outcome.output, ::testing::ContainsRegex(" 33\n.* 40\n"));
    judge(Recordings()[0], source, 0, 33, 33);
    judge(Recordings()[1], source, kGroup * 3, kPictures - kGroup * 3, kPictures - kGroup * 3);
}

constexpr ReorderedCase kFiles[] = {
    {"Ts25NormalOne", "25", 25, "ts", "normal", "bframes=1"},
    {"Mp429FragmentTwo", "30000/1001", 30 / 1.001, "mp4", "fragment", "bframes=2"},
    {"Mkv50NormalPyramid", "50", 50, "mkv", "normal", "bframes=3:b-pyramid=normal"},
    {"Ts59FragmentSixteen", "60000/1001", 60 / 1.001, "ts", "fragment", "bframes=16:b-pyramid=normal"},
    {"Mov25FragmentInterlaced", "25", 25, "mov", "fragment", "bframes=3:b-pyramid=normal:tff=1"},
    {"Flv29NormalThree", "30000/1001", 30 / 1.001, "flv", "normal", "bframes=3:b-pyramid=none"}};
INSTANTIATE_TEST_SUITE_P(Files, ReorderedTest, ::testing::ValuesIn(kFiles),
                         ::testing::PrintToStringParamName());

class ReorderedLiveTest : public ReorderedTest {
 protected:
    const FreePorts ports_;
};

TEST_P(ReorderedLiveTest, ARunEndsWithThePictureThatWasCommanded) {
    const auto source = makeSource("ts");
    const std::string url = "udp://127.0.0.1:" + std::to_string(ports_.First());
    // In the middle of what a later picture is needed for.
    const auto receiver = Start(options({"--input", url, "--seconds", std::to_string(secondsOf(74.5))}));
    ASSERT_TRUE(WaitUntilBound(ports_.First()));
    const auto sender = SendTransportStream(source, url + "?pkt_size=1316");
    EXPECT_EQ(receiver->Wait(), 0) << receiver->AllText();
    ASSERT_THAT(Recordings(), SizeIs(1)) << receiver->AllText();
    judge(Recordings()[0], source, 0, 75, 75);
}

constexpr ReorderedCase kLive[] = {
    {"Udp50Normal", "50", 50, "udp", "normal", "bframes=3:b-pyramid=normal"},
    {"Udp59Fragment", "60000/1001", 60 / 1.001, "udp", "fragment", "bframes=2"}};
INSTANTIATE_TEST_SUITE_P(Live, ReorderedLiveTest, ::testing::ValuesIn(kLive),
                         ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
