#include "timing/ForwardSteps.h"

#include <gtest/gtest.h>

namespace receiver {
namespace {

using Verdict = ForwardSteps::Verdict;

constexpr std::int64_t kSecond = 90000;

/// The pictures have stepped by half a second where one was expected at 10 s.
class ForwardStepsTest : public testing::Test {
 protected:
    ForwardStepsTest() { steps_.Suspect(StepWatch::Medium::kVideo, 10 * kSecond, kSecond / 2); }

    ForwardSteps steps_;
};

TEST_F(ForwardStepsTest, SoundThatMakesTheSameStepTellsOne) {
    EXPECT_EQ(steps_.Look(StepWatch::Medium::kAudio, 10 * kSecond - 20000, kSecond / 2 + 720),
              Verdict::kStep);
    EXPECT_EQ(steps_.Ticks(), kSecond / 2);
    EXPECT_TRUE(steps_.IsOf(StepWatch::Medium::kVideo));
}

TEST_F(ForwardStepsTest, SoundMayMakeItALittleLater) {
    EXPECT_EQ(steps_.Look(StepWatch::Medium::kAudio, 10 * kSecond - 20000, 0), Verdict::kUnknown);
    EXPECT_EQ(steps_.Look(StepWatch::Medium::kAudio, 10 * kSecond + 20000, 100), Verdict::kUnknown);
    EXPECT_EQ(steps_.Look(StepWatch::Medium::kAudio, 10 * kSecond + 22000, kSecond / 2), Verdict::kStep);
}

TEST_F(ForwardStepsTest, SoundThatGoesOnAllTheWhileTellsOfALoss) {
    EXPECT_EQ(steps_.Look(StepWatch::Medium::kAudio, 10 * kSecond + kSecond / 2 - 1, 0), Verdict::kUnknown);
    EXPECT_EQ(steps_.Look(StepWatch::Medium::kAudio, 10 * kSecond + kSecond / 2, 0), Verdict::kLoss);
}

TEST_F(ForwardStepsTest, AnotherStepIsNone) {
    EXPECT_EQ(steps_.Look(StepWatch::Medium::kAudio, 10 * kSecond, kSecond / 2 + 721), Verdict::kUnknown);
}

TEST_F(ForwardStepsTest, WithoutSoundNobodyWaitsForLong) {
    EXPECT_EQ(steps_.Look(StepWatch::Medium::kVideo, 10 * kSecond, kSecond / 2 + kSecond), Verdict::kUnknown);
    EXPECT_EQ(steps_.Look(StepWatch::Medium::kVideo, 10 * kSecond, kSecond / 2 + kSecond + 1),
              Verdict::kLoss);
}

TEST(ForwardSteps, OfManySecondsAreNotWaitedForAsLong) {
    ForwardSteps steps;
    steps.Suspect(StepWatch::Medium::kAudio, 10 * kSecond, 5 * kSecond);
    EXPECT_EQ(steps.Look(StepWatch::Medium::kVideo, 11 * kSecond - 1, 0), Verdict::kUnknown);
    EXPECT_EQ(steps.Look(StepWatch::Medium::kVideo, 11 * kSecond, 0), Verdict::kLoss);
}

}  // namespace
}  // namespace receiver
