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

TEST(NalHead, KnowsBPictures) {
    // first_mb_in_slice 0, then slice_type 1 and 6, then the others up to 9.
    for (const unsigned char code : Data{0b1'010'0000, 0b1'010'1111, 0b1'00111'00, 0b1'00111'11}) {
        EXPECT_TRUE(ReadNalHead(Data{0x01, code})->startsBPicture) << int{code};
    }
    for (const unsigned char code :
         Data{0b1'1'000000, 0b1'011'0000, 0b1'00100'00, 0b1'00101'00, 0b1'00110'00, 0b1'0001000}) {
        EXPECT_FALSE(ReadNalHead(Data{0x41, code})->startsBPicture) << int{code};
    }
    // A later slice of a picture: first_mb_in_slice 1.
    EXPECT_FALSE(ReadNalHead(Data{0x01, 0b010'010'00})->startsBPicture);
    EXPECT_TRUE(HasBPicture(Data{0, 0, 0, 2, 0x09, 0xF0, 0, 0, 0, 2, 0x01, 0xA0}));
    EXPECT_FALSE(HasBPicture(Data{0, 0, 0, 2, 0x09, 0xA0, 0, 0, 0, 2, 0x41, 0x9A}));
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
