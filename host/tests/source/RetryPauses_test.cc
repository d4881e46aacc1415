#include "source/RetryPauses.h"

#include <gmock/gmock.h>

#include <vector>

namespace receiver {
namespace {

using namespace std::chrono_literals;
using ::testing::ElementsAre;

class RetryPausesTest : public testing::Test {
 protected:
    /// The pauses of `count` attempts that fail after `length`.
    std::vector<std::chrono::milliseconds> Pauses(RetryPauses& pauses, int count,
                                                  std::chrono::milliseconds length) {
        std::vector<std::chrono::milliseconds> all;
        for (int attempt = 0; attempt < count; ++attempt) {
            all.push_back(pauses.Next(now_));
            now_ += all.back();
            pauses.Tried(now_);
            now_ += length;
        }
        return all;
    }

    RetryPauses::Clock::time_point now_{1h};
};

TEST_F(RetryPausesTest, GrowUpToFifteenSecondsWhereTheSourceIsCalled) {
    RetryPauses pauses(false);
    EXPECT_THAT(Pauses(pauses, 7, 5s), ElementsAre(1s, 2s, 4s, 8s, 15s, 15s, 15s));
}

TEST_F(RetryPausesTest, BeginAnewBehindAConnectionThatHeld) {
    RetryPauses pauses(false);
    EXPECT_THAT(Pauses(pauses, 2, 5s), ElementsAre(1s, 2s));
    pauses.Lost(30s);
    EXPECT_EQ(pauses.Next(now_), 4s);
    pauses.Lost(31s);
    EXPECT_EQ(pauses.Next(now_), 1s);
}

// Whoever connects and goes away at once closes the listener for no longer than this.
TEST_F(RetryPausesTest, OfAListenerKeepAttemptsAFifthOfASecondApart) {
    RetryPauses pauses(true);
    EXPECT_THAT(Pauses(pauses, 4, 0ms), ElementsAre(0ms, 200ms, 200ms, 200ms));
    EXPECT_EQ(pauses.Next(now_ + 150ms), 50ms);
}

TEST_F(RetryPausesTest, OfAListenerAreNoneBehindASenderThatStayed) {
    RetryPauses pauses(true);
    EXPECT_THAT(Pauses(pauses, 3, 200ms), ElementsAre(0ms, 0ms, 0ms));
    EXPECT_THAT(Pauses(pauses, 2, 1min), ElementsAre(0ms, 0ms));
}

}  // namespace
}  // namespace receiver
