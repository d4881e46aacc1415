// Live streams that are found in the middle of a group of pictures, and one whose clock steps.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>

#include "endtoend/ReceiverFixture.h"
#include "endtoend/RecordingCheck.h"
#include "support/FrameJudge.h"
#include "support/Judges.h"
#include "support/Material.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

using ::testing::ElementsAre;
using ::testing::HasSubstr;
using ::testing::Not;
using ::testing::SizeIs;

/// Pictures of three seconds.
constexpr int kGroup = 75;

class JoiningTest : public ReceiverFixture {
 protected:
    /// Groups of three seconds, with noise, so that no two audio frames are alike.
    std::filesystem::path Make(double seconds, std::size_t picturesPerKlv = 0) const {
        MaterialOptions options;
        options.size = "160x96";
        options.seconds = seconds;
        options.pictureGroup = kGroup;
        options.picturesPerKlv = picturesPerKlv;
        options.more = {"-filter_complex",
                        "anoisesrc=sample_rate=48000:seed=7:amplitude=0.2[noise]",
                        "-map",
                        "0:v",
                        "-map",
                        "[noise]"};
        return MakeMaterial(folder, options);
    }
    void Ffmpeg(std::vector<std::string> arguments) const {
        arguments.insert(arguments.begin(), {"ffmpeg", "-v", "error", "-nostdin", "-y"});
        const Outcome outcome = RunProgram(arguments);
        ASSERT_EQ(outcome.code, 0) << outcome.errors;
    }
    /// A part of a stream, by the numbers of its pictures and of its audio frames.
    std::filesystem::path Cut(const std::filesystem::path& whole, const std::string& name,
                              const std::string& pictures, const std::string& sounds,
                              const std::vector<std::string>& more = {}) const {
        const auto cut = folder.Path() / name;
        std::vector<std::string> arguments{"-copyts",
                                           "-i",
                                           whole.string(),
                                           "-map",
                                           "0",
                                           "-c",
                                           "copy",
                                           "-copyinkf",
                                           "-bsf:v",
                                           "noise=drop=" + pictures,
                                           "-bsf:a",
                                           "noise=drop=" + sounds,
                                           "-muxdelay",
                                           "0"};
        arguments.insert(arguments.end(), more.begin(), more.end());
        arguments.push_back(cut.string());
        Ffmpeg(arguments);
        return cut;
    }
    /// The stream without its first 0.2 seconds.
    std::filesystem::path CutBeginning(const std::filesystem::path& whole) const {
        return Cut(whole, "cut.ts", "lt(n\\,5)", "lt(n\\,9)");
    }
    static Expected At25() {
        Expected expected;
        expected.rate = *receiver::ParseFrameRate("25");
        expected.timecode = *receiver::ParseTimecode("10:00:00:00");
        expected.timecodeOfRecording = true;
        return expected;
    }
    static void ExpectNothingLost(const Process& receiver) {
        for (const char* const sentence : {"jumped", "gaps", "damaged", "\nlost:"}) {
            EXPECT_THAT(receiver.Errors(), Not(HasSubstr(sentence)));
        }
    }
    /// The receiver of a run that ends by itself, with a recording that begins with the first IDR frame that
    /// comes.
    Range ExpectJoined(Process& receiver, const Sent& sent, const Expected& expected) const {
        EXPECT_EQ(receiver.Wait(), 0) << receiver.AllText() << Log();
        ExpectNothingLost(receiver);
        const auto recordings = Recordings();
        EXPECT_THAT(recordings, SizeIs(1)) << receiver.AllText();
        if (recordings.empty()) {
            return {};
        }
        const Range range = CheckRecording(recordings.front(), sent, expected);
        EXPECT_GT(range.first, 0U);
        EXPECT_EQ(range.first % kGroup, 0U);
        EXPECT_GE(range.count, 50U);
        return range;
    }

    const FreePorts ports;
    const std::string port = std::to_string(ports.First());
};

TEST_F(JoiningTest, OverUdpPictureSoundAndMetadataAreInStepFromTheFirstIdrFrameOn) {
    const Sent sent(Make(6.5, 1));
    const auto cut = CutBeginning(sent.file);
    const std::string url = "udp://127.0.0.1:" + port;
    const auto receiver = Start({"--input", url, "--seconds", "2.5", "--timecode", "10:00:00:00"});
    ASSERT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
    const auto sender = SendTransportStream(cut, url + "?pkt_size=1316");
    Expected expected = At25();
    expected.klv = true;
    const Range range = ExpectJoined(*receiver, sent, expected);
    EXPECT_EQ(range.first, static_cast<std::size_t>(kGroup));
    // Each picture with its own.
    ASSERT_THAT(Recordings(), SizeIs(1));
    const CodedMedia recorded = ReadCodedMedia(Recordings().front());
    for (std::size_t at = 0; at < recorded.data.size(); ++at) {
        EXPECT_THAT(SourcePacketsOf(recorded.data[at]), ElementsAre(MakeKlvPacket(range.first + at))) << at;
    }
}

TEST_F(JoiningTest, OverSrtPictureAndSoundAreInStepFromTheFirstIdrFrameOn) {
    const Sent sent(Make(6.5));
    const auto cut = CutBeginning(sent.file);
    const std::string url = "srt://127.0.0.1:" + port;
    const auto receiver =
        Start({"--input", url + "?mode=listener", "--seconds", "2.5", "--timecode", "10:00:00:00"});
    ASSERT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
    const auto sender = SendTransportStream(cut, url);
    EXPECT_EQ(ExpectJoined(*receiver, sent, At25()).first, static_cast<std::size_t>(kGroup));
}

TEST_F(JoiningTest, OverRtpPictureAndSoundAreInStepFromTheFirstIdrFrameOn) {
    const Sent sent(Make(12.5));
    const auto movie = folder.Path() / "movie.mp4";
    Ffmpeg({"-i", sent.file.string(), "-c", "copy", "-bsf:a", "aac_adtstoasc", movie.string()});
    const auto description = folder.Path() / "stream.sdp";
    WriteSessionDescription(movie, ports, description);
    const auto sender = SendRtp(movie, ports);
    // What was sent before is gone.
    ASSERT_TRUE(TakePackets(ports.First(), 10));
    const auto receiver =
        Start({"--input", description.string(), "--seconds", "2.5", "--timecode", "10:00:00:00"});
    Expected expected = At25();
    // ffmpeg's two senders begin each at 0, the one of the audio with the frame before the first picture.
    expected.stampSlack += 1024.0 / 48000;
    ExpectJoined(*receiver, sent, expected);
}

class OutageTest : public JoiningTest, public ::testing::WithParamInterface<const char*> {};

TEST_P(OutageTest, PictureSoundAndMetadataAreInStepBehindIt) {
    const auto whole = Make(6.5, 1);
    const auto cut = CutBeginning(whole);
    const auto begin =
        Cut(whole, "begin.ts", "gte(n\\,50)", "gte(n\\,94)", {"-bsf:d", "noise=drop=gte(n\\,50)"});
    const std::string url = "udp://127.0.0.1:" + port;
    const auto receiver =
        Start({"--input", url, "--timeout", "2", "--timecode", "10:00:00:00", "--mode", GetParam()});
    ASSERT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
    ASSERT_EQ(SendTransportStream(begin, url + "?pkt_size=1316")->Wait(), 0);
    ASSERT_TRUE(receiver->WaitForText("the source was lost")) << receiver->AllText();
    ASSERT_EQ(SendTransportStream(cut, url + "?pkt_size=1316")->Wait(), 0);
    ASSERT_TRUE(WaitFor([&] { return Recordings().size() == 2; })) << receiver->AllText() << Log();
    receiver->Signal(SIGINT);
    EXPECT_EQ(receiver->Wait(), 8) << receiver->AllText();
    ExpectNothingLost(*receiver);
    const std::vector<std::size_t> first{0, static_cast<std::size_t>(kGroup)};
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(2));
    const CodedMedia sent = ReadCodedMedia(whole);
    for (std::size_t at = 0; at < recordings.size(); ++at) {
        SCOPED_TRACE(recordings[at]);
        FrameJudge judge;
        judge.AddSent(whole);
        const FrameJudge::Verdict verdict = judge.Judge(recordings[at]);
        EXPECT_GE(verdict.pictures, 50U);
        EXPECT_EQ(verdict.unknownPictures + verdict.missingPictures, 0U);
        // The end of the first one has no sound any more.
        EXPECT_LE(verdict.unknownSounds, 2U);
        EXPECT_EQ(verdict.missingSounds, 0U);
        EXPECT_LE(verdict.outOfStep, 0.011);
        const CodedMedia recorded = ReadCodedMedia(recordings[at]);
        EXPECT_EQ(FindRun(sent.video, recorded.video), first[at]);
        EXPECT_EQ(DecodeVideo(recordings[at]).messages, "");
        for (std::size_t picture = 0; picture < recorded.data.size(); ++picture) {
            EXPECT_THAT(SourcePacketsOf(recorded.data[picture]),
                        ElementsAre(MakeKlvPacket(first[at] + picture)))
                << picture;
        }
    }
}

INSTANTIATE_TEST_SUITE_P(Modes, OutageTest, ::testing::Values("sync", "on"),
                         [](const auto& mode) { return std::string(mode.param); });

/// Audio used to be out of step by almost all of the step.
TEST_F(JoiningTest, AStepBackOfTheClockLosesNothingAndLeavesPictureAndSoundInStep) {
    const auto whole = Make(5);
    // Behind two seconds of pictures, and of sound.
    const auto before = Cut(whole, "before.ts", "gte(n\\,50)", "gte(n\\,95)");
    const auto behind = Cut(whole, "behind.ts", "lt(n\\,50)", "lt(n\\,95)",
                            {"-output_ts_offset", "-0.5", "-mpegts_flags", "+initial_discontinuity"});
    const auto receiver =
        Start({"--input", "udp://127.0.0.1:" + port, "--timeout", "2", "--timecode", "10:00:00:00"});
    ASSERT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
    SendFile(before, ports.First(), std::chrono::seconds(2));
    SendFile(behind, ports.First(), std::chrono::seconds(3));
    ASSERT_TRUE(receiver->WaitForText("the source was lost")) << receiver->AllText();
    receiver->Signal(SIGINT);
    receiver->Wait();
    EXPECT_THAT(receiver->Errors(), HasSubstr("the source's clock jumped by -500 ms"));
    EXPECT_THAT(receiver->Errors(), Not(HasSubstr("gaps")));
    ASSERT_THAT(Recordings(), SizeIs(1)) << receiver->AllText();
    FrameJudge judge;
    judge.AddSent(whole);
    const FrameJudge::Verdict verdict = judge.Judge(Recordings().front());
    EXPECT_EQ(verdict.pictures, 125U);
    EXPECT_EQ(verdict.unknownPictures + verdict.missingPictures, 0U);
    EXPECT_LE(verdict.missingSounds + verdict.unknownSounds, 4U);
    EXPECT_LE(verdict.outOfStep, 0.011);
}

}  // namespace
}  // namespace endtoend
