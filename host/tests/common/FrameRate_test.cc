#include "common/FrameRate.h"

#include <gtest/gtest.h>

namespace receiver {
namespace {

struct Spelling {
    const char* text;
    std::uint32_t key;
};
void PrintTo(const Spelling& spelling, std::ostream* out) {
    *out << spelling.text;
}

class FrameRateSpelling : public testing::TestWithParam<Spelling> {};

TEST_P(FrameRateSpelling, NamesItsRate) {
    const auto rate = ParseFrameRate(GetParam().text);
    ASSERT_TRUE(rate);
    EXPECT_EQ(rate->key, GetParam().key);
}

INSTANTIATE_TEST_SUITE_P(All, FrameRateSpelling,
                         testing::Values(Spelling{"23.976", 23980}, Spelling{"23.98", 23980},
                                         Spelling{"24", 24000}, Spelling{"25", 25000},
                                         Spelling{"25.000", 25000}, Spelling{"29.97", 29970},
                                         Spelling{"30", 30000}, Spelling{"50", 50000},
                                         Spelling{"59.94", 59940}, Spelling{"60", 60000}));

TEST(FrameRate, TextsThatNameNoRateGiveNothing) {
    for (const char* text : {"", "26", "25fps", " 25", "-25", "1e2", "29.9", "nan"}) {
        EXPECT_FALSE(ParseFrameRate(text)) << text;
    }
}

TEST(FrameRate, Ntsc59CountsSixtyAndDropsFrames) {
    const FrameRate expected{59940, 60000, 1001, 60, true};
    EXPECT_EQ(NearestFrameRate(60000, 1001), expected);
}

TEST(FrameRate, FilmRateOf1001DoesNotDropFrames) {
    const FrameRate expected{23980, 24000, 1001, 24, false};
    EXPECT_EQ(NearestFrameRate(24000, 1001), expected);
}

TEST(FrameRate, RatesBetweenThoseOfTheTableGiveNothing) {
    EXPECT_FALSE(NearestFrameRate(15, 1));
    EXPECT_FALSE(NearestFrameRate(48, 1));
    EXPECT_FALSE(NearestFrameRate(25, 0));
    EXPECT_FALSE(NearestFrameRate(-25, 1));
    EXPECT_FALSE(NearestFrameRate(0, 1));
}

}  // namespace
}  // namespace receiver
