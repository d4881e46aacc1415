// Sources that cannot be recorded as they come, and the timecode that some of them have.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

#include "endtoend/ReceiverFixture.h"
#include "endtoend/RecordingCheck.h"
#include "support/Judges.h"
#include "support/Material.h"

namespace endtoend {
namespace {

using ::testing::Each;
using ::testing::HasSubstr;
using ::testing::SizeIs;

using ConversionsTest = ReceiverFixture;

Expected At25(const char* timecode) {
    Expected expected;
    expected.rate = *receiver::ParseFrameRate("25");
    expected.timecode = *receiver::ParseTimecode(timecode);
    return expected;
}

TEST_F(ConversionsTest, SilenceIsRecordedWhereThereIsNoAudio) {
    MaterialOptions options;
    options.seconds = 3;
    options.more = {"-an"};
    const Sent sent(MakeMaterial(folder, options));
    const Outcome outcome =
        RunReceiver({"--input", sent.file.string(), "--speed", "4", "--timecode", "10:00:00:00"});
    ASSERT_EQ(outcome.code, 0) << outcome.errors;
    EXPECT_THAT(outcome.errors, HasSubstr("silence"));
    ASSERT_THAT(Recordings(), SizeIs(1));
    Expected expected = At25("10:00:00:00");
    expected.audioUntouched = false;
    EXPECT_EQ(CheckRecording(Recordings().front(), sent, expected).count, 75U);
    const Decoded audio = DecodeAudio(Recordings().front());
    // The first frame of a decoder is half as long as the others at times, but all are empty.
    ASSERT_GE(audio.checksums.size(), 130U);
    const std::vector<std::string> rest(audio.checksums.begin() + 2, audio.checksums.end());
    EXPECT_THAT(rest, Each(rest.front()));
}

TEST_F(ConversionsTest, OtherAudioIsConvertedAndThePicturesAreNotTouched) {
    MaterialOptions options;
    options.seconds = 3;
    options.more = {"-c:a", "mp2", "-ac", "1", "-ar", "44100"};
    const Sent sent(MakeMaterial(folder, options));
    const Outcome outcome =
        RunReceiver({"--input", sent.file.string(), "--speed", "4", "--timecode", "10:00:00:00"});
    ASSERT_EQ(outcome.code, 0) << outcome.errors;
    EXPECT_THAT(outcome.errors, HasSubstr("audio is converted"));
    ASSERT_THAT(Recordings(), SizeIs(1));
    Expected expected = At25("10:00:00:00");
    expected.audioUntouched = false;
    EXPECT_EQ(CheckRecording(Recordings().front(), sent, expected).count, 75U);
}

TEST_F(ConversionsTest, AnotherCodecIsConvertedWhenThatIsAskedFor) {
    MaterialOptions options;
    options.seconds = 3;
    options.more = {"-c:v", "mpeg2video", "-x264-params", "", "-bf", "2"};
    const auto material = MakeMaterial(folder, options);
    const Outcome outcome = RunReceiver({"--input", material.string(), "--transcode", "--speed", "4",
                                         "--timecode", "10:00:00:00", "--gop", "12"});
    ASSERT_EQ(outcome.code, 0) << outcome.errors;
    ASSERT_THAT(Recordings(), SizeIs(1));
    const auto recording = Recordings().front();
    EXPECT_EQ(recording.filename(), "10_00_00_00.MP4");
    const Decoded video = DecodeVideo(recording);
    EXPECT_EQ(video.messages, "");
    EXPECT_THAT(video.checksums, SizeIs(75));
    const auto stream = StreamOf(AskFfprobe(recording), "video");
    EXPECT_EQ(stream.value("codec_name", ""), "h264");
    EXPECT_EQ(stream.value("has_b_frames", -1), 0);
    EXPECT_EQ(stream.value("width", 0), 320);
}

// As telephones record: where nothing moves there is no picture.
TEST_F(ConversionsTest, AVaryingRateBecomesConstantWhenThatIsAskedFor) {
    MaterialOptions options;
    options.rate = "30";
    options.seconds = 3;
    options.container = "mp4";
    options.more = {"-vf", "select='lt(t,1)+not(mod(n,3))'", "-fps_mode", "vfr"};
    const auto material = MakeMaterial(folder, options);
    const Outcome converted = RunReceiver({"--input", material.string(), "--speed", "4", "--transcode"});
    EXPECT_EQ(converted.code, 0) << converted.errors;
    ASSERT_THAT(Recordings(), SizeIs(1));
    EXPECT_NEAR(static_cast<double>(DecodeVideo(Recordings().front()).checksums.size()), 90, 2);
    const Outcome untouched = RunReceiver({"--input", material.string(), "--speed", "4"});
    EXPECT_NE(untouched.code, 0);
    EXPECT_THAT(untouched.errors, HasSubstr("the frame rate varies"));
}

TEST_F(ConversionsTest, TheTimecodeOfTheSourceIsTaken) {
    MaterialOptions options;
    options.rate = "30000/1001";
    options.seconds = 3;
    options.container = "mov";
    options.more = {"-timecode", "01:00:59;20"};
    const Sent sent(MakeMaterial(folder, options));
    const Outcome outcome = RunReceiver({"--input", sent.file.string(), "--speed", "4", "--record", "1-2"});
    ASSERT_EQ(outcome.code, 0) << outcome.errors;
    ASSERT_THAT(Recordings(), SizeIs(1));
    Expected expected;
    expected.rate = *receiver::ParseFrameRate("29.97");
    expected.timecode = *receiver::ParseTimecode("01:00:59;20");
    const Range range = CheckRecording(Recordings().front(), sent, expected);
    EXPECT_EQ(range.first, 30U);
    // Ten pictures to the minute, which begins with number 2, and twenty more.
    EXPECT_EQ(receiver::ToString(range.timecode), "01:01:00;22");
}

TEST_F(ConversionsTest, WhatIsSaidForMachinesIsOneObjectALine) {
    MaterialOptions options;
    options.seconds = 2;
    const auto material = MakeMaterial(folder, options);
    const Outcome outcome = RunReceiver({"--input", material.string(), "--speed", "4", "--json",
                                         "--file-type", "fragment", "--timecode", "10:00:00:00"});
    ASSERT_EQ(outcome.code, 0) << outcome.errors;
    EXPECT_EQ(outcome.errors, "");
    std::istringstream lines(outcome.output);
    nlohmann::json last;
    for (std::string line; std::getline(lines, line);) {
        last = nlohmann::json::parse(line, nullptr, false);
        ASSERT_TRUE(last.is_object()) << line;
        ASSERT_TRUE(last.contains("event")) << line;
    }
    EXPECT_EQ(last["event"], "summary");
    EXPECT_EQ(last["exit_code"], 0);
    EXPECT_EQ(last["lost"], 0);
    ASSERT_THAT(last["files"], SizeIs(1));
    const auto file = last["files"].front();
    ASSERT_THAT(Recordings(), SizeIs(1));
    EXPECT_EQ(file["path"], Recordings().front().string());
    EXPECT_EQ(file["frames"], 50);
    EXPECT_EQ(file["bytes"], std::filesystem::file_size(Recordings().front()));
    EXPECT_EQ(file["start_timecode"], "10:00:00:00");
    EXPECT_NEAR(file["seconds"].get<double>(), 2.0, 0.001);
}

}  // namespace
}  // namespace endtoend
