#include "reader/MetadataUnit.h"

#include <gtest/gtest.h>

#include "support/TestStream.h"

namespace clipfile {
namespace {

using test_stream::Data;
using test_stream::kRecorderBlock;
using test_stream::MakeUnit;

TEST(MetadataUnit, TellsFlagTimecodeAndWhereTheRecordersBlockEnds) {
    const Data bytes = MakeUnit(true, {10, 20, 30, 12, true});
    const MetadataUnit unit = ReadMetadataUnit(bytes);
    EXPECT_EQ(unit.packets, 2U);
    EXPECT_EQ(unit.recordFlag, true);
    EXPECT_EQ(unit.timecode, (Timecode{10, 20, 30, 12, true}));
    EXPECT_EQ(unit.blockEnd, 116U);
}

TEST(MetadataUnit, TheBlockAloneSaysNothing) {
    const MetadataUnit unit = ReadMetadataUnit(kRecorderBlock);
    EXPECT_EQ(unit.packets, 1U);
    EXPECT_FALSE(unit.recordFlag);
    EXPECT_FALSE(unit.timecode);
    EXPECT_EQ(unit.blockEnd, 64U);
}

TEST(MetadataUnit, ATimecodeOutOfRangeCountsAsNone) {
    EXPECT_FALSE(ReadMetadataUnit(MakeUnit(false, {24, 0, 0, 0, false})).timecode);
    EXPECT_FALSE(ReadMetadataUnit(MakeUnit(false, {0, 60, 0, 0, false})).timecode);
    EXPECT_EQ(ReadMetadataUnit(MakeUnit(false, {0, 60, 0, 0, false})).recordFlag, false);
}

TEST(MetadataUnit, EveryCutIsBorne) {
    const Data bytes = MakeUnit(true, {1, 2, 3, 4, false});
    for (std::size_t size = 0; size < bytes.size(); ++size) {
        const MetadataUnit unit = ReadMetadataUnit(Bytes(bytes).first(size));
        EXPECT_EQ(unit.packets, size < 52 ? 0U : 1U) << size;
        EXPECT_EQ(unit.blockEnd, 0U) << size;
    }
}

TEST(KlvPacket, TakesLengthsInShortAndLongForm) {
    Data bytes(17, 0);
    bytes[0] = 1;
    Data shortForm = bytes;
    shortForm.insert(shortForm.end(), {3, 7, 8, 9, 0xFF});
    EXPECT_EQ(ReadKlvPacket(shortForm)->size, 21U);
    Data longForm = bytes;
    longForm.insert(longForm.end(), {0x82, 0, 3, 7, 8, 9, 0xFF});
    EXPECT_EQ(ReadKlvPacket(longForm)->size, 23U);
    EXPECT_EQ(ReadKlvPacket(longForm)->value.size(), 3U);
}

TEST(KlvPacket, RefusesLengthsThatTheStandardDoesNotHaveAndThatRunPastTheEnd) {
    Data bytes(17, 0);
    bytes[0] = 1;
    for (const Data& length : {Data{0x80, 0, 0}, Data{0x89, 0, 0, 0, 0, 0, 0, 0, 0, 0},
                               Data{0x88, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}, Data{5, 1}}) {
        Data packet = bytes;
        packet.insert(packet.end(), length.begin(), length.end());
        EXPECT_FALSE(ReadKlvPacket(packet));
    }
}

TEST(TimecodeText, HasASemicolonForDropFrame) {
    EXPECT_EQ(TimecodeText({1, 2, 3, 4, false}), "01:02:03:04");
    EXPECT_EQ(TimecodeText({1, 2, 3, 4, true}), "01:02:03;04");
}

}  // namespace
}  // namespace clipfile
