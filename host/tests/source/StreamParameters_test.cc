#include "source/StreamParameters.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

#include "source/AudioEncoder.h"

namespace receiver {
namespace {

class StreamParameters : public testing::Test {
 protected:
    AVStream& Audio(AVCodecID codec) {
        AVStream* const stream = avformat_new_stream(format_.get(), nullptr);
        stream->codecpar->codec_type = AVMEDIA_TYPE_AUDIO;
        stream->codecpar->codec_id = codec;
        stream->codecpar->sample_rate = 48000;
        av_channel_layout_default(&stream->codecpar->ch_layout, 2);
        return *stream;
    }
    static libav::Owner<AVPacket> Packet(const std::vector<unsigned char>& bytes) {
        libav::Owner<AVPacket> packet = libav::NewPacket();
        EXPECT_EQ(av_new_packet(packet.get(), static_cast<int>(bytes.size())), 0);
        std::copy(bytes.begin(), bytes.end(), packet->data);
        return packet;
    }

 private:
    libav::Owner<AVFormatContext> format_{avformat_alloc_context()};
};

TEST_F(StreamParameters, AreThoseThatComeWithThePacket) {
    AVStream& stream = Audio(AV_CODEC_ID_AAC);
    const CodedAudio silence = SilentFrame();
    const auto packet = Packet({silence.data.get() + kAdtsHeader, silence.data.get() + silence.size});
    // AudioSpecificConfig (ISO/IEC 14496-3 1.6.2.1): AAC LC, 44.1 kHz, two channels.
    const std::vector<unsigned char> config{0x12, 0x10};
    std::copy(config.begin(), config.end(),
              av_packet_new_side_data(packet.get(), AV_PKT_DATA_NEW_EXTRADATA, config.size()));
    EXPECT_TRUE(RenewParameters(stream, *packet));
    EXPECT_EQ(stream.codecpar->sample_rate, 44100);
    EXPECT_EQ(stream.codecpar->ch_layout.nb_channels, 2);
    ASSERT_EQ(stream.codecpar->extradata_size, 2);
    EXPECT_TRUE(std::equal(config.begin(), config.end(), stream.codecpar->extradata));
}

TEST_F(StreamParameters, OfAudioThatCannotBeDecodedAreNotKnown) {
    AVStream& stream = Audio(AV_CODEC_ID_MP2);
    EXPECT_FALSE(RenewParameters(stream, *Packet(std::vector<unsigned char>(500, 0x55))));
}

}  // namespace
}  // namespace receiver
