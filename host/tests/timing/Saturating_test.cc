#include "timing/Saturating.h"

#include <gtest/gtest.h>

namespace receiver {
namespace {

constexpr std::int64_t kLowest = std::numeric_limits<std::int64_t>::min();
constexpr std::int64_t kHighest = std::numeric_limits<std::int64_t>::max();

TEST(Saturating, SumsThatFitAreExact) {
    EXPECT_EQ(SaturatingAdd(-3, 5), 2);
    EXPECT_EQ(SaturatingAdd(kHighest, kLowest), -1);
    EXPECT_EQ(SaturatingAdd(kHighest - 1, 1), kHighest);
    EXPECT_EQ(SaturatingSubtract(-3, 5), -8);
    EXPECT_EQ(SaturatingSubtract(kLowest, kLowest), 0);
    EXPECT_EQ(SaturatingSubtract(-1, kHighest), kLowest);
}

TEST(Saturating, SumsThatDoNotFitStayAtTheEnd) {
    EXPECT_EQ(SaturatingAdd(kHighest, 1), kHighest);
    EXPECT_EQ(SaturatingAdd(kLowest, -1), kLowest);
    EXPECT_EQ(SaturatingSubtract(kHighest, -1), kHighest);
    EXPECT_EQ(SaturatingSubtract(kLowest, 1), kLowest);
    EXPECT_EQ(SaturatingSubtract(0, kLowest), kHighest);
}

TEST(Saturating, DistancesAreExactOverTheWholeRange) {
    EXPECT_EQ(Distance(-2, 3), 5u);
    EXPECT_EQ(Distance(3, -2), 5u);
    EXPECT_EQ(Distance(kLowest, kHighest), std::numeric_limits<std::uint64_t>::max());
}

}  // namespace
}  // namespace receiver
