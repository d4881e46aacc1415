#include "timing/Pacer.h"

#include <gtest/gtest.h>

namespace receiver {
namespace {

using namespace std::chrono_literals;

const Pacer::Clock::time_point kStart{std::chrono::hours(5)};

TEST(Pacer, TheFirstUnitIsDueAtOnce) {
    EXPECT_EQ(Pacer::ForFile(1).Due(7s, kStart), kStart);
    EXPECT_EQ(Pacer::ForLive(10).Due(7s, kStart), kStart);
}

TEST(Pacer, AFileComesInRealTime) {
    Pacer pacer = Pacer::ForFile(1);
    pacer.Taken(7s, kStart);
    EXPECT_EQ(pacer.Due(7s + 40ms, kStart), kStart + 40ms);
    EXPECT_EQ(pacer.Due(8s, kStart + 40ms), kStart + 1s);
}

TEST(Pacer, SpeedDividesTheTime) {
    Pacer pacer = Pacer::ForFile(4);
    pacer.Taken(0s, kStart);
    EXPECT_EQ(pacer.Due(8s, kStart), kStart + 2s);
}

TEST(Pacer, AUnitOfAnotherMediumThatComesLateIsDueAtOnce) {
    Pacer pacer = Pacer::ForFile(1);
    pacer.Taken(0s, kStart);
    pacer.Taken(1s, kStart + 1s);
    EXPECT_EQ(pacer.Due(900ms, kStart + 1s), kStart + 1s);
}

TEST(Pacer, AShortDelayIsCaughtUp) {
    Pacer pacer = Pacer::ForFile(1);
    pacer.Taken(0s, kStart);
    pacer.Taken(1s, kStart + 1900ms);
    EXPECT_EQ(pacer.Due(2s, kStart + 1900ms), kStart + 2s);
}

TEST(Pacer, AFileThatWasHeldUpGoesOnAtItsOwnSpeed) {
    Pacer pacer = Pacer::ForFile(1);
    pacer.Taken(0s, kStart);
    pacer.Taken(1s, kStart + 5s);
    EXPECT_EQ(pacer.Due(2s, kStart + 5s), kStart + 6s);
}

TEST(Pacer, ALiveSourceSetsItsOwnPace) {
    Pacer pacer = Pacer::ForLive(10);
    pacer.Taken(0s, kStart);
    EXPECT_EQ(pacer.Due(1s, kStart + 1s), kStart + 1s);
}

TEST(Pacer, ABurstOfALiveSourceComesNotFasterThanTold) {
    Pacer pacer = Pacer::ForLive(10);
    pacer.Taken(0s, kStart);
    EXPECT_EQ(pacer.Due(40ms, kStart), kStart + 4ms);
    pacer.Taken(40ms, kStart + 4ms);
    EXPECT_EQ(pacer.Due(80ms, kStart + 4ms), kStart + 8ms);
}

}  // namespace
}  // namespace receiver
