#include "source/AudioPath.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <vector>

namespace receiver {
namespace {

/// `frames` AAC frames with their ADTS headers, in one packet.
libav::Owner<AVPacket> Aac(int frames) {
    const CodedAudio silence = SilentFrame();
    const auto size = static_cast<int>(silence.size);
    libav::Owner<AVPacket> packet = libav::NewPacket();
    EXPECT_EQ(av_new_packet(packet.get(), size * frames), 0);
    for (int frame = 0; frame < frames; ++frame) {
        std::copy_n(silence.data.get(), silence.size, packet->data + frame * size);
    }
    packet->pts = 0;
    return packet;
}

TEST(AudioPass, LeavesOutAPacketOfTwoFrames) {
    AudioPass pass;
    std::size_t passed = 0;
    const AudioSink count = [&passed](const CodedAudio& /*audio*/) { ++passed; };
    pass.Push(*Aac(1), count);
    EXPECT_EQ(passed, 1u);
    EXPECT_EQ(pass.Damaged(), 0u);
    pass.Push(*Aac(2), count);
    EXPECT_EQ(passed, 1u);
    EXPECT_EQ(pass.Damaged(), 1u);
}

}  // namespace
}  // namespace receiver
