#include "RecordMetadata.h"

#include <gtest/gtest.h>

#include "test_units.h"

namespace nal_access {
namespace {

using namespace testing;

ByteVector OwnSet(const ByteVector& items) {
    return LocalSet(Join({kOwnIdentifier, items}));
}

std::vector<int> Fields(const std::optional<Timecode>& timecode) {
    if (!timecode) {
        return {};
    }
    return {timecode->hours, timecode->minutes, timecode->seconds, timecode->frames, timecode->dropFrame};
}

TEST(ReadRecordFlag, ReadsItemE101OfOurSet) {
    EXPECT_EQ(ReadRecordFlag(OwnSet(kFlagOn)), true);
    EXPECT_EQ(ReadRecordFlag(OwnSet(kFlagOff)), false);
}

TEST(ReadRecordFlag, FindsNoneWhereThereIsNone) {
    EXPECT_EQ(ReadRecordFlag({}), std::nullopt);
    EXPECT_EQ(ReadRecordFlag(OwnSet({})), std::nullopt);
    EXPECT_EQ(ReadRecordFlag(kForeignPacket), std::nullopt);
    EXPECT_EQ(ReadRecordFlag(LocalSet(kFlagOn)), std::nullopt);
}

TEST(ReadRecordFlag, IgnoresSetsWithAnotherIdentifier) {
    EXPECT_EQ(ReadRecordFlag(LocalSet(Join({kOtherIdentifier, kFlagOn}))), std::nullopt);
    EXPECT_EQ(ReadRecordFlag(kBlock), std::nullopt);
}

TEST(ReadRecordFlag, SkipsOtherPacketsByTheirLength) {
    EXPECT_EQ(ReadRecordFlag(Join({kForeignPacket, kBlock, OwnSet(kFlagOn)})), true);
}

TEST(ReadRecordFlag, TakesTheIdentifierAnywhereInTheSet) {
    EXPECT_EQ(ReadRecordFlag(LocalSet(Join({kFlagOn, kOwnIdentifier}))), true);
}

TEST(ReadRecordFlag, CountsWhatWasReadBeforeATruncatedPacket) {
    const ByteVector whole = Join({OwnSet(kFlagOn), kForeignPacket});
    EXPECT_EQ(ReadRecordFlag(ByteVector(whole.begin(), whole.end() - 1)), true);
    const ByteVector behind = Join({kForeignPacket, OwnSet(kFlagOn)});
    EXPECT_EQ(ReadRecordFlag(ByteVector(behind.begin(), behind.end() - 1)), std::nullopt);
}

TEST(ReadRecordFlag, CountsWhatWasReadBeforeATruncatedItem) {
    EXPECT_EQ(ReadRecordFlag(OwnSet(Join({kFlagOn, {0xE1, 0x02, 0x00, 0x05, 0x01}}))), true);
}

TEST(ReadRecordFlag, IgnoresOtherSizesAndValues) {
    EXPECT_EQ(ReadRecordFlag(OwnSet({0xE1, 0x01, 0x00, 0x00})), std::nullopt);
    EXPECT_EQ(ReadRecordFlag(OwnSet({0xE1, 0x01, 0x00, 0x02, 0x01, 0x01})), std::nullopt);
    EXPECT_EQ(ReadRecordFlag(OwnSet({0xE1, 0x01, 0x00, 0x01, 0x02})), std::nullopt);
}

TEST(ReadRecordFlag, TakesTheFirstOfSeveral) {
    EXPECT_EQ(ReadRecordFlag(Join({OwnSet(kFlagOn), OwnSet(kFlagOff)})), true);
    EXPECT_EQ(ReadRecordFlag(OwnSet(Join({kFlagOff, kFlagOn}))), false);
}

TEST(ReadTimecode, ReadsItemE102OfOurSet) {
    EXPECT_EQ(Fields(ReadTimecode(OwnSet(TimecodeItem(23, 59, 58, 29, 1)), 30)),
              (std::vector<int>{23, 59, 58, 29, 1}));
    EXPECT_EQ(Fields(ReadTimecode(OwnSet(TimecodeItem(1, 2, 3, 4, 0)), 0)),
              (std::vector<int>{1, 2, 3, 4, 0}));
}

TEST(ReadTimecode, TakesDropFrameFromBitZeroAlone) {
    EXPECT_EQ(Fields(ReadTimecode(OwnSet(TimecodeItem(1, 2, 3, 4, 0xFE)), 30)),
              (std::vector<int>{1, 2, 3, 4, 0}));
    EXPECT_EQ(Fields(ReadTimecode(OwnSet(TimecodeItem(1, 2, 3, 4, 0xFF)), 30)),
              (std::vector<int>{1, 2, 3, 4, 1}));
}

TEST(ReadTimecode, CountsATimecodeOutOfRangeAsNone) {
    EXPECT_FALSE(ReadTimecode(OwnSet(TimecodeItem(24, 0, 0, 0, 0)), 25));
    EXPECT_FALSE(ReadTimecode(OwnSet(TimecodeItem(0, 60, 0, 0, 0)), 25));
    EXPECT_FALSE(ReadTimecode(OwnSet(TimecodeItem(0, 0, 60, 0, 0)), 25));
    EXPECT_FALSE(ReadTimecode(OwnSet(TimecodeItem(0, 0, 0, 25, 0)), 25));
    EXPECT_TRUE(ReadTimecode(OwnSet(TimecodeItem(0, 0, 0, 24, 0)), 25));
}

TEST(ReadTimecode, ChecksFramesOnlyAgainstAGivenRate) {
    EXPECT_EQ(Fields(ReadTimecode(OwnSet(TimecodeItem(0, 0, 0, 99, 0)), 0)),
              (std::vector<int>{0, 0, 0, 99, 0}));
    EXPECT_FALSE(ReadTimecode(OwnSet(TimecodeItem(24, 0, 0, 0, 0)), 0));
}

TEST(ReadTimecode, GoesOnToTheNextItemAfterOneThatCannotBeRead) {
    EXPECT_EQ(
        Fields(ReadTimecode(Join({OwnSet({0xE1, 0x02, 0x00, 0x04, 1, 2, 3, 4}),
                                  OwnSet(TimecodeItem(24, 0, 0, 0, 0)), OwnSet(TimecodeItem(5, 6, 7, 8, 0))}),
                            25)),
        (std::vector<int>{5, 6, 7, 8, 0}));
}

TEST(ReadTimecode, IgnoresSetsWithAnotherIdentifier) {
    EXPECT_FALSE(ReadTimecode(LocalSet(Join({kOtherIdentifier, TimecodeItem(1, 2, 3, 4, 0)})), 25));
    EXPECT_FALSE(ReadTimecode({}, 25));
}

}  // namespace
}  // namespace nal_access
