#include "NalSyntax.h"

#include <gtest/gtest.h>

#include <vector>

namespace nal_access {
namespace {

using ByteVector = std::vector<unsigned char>;

TEST(NalType, IgnoresReferenceIdc) {
    EXPECT_EQ(TypeOf(ByteVector{0x65}), NalType::kIdrSlice);
    EXPECT_EQ(TypeOf(ByteVector{0x25}), NalType::kIdrSlice);
    EXPECT_EQ(TypeOf(ByteVector{0x67}), NalType::kSequenceParameterSet);
    EXPECT_EQ(TypeOf(ByteVector{0x28}), NalType::kPictureParameterSet);
}

TEST(ReadSequenceParameterSetId, ReadsTheIdentifierBehindProfileAndLevel) {
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0xC0, 0x1E, 0x80}), 0U);  // 1
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0xC0, 0x1E, 0x40}), 1U);  // 010
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0xC0, 0x1E, 0x20}), 3U);  // 00100
}

TEST(ReadSequenceParameterSetId, TakesOutEmulationPrevention) {
    // profile 66, flags 0, level 0, emulation_prevention_three_byte, 010
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0x00, 0x00, 0x03, 0x40}), 1U);
}

TEST(ReadSequenceParameterSetId, KeepsAThreeThatIsNoEmulationPrevention) {
    // level 3 behind a single zero byte
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0x00, 0x03, 0x40}), 1U);
}

TEST(ReadSequenceParameterSetId, TakesIdentifiersUpTo31) {
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0xC0, 0x1E, 0x04, 0x00}),
              31U);  // 00000 100000
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0xC0, 0x1E, 0x04, 0x20}),
              std::nullopt);  // 32
}

TEST(ReadSequenceParameterSetId, GivesNothingForATruncatedSet) {
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67}), std::nullopt);
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0xC0}), std::nullopt);
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0xC0, 0x1E}), std::nullopt);
    EXPECT_EQ(ReadSequenceParameterSetId(ByteVector{0x67, 0x42, 0xC0, 0x1E, 0x01}),
              std::nullopt);  // 0000000 1
}

TEST(ReadPictureParameterSetIds, ReadsBothIdentifiers) {
    const auto ids = ReadPictureParameterSetIds(ByteVector{0x68, 0x4C});  // 010 011
    ASSERT_TRUE(ids);
    EXPECT_EQ(ids->pictureParameterSet, 1U);
    EXPECT_EQ(ids->sequenceParameterSet, 2U);
}

TEST(ReadPictureParameterSetIds, TakesPictureIdentifiersUpTo255) {
    // 00000000 100000000 (255), 1 (0)
    const auto ids = ReadPictureParameterSetIds(ByteVector{0x68, 0x00, 0x80, 0x40});
    ASSERT_TRUE(ids);
    EXPECT_EQ(ids->pictureParameterSet, 255U);
    EXPECT_EQ(ids->sequenceParameterSet, 0U);
    // 00000000 100000001 (256), 1
    EXPECT_FALSE(ReadPictureParameterSetIds(ByteVector{0x68, 0x00, 0x80, 0xC0}));
}

TEST(ReadPictureParameterSetIds, RefusesSequenceIdentifiersAbove31) {
    EXPECT_TRUE(ReadPictureParameterSetIds(ByteVector{0x68, 0x82, 0x00}));   // 1, 00000 100000 (31)
    EXPECT_FALSE(ReadPictureParameterSetIds(ByteVector{0x68, 0x82, 0x10}));  // 1, 00000 100001 (32)
}

TEST(ReadPictureParameterSetIds, RefusesACodeWithoutEnd) {
    EXPECT_FALSE(ReadPictureParameterSetIds(ByteVector(1000, 0x00)));
    EXPECT_FALSE(ReadPictureParameterSetIds(ByteVector{0x68}));
}

TEST(ReadSliceHeader, ReadsFirstMacroblockTypeAndPictureParameterSet) {
    const auto slice = ReadSliceHeader(ByteVector{0x65, 0x42, 0x24});  // 010, 0001000, 1
    ASSERT_TRUE(slice);
    EXPECT_EQ(slice->firstMacroblock, 1U);
    EXPECT_EQ(slice->type, 7U);
    EXPECT_EQ(slice->pictureParameterSet, 0U);
}

TEST(ReadSliceHeader, TakesTheLargestMacroblockNumber) {
    // 31 zeros, 1, 31 ones: 2^32 - 2; then 1 and 1
    const auto slice =
        ReadSliceHeader(ByteVector{0x65, 0x00, 0x00, 0x03, 0x00, 0x01, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF});
    ASSERT_TRUE(slice);
    EXPECT_EQ(slice->firstMacroblock, 0xFFFFFFFEU);
    EXPECT_EQ(slice->type, 0U);
    EXPECT_EQ(slice->pictureParameterSet, 0U);
}

TEST(ReadSliceHeader, GivesNothingForATruncatedHeader) {
    EXPECT_FALSE(ReadSliceHeader(ByteVector{0x65}));
    EXPECT_FALSE(ReadSliceHeader(ByteVector{0x65, 0x88}));  // 1, 0001000, nothing
}

}  // namespace
}  // namespace nal_access
