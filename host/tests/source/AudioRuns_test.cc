#include "source/AudioRuns.h"

#include <gtest/gtest.h>

#include <array>
#include <cstring>

namespace receiver {
namespace {

constexpr std::int64_t kFrame = 1920;

/// An AAC frame of 20 bytes (ISO/IEC 14496-3 1.A.2.2: profile LC, 48 kHz, stereo, aac_frame_length 20).
constexpr std::array<unsigned char, 7> kHeader{0xFF, 0xF1, 0x4C, 0x80, 0x02, 0x9F, 0xFC};
constexpr int kSize = 20;

class AudioRunsTest : public testing::Test {
 protected:
    /// A frame with the stamp that the libraries count, which ends in front of `size` bytes.
    libav::Owner<AVPacket> Frame(std::int64_t number, int size = kSize) const {
        libav::Owner<AVPacket> packet = libav::NewPacket();
        EXPECT_EQ(av_new_packet(packet.get(), size), 0);
        std::memset(packet->data, 0, static_cast<std::size_t>(size));
        std::copy(kHeader.begin(), kHeader.end(), packet->data);
        packet->pts = number * kFrame;
        packet->duration = kFrame;
        packet->pos = -1;
        return packet;
    }
    /// Puts a frame, and keeps the numbers of those that go on.
    void Put(libav::Owner<AVPacket> packet) { Keep(runs_.Put(std::move(packet), AV_CODEC_ID_AAC, kTicks)); }
    /// Puts the first one of a unit.
    void PutFirst(std::int64_t number, int flags = 0) {
        auto packet = Frame(number);
        packet->pos = ++position_ * 188;
        packet->flags |= flags;
        Put(std::move(packet));
    }
    void Finish() { Keep(runs_.Finish()); }
    std::vector<std::int64_t> Passed() { return std::exchange(passed_, {}); }

    AudioRuns runs_;

 private:
    void Keep(const Packets& packets) {
        for (const auto& packet : packets) {
            passed_.push_back(packet->pts / kFrame);
        }
    }

    std::int64_t position_ = 0;
    std::vector<std::int64_t> passed_;
};

using Numbers = std::vector<std::int64_t>;

TEST_F(AudioRunsTest, ARunGoesOnWhenTheNextOneBegins) {
    PutFirst(0);
    Put(Frame(1));
    EXPECT_EQ(Passed(), Numbers{});
    PutFirst(2);
    EXPECT_EQ(Passed(), (Numbers{0, 1}));
    Finish();
    EXPECT_EQ(Passed(), Numbers{2});
    EXPECT_EQ(runs_.Damaged(), 0u);
}

TEST_F(AudioRunsTest, FramesInFrontOfAnyStampGoOnAtOnce) {
    Put(Frame(0));
    EXPECT_EQ(Passed(), Numbers{0});
}

/// A whole unit has been lost between them.
TEST_F(AudioRunsTest, WholeFramesInFrontOfAGapGoOn) {
    PutFirst(0);
    Put(Frame(1));
    PutFirst(7);
    EXPECT_EQ(Passed(), (Numbers{0, 1}));
}

/// What was in between is lost, and the frame behind it is stamped as if it followed.
TEST_F(AudioRunsTest, ARunWithALossInsideIsLeftOut) {
    PutFirst(0);
    Put(Frame(1, kSize - 5));
    Put(Frame(2));
    PutFirst(7);
    EXPECT_EQ(Passed(), Numbers{});
    EXPECT_EQ(runs_.Damaged(), 3u);
}

TEST_F(AudioRunsTest, AMarkedRunGoesOnWhenItIsComplete) {
    PutFirst(0, AV_PKT_FLAG_CORRUPT);
    Put(Frame(1));
    PutFirst(2, AV_PKT_FLAG_CORRUPT);
    EXPECT_EQ(Passed(), (Numbers{0, 1}));
    PutFirst(4);
    EXPECT_EQ(Passed(), Numbers{});
    EXPECT_EQ(runs_.Damaged(), 1u);
}

/// The stamp of the unit has come to a later frame than that for which it is.
TEST_F(AudioRunsTest, ARunBehindALossIsLeftOutWhenItsFirstFramesAreMissing) {
    PutFirst(0);
    PutFirst(1, AV_PKT_FLAG_CORRUPT);
    PutFirst(3);
    Put(Frame(4));
    PutFirst(6);
    EXPECT_EQ(Passed(), Numbers{0});
    PutFirst(7);
    EXPECT_EQ(Passed(), Numbers{6});
}

/// Two units of which a loss has made one have one position.
TEST_F(AudioRunsTest, ARestOfAUnitHasNoStampOfItsOwn) {
    PutFirst(0, AV_PKT_FLAG_CORRUPT);
    auto rest = Frame(1);
    rest->pos = 188;
    Put(std::move(rest));
    PutFirst(9);
    EXPECT_EQ(Passed(), Numbers{});
    EXPECT_EQ(runs_.Damaged(), 2u);
}

/// A clock that is set is no loss.
TEST_F(AudioRunsTest, ARunInFrontOfAStepBackGoesOn) {
    PutFirst(100);
    Put(Frame(101));
    PutFirst(50);
    EXPECT_EQ(Passed(), (Numbers{100, 101}));
}

/// A frame of AAC in LATM (ISO/IEC 14496-3 1.7), which has no header of ADTS.
libav::Owner<AVPacket> OtherFrame(std::int64_t pts, std::int64_t pos) {
    libav::Owner<AVPacket> packet = libav::NewPacket();
    EXPECT_EQ(av_new_packet(packet.get(), kSize), 0);
    std::memset(packet->data, 0x55, kSize);
    packet->pts = pts;
    packet->duration = 2160;
    packet->pos = pos;
    return packet;
}

/// Stamps that jitter, and a pause.
TEST_F(AudioRunsTest, WithoutFrameHeadersAllThatIsNotMarkedGoesOnAtOnce) {
    std::int64_t pos = 0;
    for (const std::int64_t pts : {0, 2160 + 1300, 4320, 6480 + 1300, 120000}) {
        EXPECT_EQ(runs_.Put(OtherFrame(pts, pos += 188), AV_CODEC_ID_AAC_LATM, kTicks).size(), 1u);
    }
    EXPECT_EQ(runs_.Damaged(), 0u);
    auto marked = OtherFrame(122160, pos);
    marked->flags |= AV_PKT_FLAG_CORRUPT;
    EXPECT_TRUE(runs_.Put(std::move(marked), AV_CODEC_ID_AAC_LATM, kTicks).empty());
    EXPECT_EQ(runs_.Damaged(), 1u);
}

/// Frames of MP2 (ISO/IEC 11172-3): layer II, 32 kbit/s at 48 kHz, 96 bytes and 1152 samples.
TEST_F(AudioRunsTest, OtherAudioWhoseFramesTellTheirLengthIsCheckedTheSame) {
    const auto put = [this](std::int64_t number, std::int64_t pos, int flags) {
        libav::Owner<AVPacket> packet = libav::NewPacket();
        EXPECT_EQ(av_new_packet(packet.get(), 96), 0);
        std::memset(packet->data, 0, 96);
        constexpr std::array<unsigned char, 4> kMp2{0xFF, 0xFD, 0x14, 0x00};
        std::copy(kMp2.begin(), kMp2.end(), packet->data);
        packet->pts = number * 2160;
        packet->duration = 2160;
        packet->pos = pos;
        packet->flags |= flags;
        return runs_.Put(std::move(packet), AV_CODEC_ID_MP2, kTicks).size();
    };
    EXPECT_EQ(put(0, 188, 0), 0u);
    EXPECT_EQ(put(1, -1, 0), 0u);
    EXPECT_EQ(put(2, 376, AV_PKT_FLAG_CORRUPT), 2u);
    EXPECT_EQ(put(3, -1, 0), 0u);
    // A frame is missing in front of this stamp.
    EXPECT_EQ(put(5, 564, 0), 0u);
    EXPECT_EQ(runs_.Damaged(), 2u);
}

TEST_F(AudioRunsTest, NoMoreThanFourTenthsOfASecondAreHeld) {
    PutFirst(0);
    // 18 frames last 0.384 s, 19 are more than 0.4 s.
    for (std::int64_t number = 1; number <= 18; ++number) {
        Put(Frame(number));
    }
    EXPECT_EQ(Passed(), Numbers{});
    Put(Frame(19));
    EXPECT_EQ(Passed().size(), 20u);
}

TEST_F(AudioRunsTest, AMarkedRunOfThatLengthIsNotProved) {
    PutFirst(0, AV_PKT_FLAG_CORRUPT);
    for (std::int64_t number = 1; number <= 18; ++number) {
        Put(Frame(number));
    }
    Put(Frame(19));
    EXPECT_EQ(Passed(), Numbers{19});
    EXPECT_EQ(runs_.Damaged(), 19u);
}

/// The sound pauses, and the pictures go on.
TEST_F(AudioRunsTest, ARunGoesOnWhenPicturesAreASecondFurther) {
    PutFirst(10);
    Put(Frame(11));
    EXPECT_TRUE(runs_.Expire(11 * kFrame + 90000, kTicks).empty());
    EXPECT_EQ(runs_.Expire(11 * kFrame + 90001, kTicks).size(), 2u);
    EXPECT_TRUE(runs_.Expire(11 * kFrame + 900000, kTicks).empty());
}

}  // namespace
}  // namespace receiver
