#include "timing/StepWatch.h"

#include <gtest/gtest.h>

#include "support/Ticks.h"

namespace receiver {
namespace {

constexpr auto kVideo = StepWatch::Medium::kVideo;
constexpr auto kAudio = StepWatch::Medium::kAudio;

TEST(StepWatch, AStepThatBothMediaMakeIsTheClocks) {
    for (const bool videoFirst : {true, false}) {
        StepWatch watch;
        EXPECT_FALSE(watch.Look(videoFirst ? kVideo : kAudio, kSecond, -3600));
        EXPECT_EQ(watch.Look(videoFirst ? kAudio : kVideo, 2 * kSecond, -3500), -3500);
    }
}

TEST(StepWatch, AStepOfOneMediumAloneIsNone) {
    StepWatch watch;
    EXPECT_FALSE(watch.Look(kVideo, kSecond, -3600));
    EXPECT_FALSE(watch.Look(kVideo, 2 * kSecond, -3600));
    EXPECT_FALSE(watch.Look(kAudio, 2 * kSecond, 0));
}

TEST(StepWatch, StepsThatDifferAreNone) {
    StepWatch watch;
    EXPECT_FALSE(watch.Look(kVideo, kSecond, -3600));
    EXPECT_FALSE(watch.Look(kAudio, kSecond, -3600 + 721));
    StepWatch other;
    EXPECT_FALSE(other.Look(kVideo, kSecond, -3600));
    EXPECT_TRUE(other.Look(kAudio, kSecond, -3600 + 720));
}

TEST(StepWatch, StepsThatAreFarApartAreNone) {
    StepWatch watch;
    EXPECT_FALSE(watch.Look(kVideo, kSecond, -3600));
    EXPECT_FALSE(watch.Look(kAudio, 6 * kSecond + 1, -3600));
}

TEST(StepWatch, SmallStepsAndGapsAreNone) {
    for (const std::int64_t distance : {std::int64_t{-1349}, std::int64_t{0}, std::int64_t{45000}}) {
        StepWatch watch;
        EXPECT_FALSE(watch.Look(kVideo, kSecond, distance));
        EXPECT_FALSE(watch.Look(kAudio, kSecond, distance));
    }
}

TEST(StepWatch, AStepCountsOnce) {
    StepWatch watch;
    EXPECT_FALSE(watch.Look(kVideo, kSecond, -3600));
    EXPECT_TRUE(watch.Look(kAudio, kSecond, -3600));
    EXPECT_FALSE(watch.Look(kAudio, kSecond, -3600));
}

}  // namespace
}  // namespace receiver
