#include "metadata/RecordMetadata.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::ElementsAreArray;

/// A UAS datalink local set (MISB ST 0601) of five bytes, with its length in long form.
const std::vector<unsigned char> kPacket{0x06, 0x0E, 0x2B, 0x34, 0x02, 0x0B, 0x01, 0x01,
                                         0x0E, 0x01, 0x03, 0x01, 0x01, 0x00, 0x00, 0x00,
                                         0x81, 0x05, 0x41, 0x01, 0x13, 0x00, 0x00};

// The worked example of docs/metadata-format.md: 10:20:30:12 with drop frame, recording on, a packet of the
// source.
TEST(RecordMetadata, FlagTimecodeAndPacketOfTheSource) {
    const std::vector<unsigned char> expected{
        0x01,                                                  // packet
        0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01,        // label: local set
        0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00,        //
        0x22,                                                  // length 34
        0xE0, 0x00, 0x00, 0x10,                                // item E000, 16 bytes
        0x9B, 0x1F, 0x5C, 0x2E, 0x4D, 0x60, 0x4A, 0x17,        //
        0xA6, 0x3B, 0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93,        //
        0xE1, 0x01, 0x00, 0x01, 0x01,                          // item E101: on
        0xE1, 0x02, 0x00, 0x05, 0x0A, 0x14, 0x1E, 0x0C, 0x01,  // item E102: 10 20 30 12, drop frame
        0x01,                                                  // packet
        0x06, 0x0E, 0x2B, 0x34, 0x02, 0x0B, 0x01, 0x01,        // label: UAS datalink local set
        0x0E, 0x01, 0x03, 0x01, 0x01, 0x00, 0x00, 0x00,        //
        0x81, 0x05,                                            // length 5, long form
        0x41, 0x01, 0x13, 0x00, 0x00};
    ASSERT_EQ(expected.size(), 76u);
    EXPECT_EQ(BuildMetadata(true, Timecode{10, 20, 30, 12, true}, {kPacket}), expected);
}

TEST(RecordMetadata, WithoutTimecodeTheSetHoldsTheFlagAlone) {
    const std::vector<unsigned char> expected{
        0x01, 0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C, 0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00,
        0x19,                                                                    // length 25
        0xE0, 0x00, 0x00, 0x10, 0x9B, 0x1F, 0x5C, 0x2E, 0x4D, 0x60, 0x4A, 0x17,  // identifier
        0xA6, 0x3B, 0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93,                          //
        0xE1, 0x01, 0x00, 0x01, 0x00};                                           // off
    EXPECT_EQ(BuildMetadata(false, std::nullopt, {}), expected);
}

TEST(RecordMetadata, CountedWithoutDropFrameTheFlagByteIsZero) {
    const std::vector<unsigned char> unit = BuildMetadata(true, Timecode{1, 2, 3, 4, false}, {});
    ASSERT_EQ(unit.size(), 52u);
    EXPECT_THAT(std::vector<unsigned char>(unit.end() - 5, unit.end()), ElementsAre(1, 2, 3, 4, 0));
}

TEST(RecordMetadata, PacketsFollowInTheirOrderEachBehindItsOwnByte) {
    const std::vector<unsigned char> first{0xAA, 0xBB};
    const std::vector<unsigned char> second{0xCC};
    const std::vector<unsigned char> unit = BuildMetadata(false, std::nullopt, {first, second});
    EXPECT_THAT(std::vector<unsigned char>(unit.end() - 5, unit.end()),
                ElementsAreArray({0x01, 0xAA, 0xBB, 0x01, 0xCC}));
}

}  // namespace
}  // namespace receiver
