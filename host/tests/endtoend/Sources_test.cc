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

enum class Road { kUdp, kRtp, kSrtListener, kSrtCaller, kHttp, kHls, kRtmp, kRtsp, kFile };

struct SourceCase {
    const char* name;
    Road road;
    const char* rate;       // as the receiver writes it
    const char* exactRate;  // as ffmpeg writes it
    bool fragmented;
    const char* timecode;
    bool klv;
    const char* container;
    /// What the caller of SRT adds to its address.
    const char* streamId = "";
};

std::ostream& operator<<(std::ostream& out, const SourceCase& parameters) {
    return out << parameters.name;
}

class SourcesTest : public ReceiverFixture, public ::testing::WithParamInterface<SourceCase> {
 protected:
    using Program = std::unique_ptr<Process>;

    std::string Port() const { return std::to_string(ports_.First()); }
    /// Of that address, and `kSeconds` of it.
    Program StartReceiver(const std::string& input) const {
        return Start({"--timecode", GetParam().timecode, "--file-type",
                      GetParam().fragmented ? "fragment" : "normal", "--input", input, "--seconds",
                      kSeconds});
    }
    static Outcome Finish(Process& receiver) {
        const int code = receiver.Wait().value_or(-1);
        return {code, receiver.Output(), receiver.Errors()};
    }
    /// The receiver waits for the sender at that UDP port.
    template <typename Send>
    Outcome Await(std::uint16_t port, const std::string& input, Send send) const {
        const Program receiver = StartReceiver(input);
        EXPECT_TRUE(WaitUntilBound(port)) << receiver->AllText();
        const Program sender = send();
        return Finish(*receiver);
    }
    /// The receiver calls the sender.
    Outcome Call(const Program& sender, bool ready, const std::string& input) const {
        EXPECT_TRUE(ready) << sender->AllText();
        return Finish(*StartReceiver(input));
    }

    Outcome RecordRtp(const std::filesystem::path& material) const {
        const auto description = folder.Path() / "stream.sdp";
        WriteSessionDescription(material, ports_, description);
        return Await(static_cast<std::uint16_t>(ports_.First() + 2), description.string(),
                     [&] { return SendRtp(material, ports_); });
    }
    Outcome RecordRtmp(const std::filesystem::path& material) const {
        const Program receiver = StartReceiver("rtmp://0.0.0.0:" + Port() + "/live/key");
        EXPECT_TRUE(WaitUntilListening(ports_.First())) << receiver->AllText();
        const Program sender = PublishRtmp(material, "rtmp://127.0.0.1:" + Port() + "/live/key");
        return Finish(*receiver);
    }
    Outcome RecordHls(const std::filesystem::path& material) const {
        const auto site = folder.Path() / "site";
        std::filesystem::create_directory(site);
        const Program server = ServeFolder(site, ports_.First());
        const Program encoder = WriteHls(material, site);
        return Call(encoder, WaitFor([&] { return std::filesystem::exists(site / "live.m3u8"); }),
                    "http://127.0.0.1:" + Port() + "/live.m3u8");
    }
    Outcome RecordFile(const std::filesystem::path& material) const {
        // To its end, and faster than it was made.
        return RunReceiver({"--timecode", GetParam().timecode, "--file-type",
                            GetParam().fragmented ? "fragment" : "normal", "--input", material.string(),
                            "--speed", "4"});
    }

    /// Sends the material over the road of this case and records it.
    Outcome Record(const std::filesystem::path& material) const {
        const std::string udp = "udp://127.0.0.1:" + Port();
        const std::string srt = "srt://127.0.0.1:" + Port();
        const std::string http = "http://127.0.0.1:" + Port() + "/live.ts";
        const std::string id = GetParam().streamId;
        switch (GetParam().road) {
            case Road::kUdp:
                return Await(ports_.First(), udp,
                             [&] { return SendTransportStream(material, udp + "?pkt_size=1316"); });
            case Road::kRtp:
                return RecordRtp(material);
            case Road::kSrtListener:
                return Await(ports_.First(), srt + "?mode=listener",
                             [&] { return SendTransportStream(material, srt + "?mode=caller" + id); });
            case Road::kSrtCaller: {
                const Program sender = SendTransportStream(material, srt + "?mode=listener");
                return Call(sender, WaitUntilBound(ports_.First()), srt + "?mode=caller" + id);
            }
            case Road::kHttp: {
                const Program sender = ServeHttp(material, http);
                return Call(sender, WaitUntilListening(ports_.First()), http);
            }
            case Road::kHls:
                return RecordHls(material);
            case Road::kRtmp:
                return RecordRtmp(material);
            case Road::kRtsp:
                return Call(ServeRtsp(material, ports_.First()), true,
                            "rtsp://127.0.0.1:" + Port() + "/live");
            case Road::kFile:
                return RecordFile(material);
        }
        return {};
    }

    static constexpr const char* kSeconds = "2.5";

 private:
    const FreePorts ports_;
};

TEST_P(SourcesTest, IsRecordedByteForByte) {
    MaterialOptions options;
    options.rate = GetParam().exactRate;
    options.container = GetParam().container;
    // Of a file there is more, so that the fragmented one has fragments.
    const bool longer = GetParam().road == Road::kFile || GetParam().road == Road::kHls;
    options.seconds = longer ? 7 : 4;
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
    // Joined wherever the last segments begin.
    expected.timecodeOfRecording = GetParam().road == Road::kHls;
    if (GetParam().road == Road::kRtmp) {
        // Milliseconds, of picture and sound.
        expected.stampSlack = 0.002;
    }
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
        EXPECT_EQ(GetParam().road == Road::kHls ? range.first % options.pictureGroup : range.first, 0U);
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
        SourceCase{"SrtListenerNormal25WithStreamId", Road::kSrtListener, "25", "25", false, "10:00:00:00",
                   false, "ts", "&streamid=live/camera"},
        SourceCase{"SrtCallerNormal25WithStreamId", Road::kSrtCaller, "25", "25", false, "10:00:00:00", false,
                   "ts", "&streamid=live/camera"},
        SourceCase{"HlsNormal25", Road::kHls, "25", "25", false, "20:00:00:00", false, "ts"},
        SourceCase{"RtmpListenerNormal2997", Road::kRtmp, "29.97", "30000/1001", false, "10:59:59;20", false,
                   "mp4"},
        SourceCase{"RtmpListenerFragment25", Road::kRtmp, "25", "25", true, "10:00:00:00", false, "mp4"},
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
