#include "media/NalUnits.h"

#include <gtest/gtest.h>

namespace clipfile {
namespace {

using Data = std::vector<unsigned char>;

TEST(NalHead, KnowsSlicesAndWhereAPictureBegins) {
    const Data idr = {0x65, 0x88};
    EXPECT_TRUE(ReadNalHead(idr)->IsSlice());
    EXPECT_TRUE(ReadNalHead(idr)->IsIdr());
    EXPECT_TRUE(ReadNalHead(idr)->startsPicture);
    // first_mb_in_slice 1 is the code 010.
    const Data second = {0x41, 0x40};
    EXPECT_TRUE(ReadNalHead(second)->IsSlice());
    EXPECT_FALSE(ReadNalHead(second)->IsIdr());
    EXPECT_FALSE(ReadNalHead(second)->startsPicture);
    const Data sei = {0x06, 0x01};
    EXPECT_FALSE(ReadNalHead(sei)->IsSlice());
    EXPECT_TRUE(ReadNalHead(sei)->IsInFront());
}

TEST(NalHead, RefusesWhatNoEncoderWrites) {
    for (const Data& bytes : {Data{}, Data{0x80, 0x88}, Data{0x60, 0x88}, Data{0x05, 0x88}, Data{0x07, 0x64},
                              Data{0x66, 0x01}, Data{0x7F, 0x00}}) {
        EXPECT_FALSE(ReadNalHead(bytes));
    }
}

TEST(WholePicture, HasUnitsThatFillIt) {
    EXPECT_TRUE(IsWholePicture(Data{}));
    EXPECT_TRUE(IsWholePicture(Data{0, 0, 0, 2, 0x65, 0x88, 0, 0, 0, 1, 0x41}));
    EXPECT_FALSE(IsWholePicture(Data{0, 0, 0, 3, 0x65, 0x88}));
    EXPECT_FALSE(IsWholePicture(Data{0, 0, 0, 2, 0x65, 0x88, 0, 0}));
    EXPECT_FALSE(IsWholePicture(Data{0, 0, 0, 0, 0, 0, 0, 0}));
}

TEST(ByteStream, HasStartCodesInsteadOfLengths) {
    EXPECT_EQ(ToByteStream(Data{0, 0, 0, 2, 0x65, 0x88, 0, 0, 0, 1, 0x41}),
              (Data{0, 0, 0, 1, 0x65, 0x88, 0, 0, 0, 1, 0x41}));
}

}  // namespace
}  // namespace clipfile
