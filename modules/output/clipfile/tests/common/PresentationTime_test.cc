#include "common/PresentationTime.h"

#include <gtest/gtest.h>

namespace clipfileModule {
namespace {

StreamData unitAt(std::uint64_t rtp, std::uint64_t shown) {
    StreamData unit;
    unit.rtp_timestamp = rtp;
    unit.timestamp = rtp / 90;
    unit.presentation_timestamp = shown;
    return unit;
}

TEST(PresentationTime, InPresentationOrderTheWordIsNotRead) {
    const StreamData unit = unitAt(180000, 12345);
    EXPECT_EQ(PresentationRtp(unit, PictureOrder::kPresentation), 180000u);
    EXPECT_EQ(PresentationMilliSec(unit, PictureOrder::kPresentation), 2000u);
}

TEST(PresentationTime, InDecodingOrderTheWordTellsWhenAPictureIsShown) {
    const StreamData unit = unitAt(180000, 187200);
    EXPECT_EQ(PresentationRtp(unit, PictureOrder::kDecoding), 187200u);
    EXPECT_EQ(PresentationMilliSec(unit, PictureOrder::kDecoding), 2080u);
}

TEST(PresentationTime, TheWordMayWrapAsRtpTimestampsDo) {
    constexpr std::uint64_t kDecoded = 0x7'FFFF'FF00;
    EXPECT_EQ(PresentationRtp(unitAt(kDecoded, 0x100), PictureOrder::kDecoding), 0x8'0000'0100u);
    EXPECT_EQ(PresentationRtp(unitAt(kDecoded, 0x8'0000'0100), PictureOrder::kDecoding), 0x8'0000'0100u);
}

TEST(PresentationTime, APictureWhoseTimeCannotBeIsShownWhenItIsDecoded) {
    constexpr std::uint64_t kDecoded = 0x8'0000'0100;
    // Never set; before its decoding, over a wrap too; more than 3 s behind.
    const std::uint64_t impossible[] = {0, 0x8'0000'00FF, 0xFFFF'FF00, kDecoded + 270001};
    for (const std::uint64_t shown : impossible) {
        EXPECT_FALSE(HasPresentationTime(unitAt(kDecoded, shown))) << shown;
        EXPECT_EQ(PresentationRtp(unitAt(kDecoded, shown), PictureOrder::kDecoding), kDecoded) << shown;
    }
    for (const std::uint64_t shown : {kDecoded, kDecoded + 270000}) {
        EXPECT_TRUE(HasPresentationTime(unitAt(kDecoded, shown))) << shown;
        EXPECT_EQ(PresentationRtp(unitAt(kDecoded, shown), PictureOrder::kDecoding), shown);
    }
}

TEST(PresentationTime, MillisecondsAreThoseOfAUnitThatIsStampedSo) {
    // 3003 ticks are 33.37 ms: a picture at 10.0333 s that is decoded at 10.0000 s.
    StreamData unit = unitAt(900090, 903093);
    EXPECT_EQ(PresentationMilliSec(unit, PictureOrder::kDecoding), 10034u);
    // A host whose milliseconds have another origin.
    unit.timestamp = 5;
    EXPECT_EQ(PresentationMilliSec(unit, PictureOrder::kDecoding), 38u);
}

}  // namespace
}  // namespace clipfileModule
