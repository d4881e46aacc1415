// Every way into the receiver, with ffmpeg, or GStreamer for RTSP, as the sender and programs of others as
// judges.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "endtoend/ReceiverFixture.h"
#include "endtoend/RecordingCheck.h"
#include "support/Material.h"
#include "support/Senders.h"

namespace endtoend {
namespace {

using ::testing::EndsWith;
using ::testing::HasSubstr;

enum class Road { kUdp, kRtp, kSrtListener, kSrtCaller, kHttp, kRtsp, kFile };

struct SourceCase {
    const char* name;
    Road road;
    const char* rate;       // as the receiver writes it
    const char* exactRate;  // as ffmpeg writes it
    bool fragmented;
    const char* timecode;
    bool klv;
    const char* container;
};

std::ostream& operator<<(std::ostream& out, const SourceCase& parameters) {
    return out << parameters.name;
}

class SourcesTest : public ReceiverFixture, public ::testing::WithParamInterface<SourceCase> {
 protected:
    /// Sends the material over the road of this case and records `kSeconds` of it.
    Outcome Record(const std::filesystem::path& material) {
        const FreePorts ports;
        const std::string port = std::to_string(ports.First());
        std::vector<std::string> options = {"--timecode", GetParam().timecode, "--file-type",
                                            GetParam().fragmented ? "fragment" : "normal"};
        const auto add = [&](const std::vector<std::string>& more) {
            options.insert(options.end(), more.begin(), more.end());
        };
        std::unique_ptr<Process> receiver;
        std::unique_ptr<Process> sender;
        switch (GetParam().road) {
            case Road::kUdp:
                add({"--input", "udp://127.0.0.1:" + port, "--seconds", kSeconds});
                receiver = Start(options);
                EXPECT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
                sender = SendTransportStream(material, "udp://127.0.0.1:" + port + "?pkt_size=1316");
                break;
            case Road::kRtp: {
                const auto description = folder.Path() / "stream.sdp";
                WriteSessionDescription(material, ports, description);
                add({"--input", description.string(), "--seconds", kSeconds});
                receiver = Start(options);
                EXPECT_TRUE(WaitUntilBound(static_cast<std::uint16_t>(ports.First() + 2)))
                    << receiver->AllText();
                sender = SendRtp(material, ports);
                break;
            }
            case Road::kSrtListener:
                add({"--input", "srt://127.0.0.1:" + port + "?mode=listener", "--seconds", kSeconds});
                receiver = Start(options);
                EXPECT_TRUE(WaitUntilBound(ports.First())) << receiver->AllText();
                sender = SendTransportStream(material, "srt://127.0.0.1:" + port + "?mode=caller");
                break;
            case Road::kSrtCaller:
                sender = SendTransportStream(material, "srt://127.0.0.1:" + port + "?mode=listener");
                EXPECT_TRUE(WaitUntilBound(ports.First())) << sender->AllText();
                add({"--input", "srt://127.0.0.1:" + port, "--seconds", kSeconds});
                receiver = Start(options);
                break;
            case Road::kHttp: {
                const std::string url = "http://127.0.0.1:" + port + "/live.ts";
                sender = ServeHttp(material, url);
                EXPECT_TRUE(WaitUntilListening(ports.First())) << sender->AllText();
                add({"--input", url, "--seconds", kSeconds});
                receiver = Start(options);
                break;
            }
            case Road::kRtsp:
                sender = ServeRtsp(material, ports.First());
                add({"--input", "rtsp://127.0.0.1:" + port + "/live", "--seconds", kSeconds});
                receiver = Start(options);
                break;
            case Road::kFile:
                // To its end, and faster than it was made.
                add({"--input", material.string(), "--speed", "4"});
                receiver = Start(options);
                break;
        }
        Outcome outcome;
        outcome.code = receiver->Wait().value_or(-1);
        outcome.output = receiver->Output();
        outcome.errors = receiver->Errors();
        return outcome;
    }

    static constexpr const char* kSeconds = "2.5";
};

TEST_P(SourcesTest, IsRecordedByteForByte) {
    MaterialOptions options;
    options.rate = GetParam().exactRate;
    options.container = GetParam().container;
    // Of a file there is more, so that the fragmented one has fragments.
    options.seconds = GetParam().road == Road::kFile ? 7 : 4;
    options.picturesPerKlv = GetParam().klv ? 2 : 0;
    const Sent sent(MakeMaterial(folder, options));

    const Outcome outcome = Record(sent.file);

    ASSERT_EQ(outcome.code, 0) << outcome.output << outcome.errors << Log();
    const auto recordings = Recordings();
    ASSERT_EQ(recordings.size(), 1U) << outcome.output << outcome.errors;
    Expected expected;
    expected.rate = *receiver::ParseFrameRate(GetParam().rate);
    expected.fragmented = GetParam().fragmented;
    expected.timecode = *receiver::ParseTimecode(GetParam().timecode);
    expected.timecode.dropFrame = expected.rate.dropFrame;
    expected.klv = GetParam().klv;
    if (GetParam().road == Road::kRtp) {
        // ffmpeg's two senders begin each at 0, the one of the audio with the frame before the first picture.
        expected.stampSlack += 1024.0 / 48000;
    }
    const Range range = CheckRecording(recordings.front(), sent, expected);
    // The table at the end tells the same.
    EXPECT_THAT(outcome.output, HasSubstr(recordings.front().string()));
    EXPECT_THAT(outcome.output, HasSubstr("  " + receiver::ToString(range.timecode) + "  "));
    EXPECT_THAT(outcome.output, EndsWith(" " + std::to_string(range.count) + "\n"));
    if (GetParam().road == Road::kFile) {
        // All of it.
        EXPECT_EQ(range.first, 0U);
        EXPECT_EQ(range.count, sent.media.video.size());
    } else {
        EXPECT_EQ(range.first, 0U);
        EXPECT_GE(static_cast<double>(range.count), 1.5 * expected.rate.timecodeFrames);
    }
}

INSTANTIATE_TEST_SUITE_P(
    Roads, SourcesTest,
    ::testing::Values(
        SourceCase{"UdpNormal25WithKlv", Road::kUdp, "25", "25", false, "10:20:30:12", true, "ts"},
        SourceCase{"UdpFragment2997WithKlv", Road::kUdp, "29.97", "30000/1001", true, "09:59:58;20", true,
                   "ts"},
        SourceCase{"RtpNormal5994", Road::kRtp, "59.94", "60000/1001", false, "10:00:59;50", false, "mp4"},
        SourceCase{"RtpFragment25", Road::kRtp, "25", "25", true, "23:59:59:20", false, "mp4"},
        SourceCase{"SrtListenerNormal50", Road::kSrtListener, "50", "50", false, "00:00:00:00", false, "ts"},
        SourceCase{"SrtCallerFragment25WithKlv", Road::kSrtCaller, "25", "25", true, "01:02:03:04", true,
                   "ts"},
        SourceCase{"HttpNormal25WithKlv", Road::kHttp, "25", "25", false, "19:59:59:24", true, "ts"},
        SourceCase{"RtspFragment25", Road::kRtsp, "25", "25", true, "05:00:00:00", false, "mp4"},
        SourceCase{"FileNormal2997", Road::kFile, "29.97", "30000/1001", false, "10:00:58;28", false, "mp4"},
        SourceCase{"FileFragment50WithKlv", Road::kFile, "50", "50", true, "12:34:56:49", true, "ts"},
        SourceCase{"FileFragment5994", Road::kFile, "59.94", "60000/1001", true, "00:09:59;59", false,
                   "mkv"}),
    ::testing::PrintToStringParamName());

using GroupsTest = ReceiverFixture;

TEST_F(GroupsTest, IdrFramesThatNeverMeetTheCadenceAreTold) {
    MaterialOptions options;
    options.rate = "24000/1001";
    options.pictureGroup = 25;
    const auto material = MakeMaterial(folder, options);
    const Outcome outcome =
        RunReceiver({"--input", material.string(), "--speed", "8", "--max-minutes", "60"});
    EXPECT_EQ(outcome.code, 0) << outcome.errors;
    EXPECT_THAT(outcome.errors, HasSubstr("meet every 533.9 s only"));
    EXPECT_THAT(outcome.errors, HasSubstr("set the encoder to groups of 24 pictures"));
    // At 62 minutes they meet in time.
    const Outcome other = RunReceiver({"--input", material.string(), "--speed", "8", "--max-minutes", "62"});
    EXPECT_EQ(other.code, 0) << other.errors;
    EXPECT_EQ(other.errors.find("meet every"), std::string::npos) << other.errors;
}

}  // namespace
}  // namespace endtoend
