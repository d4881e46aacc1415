#include "boxlib/core/bits.h"

#include <gtest/gtest.h>

namespace {

TEST(BitsTest, FieldsLineUpMostSignificantFirst) {
    uint64_t word = 0;
    MbxPutBits(&word, 2, 1);
    MbxPutBits(&word, 1, 1);
    MbxPutBits(&word, 5, 2);
    EXPECT_EQ(word, 0b01100010U);
}

TEST(BitsTest, ValuesAreCutToTheirWidth) {
    uint64_t word = 1;
    MbxPutBits(&word, 3, 0xFF);
    EXPECT_EQ(word, 0b1111U);
    MbxPutBits(&word, 4, 0x10);
    EXPECT_EQ(word, 0b11110000U);
}

TEST(BitsTest, WordHolds64Bits) {
    uint64_t word = 0;
    for (int i = 0; i < 4; i++) MbxPutBits(&word, 16, 0x8001);
    EXPECT_EQ(word, 0x8001800180018001U);
}

}  // namespace
