#include "control/PreviewPicture.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <cmath>
#include <numbers>

#include "common/ReceiverError.h"
#include "source/AudioEncoder.h"
#include "source/VideoEncoder.h"

namespace receiver {
namespace {

using ::testing::DoubleNear;
using ::testing::ElementsAre;
using ::testing::IsEmpty;
using ::testing::Lt;

/// White on the left, black on the right, in the range of broadcast (16 to 235).
CodedPicture HalfWhite(std::uint32_t width, std::uint32_t height) {
    libav::CollectMessages();
    VideoEncoder encoder({ParseFrameRate("25").value(), width, height, 1000, 25});
    const auto frame = libav::NewFrame();
    frame->width = static_cast<int>(width);
    frame->height = static_cast<int>(height);
    frame->format = AV_PIX_FMT_YUV420P;
    EXPECT_EQ(av_frame_get_buffer(frame.get(), 0), 0);
    for (int y = 0; y < frame->height; ++y) {
        std::uint8_t* const row = frame->data[0] + y * frame->linesize[0];
        std::fill_n(row, frame->width / 2, std::uint8_t{235});
        std::fill_n(row + frame->width / 2, frame->width / 2, std::uint8_t{16});
    }
    for (int y = 0; y < frame->height / 2; ++y) {
        std::fill_n(frame->data[1] + y * frame->linesize[1], frame->width / 2, std::uint8_t{128});
        std::fill_n(frame->data[2] + y * frame->linesize[2], frame->width / 2, std::uint8_t{128});
    }
    frame->pts = 0;
    CodedPicture coded;
    const PictureSink keep = [&coded](const CodedPicture& picture) { coded = picture; };
    encoder.Encode(frame.get(), keep);
    encoder.Encode(nullptr, keep);
    EXPECT_TRUE(coded.keyFrame);
    return coded;
}

libav::Owner<AVFrame> DecodeJpeg(const std::vector<std::uint8_t>& jpeg) {
    const AVCodec* const codec = avcodec_find_decoder(AV_CODEC_ID_MJPEG);
    const auto decoder = libav::NewCodec(codec);
    EXPECT_EQ(avcodec_open2(decoder.get(), codec, nullptr), 0);
    const auto packet = libav::NewPacket();
    EXPECT_EQ(av_new_packet(packet.get(), static_cast<int>(jpeg.size())), 0);
    std::copy(jpeg.begin(), jpeg.end(), packet->data);
    auto frame = libav::NewFrame();
    EXPECT_EQ(avcodec_send_packet(decoder.get(), packet.get()), 0);
    EXPECT_EQ(avcodec_receive_frame(decoder.get(), frame.get()), 0);
    return frame;
}

TEST(PreviewPictureTest, ShowsThePictureInTheWidthThatIsAskedFor) {
    const CodedPicture coded = HalfWhite(640, 360);
    const PreviewPicture picture = MakePreviewPicture(coded.data.get(), coded.size, 160);
    EXPECT_EQ(picture.width, 160);
    EXPECT_EQ(picture.height, 90);
    const auto frame = DecodeJpeg(picture.jpeg);
    ASSERT_EQ(frame->width, 160);
    ASSERT_EQ(frame->height, 90);
    // JPEG has the whole range, 0 to 255.
    const std::uint8_t* const middle = frame->data[0] + 45 * frame->linesize[0];
    EXPECT_GT(middle[20], 245);
    EXPECT_LT(middle[140], 10);
}

TEST(PreviewPictureTest, APictureMayBeMadeLarger) {
    const CodedPicture coded = HalfWhite(64, 64);
    const PreviewPicture picture = MakePreviewPicture(coded.data.get(), coded.size, 256);
    EXPECT_EQ(picture.height, 256);
}

TEST(PreviewPictureTest, WhatIsNoPictureIsAnError) {
    const std::vector<unsigned char> noise(2000, 0x5A);
    EXPECT_THROW(MakePreviewPicture(noise.data(), noise.size(), 160), ReceiverError);
    const CodedPicture coded = HalfWhite(64, 64);
    EXPECT_THROW(MakePreviewPicture(coded.data.get(), 20, 160), ReceiverError);
}

/// A sine of 997 Hz on the left alone, without its beginning and its end, where an encoder overshoots.
std::vector<Preview::Material::AudioFrame> Sine(double amplitude) {
    std::vector<Preview::Material::AudioFrame> frames;
    const AudioSink keep = [&frames](const CodedAudio& audio) { frames.push_back({audio.data, audio.size}); };
    AudioEncoder encoder;
    for (std::int64_t number = 0; number < 50; ++number) {
        const auto samples = AudioEncoder::NewSamples();
        samples->pts = number * kAudioFrame;
        auto* const left = reinterpret_cast<float*>(samples->extended_data[0]);
        for (int i = 0; i < kAudioFrame; ++i) {
            const double time = static_cast<double>(number * kAudioFrame + i) / kAudioRate;
            left[i] = static_cast<float>(amplitude * std::sin(2 * std::numbers::pi * 997 * time));
        }
        encoder.Encode(samples.get(), keep);
    }
    return {frames.begin() + 10, frames.end()};
}

TEST(PeaksTest, HalfOfFullScaleIsSixDecibelsBelowIt) {
    EXPECT_THAT(PeaksOf(Sine(0.5)), ElementsAre(DoubleNear(-6.02, 0.5), Lt(-60)));
}

TEST(PeaksTest, SilenceIsTheLowestValue) {
    const CodedAudio silence = SilentFrame();
    const Preview::Material::AudioFrame frame{silence.data, silence.size};
    EXPECT_THAT(PeaksOf({frame, frame, frame}), ElementsAre(-120, -120));
}

TEST(PeaksTest, WhatIsNoAudioIsLeftOut) {
    auto frames = Sine(0.5);
    const std::shared_ptr<unsigned char> noise(new unsigned char[300](),
                                               std::default_delete<unsigned char[]>());
    frames[20] = {noise, 300};
    EXPECT_THAT(PeaksOf(frames), ElementsAre(DoubleNear(-6.02, 0.5), Lt(-60)));
    EXPECT_THAT(PeaksOf({}), IsEmpty());
}

TEST(Base64Test, FollowsTheVectorsOfRfc4648) {
    const auto coded = [](const std::string& text) { return Base64({text.begin(), text.end()}); };
    EXPECT_EQ(coded(""), "");
    EXPECT_EQ(coded("f"), "Zg==");
    EXPECT_EQ(coded("fo"), "Zm8=");
    EXPECT_EQ(coded("foo"), "Zm9v");
    EXPECT_EQ(coded("foob"), "Zm9vYg==");
    EXPECT_EQ(coded("fooba"), "Zm9vYmE=");
    EXPECT_EQ(coded("foobar"), "Zm9vYmFy");
    EXPECT_EQ(coded("\xff\xfe\xfd"), "//79");
}

}  // namespace
}  // namespace receiver
