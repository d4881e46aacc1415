#include "endtoend/RecordingCheck.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <nlohmann/json.hpp>

#include "support/Judges.h"

namespace endtoend {
namespace {

using ::testing::IsEmpty;

void checkPictures(const CodedMedia& recorded, const Sent& sent, Range& range) {
    range.count = recorded.video.size();
    range.first = FindRun(sent.media.video, recorded.video);
    ASSERT_LT(range.first, sent.media.video.size())
        << "the coded pictures are not an unbroken run of the source's";
    ASSERT_GT(range.count, 0U);
    EXPECT_TRUE(recorded.video.front().idr);
}

void checkDecoder(const std::filesystem::path& recording, const Sent& sent, const Range& range) {
    const Decoded video = DecodeVideo(recording);
    EXPECT_EQ(video.messages, "");
    ASSERT_EQ(video.checksums.size(), range.count);
    EXPECT_EQ(FindRun(sent.pictures, video.checksums), range.first);
    const Decoded audio = DecodeAudio(recording);
    EXPECT_EQ(audio.messages, "");
    EXPECT_THAT(audio.checksums, ::testing::Not(IsEmpty()));
}

void checkAudio(const CodedMedia& recorded, const Sent& sent, const Expected& expected, const Range& range) {
    constexpr double kFrame = 1024.0 / 48000;
    const double period =
        static_cast<double>(expected.rate.denominator) / static_cast<double>(expected.rate.numerator);
    const double length = static_cast<double>(range.count) * period;
    EXPECT_NEAR(static_cast<double>(recorded.audio.size()) * kFrame, length, kFrame / 2 + 0.0005);
    if (!expected.audioUntouched) {
        return;
    }
    const std::size_t at = FindRun(sent.media.audio, recorded.audio);
    ASSERT_LT(at, sent.media.audio.size()) << "the audio frames are not an unbroken run of the source's";
    // Sound and picture that were sent together are recorded together: from the first picture to the end of
    // the last one, each within half an audio frame, and what the source's container rounds.
    const double slack = kFrame / 2 + expected.stampSlack;
    const double firstPicture = sent.media.videoTimes[range.first];
    const double firstSound = sent.media.audioTimes[at];
    EXPECT_NEAR(firstSound, firstPicture, slack);
    const double end = sent.media.videoTimes[range.first + range.count - 1] + period;
    EXPECT_NEAR(sent.media.audioTimes[at + recorded.audio.size() - 1] + kFrame, end,
                slack + std::abs(firstSound - firstPicture));
}

void checkMetadata(const CodedMedia& recorded, const Sent& sent, const Expected& expected,
                   const Range& range) {
    // One unit a picture.
    EXPECT_EQ(recorded.data.size(), range.count);
    if (!expected.klv) {
        return;
    }
    std::vector<Bytes> packets;
    for (const Bytes& unit : recorded.data) {
        for (Bytes& packet : SourcePacketsOf(unit)) {
            packets.push_back(std::move(packet));
        }
    }
    ASSERT_THAT(packets, ::testing::Not(IsEmpty()));
    EXPECT_LT(FindRun(sent.media.data, packets), sent.media.data.size())
        << "the KLV packets are not an unbroken run of the source's";
    // As many as belong to that time, but for the edges.
    const double share = static_cast<double>(range.count) / static_cast<double>(sent.media.video.size());
    EXPECT_NEAR(static_cast<double>(packets.size()), share * static_cast<double>(sent.media.data.size()),
                2.0);
}

void checkFfprobe(const std::filesystem::path& recording, const Expected& expected, const Range& range) {
    const auto answer = AskFfprobe(recording);
    EXPECT_THAT(answer["messages"], IsEmpty()) << answer["messages"];
    EXPECT_EQ(answer["streams"].size(), 4U);
    const auto video = StreamOf(answer, "video");
    EXPECT_EQ(video.value("codec_name", ""), "h264");
    EXPECT_EQ(video.value("nb_read_packets", ""), std::to_string(range.count));
    EXPECT_EQ(video.value("r_frame_rate", ""),
              std::to_string(expected.rate.numerator) + "/" + std::to_string(expected.rate.denominator));
    const auto audio = StreamOf(answer, "audio");
    EXPECT_EQ(audio.value("codec_name", ""), "aac");
    EXPECT_EQ(audio.value("sample_rate", ""), "48000");
    EXPECT_EQ(audio.value("channels", 0), 2);
    EXPECT_EQ(StreamOf(answer, "rtmd").value("nb_read_packets", ""), std::to_string(range.count));
    // A fragmented file has the place of the sample, and no value in it.
    if (!expected.fragmented) {
        EXPECT_EQ(StreamOf(answer, "tmcd")["tags"].value("timecode", ""), receiver::ToString(range.timecode));
    }
}

void checkMediaInfo(const std::filesystem::path& recording, const Range& range) {
    EXPECT_EQ(AskMediaInfo(recording, "Video").value("Format", ""), "AVC");
    EXPECT_EQ(AskMediaInfo(recording, "Video").value("FrameCount", ""), std::to_string(range.count));
    EXPECT_EQ(AskMediaInfo(recording, "Audio").value("Format", ""), "AAC");
    const auto general = AskMediaInfo(recording, "General");
    EXPECT_FALSE(general.contains("extra") && general["extra"].contains("IsTruncated"));
    EXPECT_FALSE(general.contains("extra") && general["extra"].contains("ConformanceErrors"));
}

}  // namespace

Sent::Sent(const std::filesystem::path& material)
    : file(material), media(ReadCodedMedia(material)), pictures(DecodeVideo(material).checksums) {}

Range CheckRecording(const std::filesystem::path& recording, const Sent& sent, const Expected& expected) {
    SCOPED_TRACE(recording.string());
    const CodedMedia recorded = ReadCodedMedia(recording);
    Range range;
    checkPictures(recorded, sent, range);
    if (::testing::Test::HasFatalFailure()) {
        return range;
    }
    checkDecoder(recording, sent, range);
    checkAudio(recorded, sent, expected, range);
    checkMetadata(recorded, sent, expected, range);
    const std::size_t since = expected.timecodeOfRecording ? 0 : range.first;
    range.timecode =
        receiver::TimecodeOf(receiver::FrameNumberOf(expected.timecode, expected.rate.timecodeFrames) +
                                 static_cast<std::int64_t>(since),
                             expected.rate.timecodeFrames, expected.timecode.dropFrame);
    EXPECT_EQ(recording.filename(), FileNameOf(range.timecode));
    checkFfprobe(recording, expected, range);
    checkMediaInfo(recording, range);
    return range;
}

std::vector<Bytes> SourcePacketsOf(const Bytes& unit) {
    const Bytes ownLabel = {0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01,
                            0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00};
    std::vector<Bytes> packets = SplitKlv(unit);
    std::erase_if(packets, [&](const Bytes& packet) {
        return std::equal(ownLabel.begin(), ownLabel.end(), packet.begin());
    });
    return packets;
}

std::string FileNameOf(const receiver::Timecode& timecode) {
    std::array<char, 32> name{};
    std::snprintf(name.data(), name.size(), "%02d_%02d_%02d_%02d.MP4", timecode.hours, timecode.minutes,
                  timecode.seconds, timecode.frames);
    return name.data();
}

}  // namespace endtoend
