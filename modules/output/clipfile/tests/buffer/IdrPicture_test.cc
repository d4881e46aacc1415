#include "buffer/IdrPicture.h"

#include <gtest/gtest.h>

#include "support/StreamUnits.h"

namespace clipfileModule {
namespace {

using stream_units::Bytes;

bool isIdr(const Bytes& payload) {
    return IsIdrPicture(*stream_units::MakeUnit(payload, 0, 0));
}

TEST(IdrPictureTest, TheFirstSliceDecides) {
    EXPECT_TRUE(isIdr(stream_units::VideoPayload(1, stream_units::kIdr)));
    EXPECT_FALSE(isIdr(stream_units::VideoPayload(1, stream_units::kPicture)));
    // Delimiter, SEI, parameter sets and an IDR slice, then the second field of the frame.
    EXPECT_TRUE(isIdr({0,  0, 0, 1, 9,    16, 0, 0, 1, 6,    5,    1, 0, 0, 1,    0x67,
                       66, 0, 0, 1, 0x68, 1,  0, 0, 1, 0x65, 0xB8, 0, 0, 1, 0x41, 0xE0}));
    // The second field of such a frame alone, and a partition.
    EXPECT_FALSE(isIdr({0, 0, 1, 0x41, 0xE0, 0, 0, 1, 0x65, 0xB8}));
    EXPECT_FALSE(isIdr({0, 0, 1, 0x42, 0xE0, 0, 0, 1, 0x65, 0xB8}));
}

TEST(IdrPictureTest, AUnitWithoutASliceIsNone) {
    const unsigned char behind = 0x65;
    StreamData empty;
    empty.payload = &behind;
    EXPECT_FALSE(IsIdrPicture(empty));
    EXPECT_FALSE(isIdr({0x65}));
    EXPECT_FALSE(isIdr({0, 0, 1}));
    EXPECT_FALSE(isIdr({0, 0, 0, 1, 9, 16}));
    EXPECT_FALSE(IsIdrPicture(StreamData()));
}

TEST(IdrPictureTest, ASliceOfOneByteIsSeen) {
    EXPECT_TRUE(isIdr({0, 0, 1, 0x65}));
}

}  // namespace
}  // namespace clipfileModule
