#include "AnnexBReader.h"

#include <gtest/gtest.h>

#include <vector>

namespace nal_access {
namespace {

using Units = std::vector<std::vector<unsigned char>>;

Units Split(const std::vector<unsigned char>& stream) {
    Units units;
    AnnexBReader reader(stream);
    for (Bytes nal; reader.Next(nal);) {
        units.emplace_back(nal.begin(), nal.end());
    }
    return units;
}

TEST(AnnexBReader, FindsUnitsBehindStartCodesOfThreeAndFourBytes) {
    EXPECT_EQ(Split({0, 0, 0, 1, 0x67, 0x42, 0, 0, 1, 0x68, 0xCE, 0, 0, 0, 1, 0x65}),
              (Units{{0x67, 0x42}, {0x68, 0xCE}, {0x65}}));
}

TEST(AnnexBReader, FindsAStartCodeAtEveryDistance) {
    for (unsigned char length = 1; length < 20; ++length) {
        std::vector<unsigned char> stream = {0, 0, 1};
        stream.insert(stream.end(), length, length);
        stream.insert(stream.end(), {0, 0, 1, 0x77});
        EXPECT_EQ(Split(stream), (Units{std::vector<unsigned char>(length, length), {0x77}})) << int{length};
    }
}

TEST(AnnexBReader, ShowsWhatStandsBehindTheLastStartCode) {
    const std::vector<unsigned char> stream = {9, 0, 0, 1, 0x67, 0x42, 0, 0, 1, 0x65, 0, 0, 1};
    const auto rest = [](const AnnexBReader& reader) {
        return std::vector<unsigned char>(reader.Rest().begin(), reader.Rest().end());
    };
    AnnexBReader reader(stream);
    EXPECT_EQ(rest(reader), (std::vector<unsigned char>{0x67, 0x42, 0, 0, 1, 0x65, 0, 0, 1}));
    Bytes nal;
    ASSERT_TRUE(reader.Next(nal));
    EXPECT_EQ(rest(reader), (std::vector<unsigned char>{0x65, 0, 0, 1}));
    ASSERT_TRUE(reader.Next(nal));
    EXPECT_TRUE(reader.Rest().empty());
    EXPECT_FALSE(reader.Next(nal));
    EXPECT_TRUE(reader.Rest().empty());
    EXPECT_TRUE(AnnexBReader({}).Rest().empty());
}

TEST(AnnexBReader, LeavesOutTrailingZeroBytes) {
    EXPECT_EQ(Split({0, 0, 1, 0x67, 0x42, 0, 0, 0, 0, 0, 0, 1, 0x68, 0, 0, 0}),
              (Units{{0x67, 0x42}, {0x68}}));
}

TEST(AnnexBReader, KeepsZeroBytesInsideAUnit) {
    EXPECT_EQ(Split({0, 0, 1, 0x65, 0, 0, 3, 0, 2, 0, 7}), (Units{{0x65, 0, 0, 3, 0, 2, 0, 7}}));
}

TEST(AnnexBReader, SkipsBytesBeforeTheFirstStartCode) {
    EXPECT_EQ(Split({0xAB, 0xCD, 0, 0, 1, 0x65}), (Units{{0x65}}));
}

TEST(AnnexBReader, SkipsEmptyUnits) {
    EXPECT_EQ(Split({0, 0, 1, 0, 0, 1, 0, 0, 0, 1, 0x65, 0, 0, 1}), (Units{{0x65}}));
}

TEST(AnnexBReader, FindsNothingWithoutAStartCode) {
    EXPECT_EQ(Split({}), Units{});
    EXPECT_EQ(Split({1}), Units{});
    EXPECT_EQ(Split({0, 1}), Units{});
    EXPECT_EQ(Split({0, 0, 0, 0}), Units{});
    EXPECT_EQ(Split({0x65, 0x88, 0x84, 0, 2, 1}), Units{});
    EXPECT_EQ(Split({0, 0, 1}), Units{});
}

}  // namespace
}  // namespace nal_access
