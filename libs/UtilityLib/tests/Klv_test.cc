#include "Klv.h"

#include <gtest/gtest.h>

#include <limits>
#include <utility>
#include <vector>

#include "test_units.h"

namespace nal_access {
namespace {

using namespace testing;

const ByteVector kLabel = {0x06, 0x0E, 0x2B, 0x34, 0x02, 0x0B, 0x01, 0x01,
                           0x0E, 0x01, 0x03, 0x01, 0x01, 0x00, 0x00, 0x00};

ByteVector Packet(const ByteVector& length, const ByteVector& value) {
    return Join({{0x01}, kLabel, length, value});
}

std::vector<ByteVector> Values(const ByteVector& payload) {
    std::vector<ByteVector> values;
    KlvReader reader(payload);
    for (KlvPacket packet; reader.Next(packet);) {
        EXPECT_EQ(packet.label.size(), 16U);
        values.emplace_back(packet.value.begin(), packet.value.end());
    }
    KlvPacket packet;
    EXPECT_FALSE(reader.Next(packet)) << "the end of the reading is final";
    return values;
}

std::vector<std::pair<int, ByteVector>> Items(const ByteVector& payload) {
    std::vector<std::pair<int, ByteVector>> items;
    KlvPacket packet;
    EXPECT_TRUE(KlvReader(payload).Next(packet));
    LocalSetReader reader(packet);
    for (KlvItem item; reader.Next(item);) {
        items.emplace_back(item.tag, ByteVector(item.value.begin(), item.value.end()));
    }
    return items;
}

TEST(KlvReader, ReadsLengthsInShortForm) {
    EXPECT_EQ(Values(Packet({0x02}, {0xAA, 0xBB})), (std::vector<ByteVector>{{0xAA, 0xBB}}));
    EXPECT_EQ(Values(Packet({0x00}, {})), (std::vector<ByteVector>{{}}));
    EXPECT_EQ(Values(Packet({0x7F}, ByteVector(127, 0xCC))),
              (std::vector<ByteVector>{ByteVector(127, 0xCC)}));
}

TEST(KlvReader, ReadsLengthsInLongForm) {
    EXPECT_EQ(Values(Packet({0x81, 0x80}, ByteVector(128, 0xCC))),
              (std::vector<ByteVector>{ByteVector(128, 0xCC)}));
    EXPECT_EQ(Values(Packet({0x82, 0x01, 0x00}, ByteVector(256, 0xCC))),
              (std::vector<ByteVector>{ByteVector(256, 0xCC)}));
    EXPECT_EQ(Values(Packet({0x83, 0x00, 0x00, 0x01}, {0xAA})), (std::vector<ByteVector>{{0xAA}}));
    EXPECT_EQ(Values(Packet({0x88, 0, 0, 0, 0, 0, 0, 0, 0x01}, {0xAA})), (std::vector<ByteVector>{{0xAA}}));
}

TEST(KlvReader, ReadsOnePacketAfterTheOther) {
    EXPECT_EQ(Values(Join({Packet({0x01}, {0x01}), Packet({0x81, 0x02}, {0x02, 0x03}), Packet({0x00}, {})})),
              (std::vector<ByteVector>{{0x01}, {0x02, 0x03}, {}}));
}

TEST(KlvReader, EndsAtAPacketThatRunsPastThePayload) {
    EXPECT_EQ(Values(Join({Packet({0x01}, {0x01}), Packet({0x03}, {0x02, 0x03})})),
              (std::vector<ByteVector>{{0x01}}));
    EXPECT_EQ(Values(Packet({0x88, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF, 0xFF}, {0x01})),
              std::vector<ByteVector>{});
    EXPECT_EQ(Values(Join({{0x01}, kLabel})), std::vector<ByteVector>{});
    EXPECT_EQ(Values(Join({{0x01}, kLabel, {0x82, 0x00}})), std::vector<ByteVector>{});
    EXPECT_EQ(Values({}), std::vector<ByteVector>{});
    EXPECT_EQ(Values({0x01}), std::vector<ByteVector>{});
}

TEST(KlvReader, EndsAtAByteThatStartsNoPacket) {
    EXPECT_EQ(Values(Join({Packet({0x01}, {0x01}), {0x00}, Packet({0x01}, {0x02})})),
              (std::vector<ByteVector>{{0x01}}));
}

TEST(KlvReader, EndsAtALengthInAnotherForm) {
    EXPECT_EQ(Values(Packet({0x80}, {0xAA, 0x00, 0x00})), std::vector<ByteVector>{});
    EXPECT_EQ(Values(Packet({0x89, 0, 0, 0, 0, 0, 0, 0, 0, 0x01}, {0xAA})), std::vector<ByteVector>{});
}

TEST(LocalSetReader, ReadsItemsUpToOneThatRunsPastTheSet) {
    EXPECT_EQ(
        Items(LocalSet({0xE1, 0x01, 0x00, 0x01, 0x07, 0x85, 0x00, 0x00, 0x00, 0xE1, 0x02, 0x00, 0x02, 0x01})),
        (std::vector<std::pair<int, ByteVector>>{{0xE101, {0x07}}, {0x8500, {}}}));
    EXPECT_EQ(Items(LocalSet({0xE1, 0x01, 0x00})), (std::vector<std::pair<int, ByteVector>>{}));
}

TEST(LocalSetReader, FindsNoItemsUnderAnotherLabel) {
    EXPECT_TRUE(Items(Packet({0x05}, {0xE1, 0x01, 0x00, 0x01, 0x07})).empty());
}

TEST(LocalSetReader, ReadsTheBlockOfTheRecorder) {
    const auto items = Items(kBlock);
    ASSERT_EQ(items.size(), 4U);
    EXPECT_EQ(items[0].first, 0xE000);
    EXPECT_EQ(items[0].second.size(), 16U);
    EXPECT_EQ(items[1], (std::pair<int, ByteVector>{0x8500, {0x02, 0x03, 0x00, 0x00}}));
    EXPECT_EQ(items[2], (std::pair<int, ByteVector>{0x8509, {0x56}}));
    EXPECT_EQ(items[3], (std::pair<int, ByteVector>{0x8512, {'W', 'G', 'S', '-', '8', '4'}}));
}

TEST(SetIdentifier, IsTheFirstItemE000OfSixteenBytes) {
    KlvPacket packet;
    const ByteVector payload =
        LocalSet(Join({{0xE0, 0x00, 0x00, 0x01, 0x55}, kFlagOn, kOtherIdentifier, kOwnIdentifier}));
    ASSERT_TRUE(KlvReader(payload).Next(packet));
    const auto identifier = SetIdentifier(packet);
    ASSERT_TRUE(identifier);
    EXPECT_EQ(ByteVector(identifier->begin(), identifier->end()),
              ByteVector(kOtherIdentifier.begin() + 4, kOtherIdentifier.end()));
}

TEST(SetIdentifier, IsMissingInASetWithoutOneAndUnderAnotherLabel) {
    KlvPacket packet;
    const ByteVector set = LocalSet(kFlagOn);
    ASSERT_TRUE(KlvReader(set).Next(packet));
    EXPECT_FALSE(SetIdentifier(packet));
    const ByteVector other = Packet({0x14}, kOwnIdentifier);
    ASSERT_TRUE(KlvReader(other).Next(packet));
    EXPECT_FALSE(SetIdentifier(packet));
}

TEST(HasSet, LooksAtEveryPacketThatIsWhole) {
    const ByteVector own(kOwnIdentifier.begin() + 4, kOwnIdentifier.end());
    EXPECT_TRUE(HasSet(Join({kForeignPacket, LocalSet(kOtherIdentifier), LocalSet(kOwnIdentifier)}), own));
    EXPECT_FALSE(HasSet(Join({kForeignPacket, LocalSet(kOtherIdentifier)}), own));
    ByteVector truncated = LocalSet(kOwnIdentifier);
    truncated[17] = 0x15;
    EXPECT_FALSE(HasSet(truncated, own));
}

}  // namespace
}  // namespace nal_access
