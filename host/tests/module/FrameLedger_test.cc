#include "module/FrameLedger.h"

#include <gtest/gtest.h>

#include <thread>
#include <vector>

#include "support/WaitTimes.h"

namespace receiver {
namespace {

/// Twenty units in the module; nothing is cut.
std::vector<std::function<void()>> TwentyUnits(FrameLedger& ledger) {
    std::vector<std::function<void()>> releases;
    for (int i = 0; i < 20; ++i) {
        releases.push_back(ledger.Enter());
    }
    return releases;
}

/// Cuts eight units into a chunk: all but the first are released.
void Cut(std::vector<std::function<void()>>& releases, std::size_t first) {
    for (std::size_t i = first + 1; i < first + 8; ++i) {
        releases[i]();
    }
}

TEST(FrameLedger, UnitsThatWereNotReleasedAreUncut) {
    FrameLedger ledger;
    const auto releases = TwentyUnits(ledger);
    EXPECT_EQ(ledger.UncutUnits(), 20u);
    EXPECT_EQ(ledger.WaitingChunks(), 0u);
}

TEST(FrameLedger, AChunkHoldsItsFirstUnitUntilItIsWritten) {
    FrameLedger ledger;
    auto releases = TwentyUnits(ledger);
    Cut(releases, 0);
    Cut(releases, 8);
    EXPECT_EQ(ledger.WaitingChunks(), 2u);
    EXPECT_EQ(ledger.UncutUnits(), 4u);
    releases[0]();
    EXPECT_EQ(ledger.WaitingChunks(), 1u);
    releases[8]();
    EXPECT_EQ(ledger.WaitingChunks(), 0u);
}

TEST(FrameLedger, UnitsThatNoRecordingTakesAreNowhere) {
    FrameLedger ledger;
    for (const auto& release : TwentyUnits(ledger)) {
        release();
    }
    EXPECT_EQ(ledger.UncutUnits(), 0u);
    EXPECT_EQ(ledger.WaitingChunks(), 0u);
}

TEST(FrameLedger, WaitsForTheDisk) {
    FrameLedger ledger;
    auto releases = TwentyUnits(ledger);
    Cut(releases, 0);
    EXPECT_FALSE(ledger.WaitForChunks(0, kNow));
    EXPECT_TRUE(ledger.WaitForChunks(1, kNow));
    std::thread writer([&] { releases[0](); });
    EXPECT_TRUE(ledger.WaitForChunks(0, kDeadline));
    writer.join();
}

TEST(FrameLedger, WaitsForTheCut) {
    FrameLedger ledger;
    auto releases = TwentyUnits(ledger);
    EXPECT_FALSE(ledger.WaitForUncut(12, kNow));
    std::thread cutter([&] { Cut(releases, 0); });
    EXPECT_TRUE(ledger.WaitForUncut(12, kDeadline));
    cutter.join();
}

TEST(FrameLedger, UnitsMayOutliveTheLedger) {
    std::function<void()> release;
    {
        FrameLedger ledger;
        release = ledger.Enter();
    }
    release();
}

}  // namespace
}  // namespace receiver
