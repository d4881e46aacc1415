// Record commands, to the frame.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <csignal>

#include "endtoend/ReceiverFixture.h"
#include "endtoend/RecordingCheck.h"
#include "support/Judges.h"
#include "support/Material.h"

namespace endtoend {
namespace {

using ::testing::SizeIs;

struct RangeCase {
    const char* name;
    const char* rate;
    const char* exactRate;
    int pictureGroup;
    const char* timecode;
    bool fragmented;
};

std::ostream& operator<<(std::ostream& out, const RangeCase& parameters) {
    return out << parameters.name;
}

/// The first picture at or after `seconds`, of pictures with an IDR frame each `group`.
std::size_t PictureAt(double seconds, const receiver::FrameRate& rate, int group = 1) {
    std::size_t picture = 0;
    while (static_cast<double>(picture) * static_cast<double>(rate.denominator) <
           seconds * static_cast<double>(rate.numerator)) {
        ++picture;
    }
    const auto step = static_cast<std::size_t>(group);
    return (picture + step - 1) / step * step;
}

class RecordRangesTest : public ReceiverFixture, public ::testing::WithParamInterface<RangeCase> {};

TEST_P(RecordRangesTest, EachFileHoldsThePicturesFromTheFirstIdrFrameToTheStop) {
    MaterialOptions options;
    options.rate = GetParam().exactRate;
    options.pictureGroup = GetParam().pictureGroup;
    options.seconds = 7;
    options.picturesPerKlv = 1;
    const Sent sent(MakeMaterial(folder, options));

    const Outcome outcome =
        RunReceiver({"--input", sent.file.string(), "--speed", "2", "--record", "1-2,4-5", "--timecode",
                     GetParam().timecode, "--file-type", GetParam().fragmented ? "fragment" : "normal"});

    ASSERT_EQ(outcome.code, 0) << outcome.output << outcome.errors << Log();
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(2));
    Expected expected;
    expected.rate = *receiver::ParseFrameRate(GetParam().rate);
    expected.fragmented = GetParam().fragmented;
    expected.timecode = *receiver::ParseTimecode(GetParam().timecode);
    expected.timecode.dropFrame = expected.rate.dropFrame;
    expected.klv = true;
    // The names of those of one case run over midnight.
    std::vector<Range> recorded;
    for (const auto& recording : recordings) {
        recorded.push_back(CheckRecording(recording, sent, expected));
    }
    std::sort(recorded.begin(), recorded.end(),
              [](const Range& one, const Range& other) { return one.first < other.first; });
    const double starts[] = {1, 4};
    for (std::size_t i = 0; i < 2; ++i) {
        const std::size_t first = PictureAt(starts[i], expected.rate, GetParam().pictureGroup);
        EXPECT_EQ(recorded[i].first, first);
        EXPECT_EQ(recorded[i].count, PictureAt(starts[i] + 1, expected.rate) - first);
    }
}

// The second file of the drop-frame case begins behind the minute, where two numbers are left out.
INSTANTIATE_TEST_SUITE_P(
    Rates, RecordRangesTest,
    ::testing::Values(RangeCase{"Normal25", "25", "25", 10, "10:00:00:00", false},
                      RangeCase{"Normal2997Drop", "29.97", "30000/1001", 12, "10:00:57;00", false},
                      RangeCase{"Fragment50", "50", "50", 7, "23:59:57:00", true},
                      RangeCase{"Normal5994", "59.94", "60000/1001", 25, "10:00:00;00", false}),
    ::testing::PrintToStringParamName());

using RecordCommandsTest = ReceiverFixture;

const std::vector<std::string> kSmallTestPicture = {"--size", "320x180", "--bitrate", "300", "--gop", "5"};

std::vector<std::string> With(std::vector<std::string> options) {
    options.insert(options.end(), kSmallTestPicture.begin(), kSmallTestPicture.end());
    return options;
}

TEST_F(RecordCommandsTest, ModeOnRecordsFromOnlineToOffline) {
    MaterialOptions options;
    options.seconds = 3;
    const Sent sent(MakeMaterial(folder, options));
    const Outcome outcome = RunReceiver(
        {"--input", sent.file.string(), "--speed", "2", "--mode", "on", "--timecode", "10:00:00:00"});
    ASSERT_EQ(outcome.code, 0) << outcome.output << outcome.errors << Log();
    const auto recordings = Recordings();
    ASSERT_THAT(recordings, SizeIs(1));
    Expected expected;
    expected.rate = *receiver::ParseFrameRate("25");
    expected.timecode = *receiver::ParseTimecode("10:00:00:00");
    const Range range = CheckRecording(recordings.front(), sent, expected);
    EXPECT_EQ(range.first, 0U);
    EXPECT_EQ(range.count, 75U);
}

TEST_F(RecordCommandsTest, AnInterruptEndsTheFileInStep) {
    MaterialOptions options;
    options.rate = "30000/1001";
    options.seconds = 60;
    options.size = "96x64";
    const Sent sent(MakeMaterial(folder, options));
    const auto receiver = Start({"--input", sent.file.string(), "--timecode", "10:00:00;00"});
    ASSERT_TRUE(receiver->WaitForText(".MP4")) << receiver->AllText();
    receiver->Signal(SIGINT);
    ASSERT_EQ(receiver->Wait(), 0) << receiver->AllText();
    ASSERT_THAT(Recordings(), SizeIs(1));
    Expected expected;
    expected.rate = *receiver::ParseFrameRate("29.97");
    expected.timecode = *receiver::ParseTimecode("10:00:00;00");
    const Range range = CheckRecording(Recordings().front(), sent, expected);
    EXPECT_EQ(range.first, 0U);
}

TEST_F(RecordCommandsTest, SignalsStopAndStartARecord) {
    const auto receiver = Start(With({"--seconds", "60"}));
    ASSERT_TRUE(receiver->WaitForText(".MP4")) << receiver->AllText();
    receiver->Signal(SIGUSR2);
    ASSERT_TRUE(WaitFor([&] { return Log().find("OP: FILE CLOSE.") != std::string::npos; }));
    EXPECT_THAT(Recordings(), SizeIs(1));
    receiver->Signal(SIGUSR1);
    ASSERT_TRUE(WaitFor([&] { return Recordings().size() == 2; }));
    receiver->Signal(SIGTERM);
    ASSERT_EQ(receiver->Wait(), 0) << receiver->AllText() << Log();
    for (const auto& recording : Recordings()) {
        EXPECT_EQ(DecodeVideo(recording).messages, "") << recording;
    }
}

}  // namespace
}  // namespace endtoend
