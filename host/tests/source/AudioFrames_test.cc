#include "source/AudioFrames.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

namespace receiver {
namespace {

struct Frame {
    const char* name;
    AVCodecID codec;
    std::vector<std::uint8_t> header;
    std::size_t size;
};
std::ostream& operator<<(std::ostream& out, const Frame& frame) {
    return out << frame.name;
}

class AudioFrame : public testing::TestWithParam<Frame> {
 protected:
    /// `count` frames, less `missing` bytes at the end.
    static libav::Owner<AVPacket> Packet(std::size_t count, std::size_t missing) {
        const Frame& frame = GetParam();
        std::vector<std::uint8_t> bytes;
        for (std::size_t i = 0; i < count; ++i) {
            bytes.insert(bytes.end(), frame.header.begin(), frame.header.end());
            bytes.resize((i + 1) * frame.size);
        }
        libav::Owner<AVPacket> packet = libav::NewPacket();
        EXPECT_EQ(av_new_packet(packet.get(), static_cast<int>(bytes.size() - missing)), 0);
        std::copy_n(bytes.begin(), packet->size, packet->data);
        return packet;
    }
};

TEST_P(AudioFrame, TellsItsSize) {
    EXPECT_EQ(AudioFrameSize(GetParam().codec, GetParam().header), GetParam().size);
}

TEST_P(AudioFrame, IsWholeWithAllItsBytesAndNoMore) {
    const AVCodecID codec = GetParam().codec;
    EXPECT_TRUE(IsWholeAudioFrame(codec, *Packet(1, 0)));
    EXPECT_FALSE(IsWholeAudioFrame(codec, *Packet(1, 1)));
    EXPECT_FALSE(IsWholeAudioFrame(codec, *Packet(2, GetParam().size - 5)));
    EXPECT_TRUE(IsWholeAudioFrame(codec, *Packet(2, 0)));
}

TEST_P(AudioFrame, OfAnotherSyncwordIsNone) {
    std::vector<std::uint8_t> header = GetParam().header;
    header[0] ^= 0x10;
    EXPECT_FALSE(AudioFrameSize(GetParam().codec, header));
}

// Each size is worked out by hand from the clause of its standard.
INSTANTIATE_TEST_SUITE_P(
    All, AudioFrame,
    testing::Values(Frame{"Aac", AV_CODEC_ID_AAC, {0xFF, 0xF1, 0x4C, 0x80, 0x02, 0x9F, 0xFC}, 20},
                    // 192 kbit/s, 48 kHz: 144000 * 192 / 48000.
                    Frame{"Layer2", AV_CODEC_ID_MP2, {0xFF, 0xFD, 0xA4, 0x00}, 576},
                    // 192 kbit/s, 44.1 kHz, padded: 626 + 1.
                    Frame{"Layer2Padded", AV_CODEC_ID_MP2, {0xFF, 0xFD, 0xA2, 0x00}, 627},
                    // 64 kbit/s, 24 kHz: 144000 * 64 / 24000.
                    Frame{"Layer2Low", AV_CODEC_ID_MP2, {0xFF, 0xF5, 0x84, 0x00}, 384},
                    // 128 kbit/s, 48 kHz: 144000 * 128 / 48000.
                    Frame{"Layer3", AV_CODEC_ID_MP3, {0xFF, 0xFB, 0x94, 0x00}, 384},
                    // 64 kbit/s, 24 kHz: 72000 * 64 / 24000.
                    Frame{"Layer3Low", AV_CODEC_ID_MP3, {0xFF, 0xF3, 0x84, 0x00}, 192},
                    // 384 kbit/s, 48 kHz: 12000 * 384 / 48000 words of four bytes.
                    Frame{"Layer1", AV_CODEC_ID_MP1, {0xFF, 0xFF, 0xC4, 0x00}, 384},
                    // fscod 0, frmsizecod 20: 192 kbit/s at 48 kHz, 384 words.
                    Frame{"Ac3", AV_CODEC_ID_AC3, {0x0B, 0x77, 0x00, 0x00, 0x14, 0x40, 0x00}, 768},
                    // fscod 1, frmsizecod 20 and 21: 417 and 418 words.
                    Frame{"Ac3At441", AV_CODEC_ID_AC3, {0x0B, 0x77, 0x00, 0x00, 0x54, 0x40, 0x00}, 834},
                    Frame{"Ac3At441Long", AV_CODEC_ID_AC3, {0x0B, 0x77, 0x00, 0x00, 0x55, 0x40, 0x00}, 836},
                    // fscod 2, frmsizecod 20: 576 words.
                    Frame{"Ac3At32", AV_CODEC_ID_AC3, {0x0B, 0x77, 0x00, 0x00, 0x94, 0x40, 0x00}, 1152},
                    // frmsiz 383, bsid 16.
                    Frame{"EnhancedAc3", AV_CODEC_ID_EAC3, {0x0B, 0x77, 0x01, 0x7F, 0x34, 0x80, 0x00}, 768}),
    testing::PrintToStringParamName());

TEST(AudioFrameSize, OfWhatHasNoHeaderIsNotKnown) {
    const std::vector<std::uint8_t> zeros(100);
    for (const AVCodecID codec : {AV_CODEC_ID_AAC, AV_CODEC_ID_AAC_LATM, AV_CODEC_ID_MP2, AV_CODEC_ID_AC3}) {
        EXPECT_FALSE(AudioFrameSize(codec, zeros));
        EXPECT_FALSE(AudioFrameSize(codec, {}));
    }
}

}  // namespace
}  // namespace receiver
