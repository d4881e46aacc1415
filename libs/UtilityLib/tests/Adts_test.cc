#include "Adts.h"

#include <gtest/gtest.h>

#include <vector>

namespace nal_access {
namespace {

using ByteVector = std::vector<unsigned char>;

ByteVector Strip(const ByteVector& frame) {
    const Bytes rest = WithoutAdtsHeader(frame);
    return {rest.begin(), rest.end()};
}

// syncword FFF, ID 0, layer 0, protection_absent 1; profile 1 (LC), frequency 3 (48 kHz), channels 2;
// aac_frame_length 10 (0000000001010), fullness 7FF, one block; then the frame.
const ByteVector kFrame = {0xFF, 0xF1, 0x4C, 0x80, 0x01, 0x5F, 0xFC, 0x21, 0x1A, 0x2B};
// protection_absent 0, length 12 (0000000001100), two bytes of CRC.
const ByteVector kFrameWithCrc = {0xFF, 0xF0, 0x4C, 0x80, 0x01, 0x9F, 0xFC, 0xC1, 0xC2, 0x21, 0x1A, 0x2B};

TEST(WithoutAdtsHeader, RemovesAHeaderOfSevenBytes) {
    EXPECT_EQ(Strip(kFrame), (ByteVector{0x21, 0x1A, 0x2B}));
}

TEST(WithoutAdtsHeader, RemovesAHeaderWithCrc) {
    EXPECT_EQ(Strip(kFrameWithCrc), (ByteVector{0x21, 0x1A, 0x2B}));
}

TEST(WithoutAdtsHeader, TakesTheIdBitOfBothStandards) {
    ByteVector frame = kFrame;
    frame[1] = 0xF9;
    EXPECT_EQ(Strip(frame), (ByteVector{0x21, 0x1A, 0x2B}));
}

TEST(WithoutAdtsHeader, PassesRawFrames) {
    const ByteVector raw = {0x21, 0x1A, 0x2B, 0x3C, 0x4D, 0x5E, 0x6F, 0x70};
    EXPECT_EQ(Strip(raw), raw);
    EXPECT_EQ(Strip({}), ByteVector{});
    EXPECT_EQ(Strip({0xFF, 0xF1}), (ByteVector{0xFF, 0xF1}));
}

TEST(WithoutAdtsHeader, PassesFramesWhoseHeaderCannotBe) {
    ByteVector layer = kFrame;
    layer[1] = 0xF3;
    EXPECT_EQ(Strip(layer), layer);
    ByteVector frequency = kFrame;
    frequency[2] = 0x74;  // index 13
    EXPECT_EQ(Strip(frequency), frequency);
    ByteVector tooLong = kFrame;
    tooLong[5] = 0x7F;  // 11 of 10 bytes
    EXPECT_EQ(Strip(tooLong), tooLong);
    ByteVector tooShort = kFrame;
    tooShort[4] = 0x00;
    tooShort[5] = 0xDF;  // 6 bytes, less than the header
    EXPECT_EQ(Strip(tooShort), tooShort);
}

TEST(WithoutAdtsHeader, LeavesNothingOfAHeaderAlone) {
    EXPECT_EQ(Strip({0xFF, 0xF1, 0x4C, 0x80, 0x00, 0xFF, 0xFC}), ByteVector{});
}

}  // namespace
}  // namespace nal_access
