#include "source/AwaitSource.h"

#include <gmock/gmock.h>

#include <algorithm>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "SourceTesting.h"
#include "source/Input.h"

namespace receiver {
namespace {

using namespace std::chrono_literals;
using ::testing::ElementsAre;
using ::testing::Pair;

/// Time that passes where a test says so.
class DrivenClock final : public WaitClockInterface {
 public:
    TimePoint Now() override { return now_; }
    void SleepUntil(TimePoint time) override {
        if (stopsAt && time >= TimePoint(*stopsAt)) {
            throw Stopped();
        }
        now_ = std::max(now_, time);
    }
    void Pass(std::chrono::seconds time) { now_ += time; }
    std::chrono::seconds Elapsed() const {
        return std::chrono::duration_cast<std::chrono::seconds>(now_.time_since_epoch());
    }

    std::optional<std::chrono::seconds> stopsAt;

 private:
    TimePoint now_{};
};

class AwaitSourceTest : public testing::Test, public SourceListenerInterface {
 protected:
    void OnNotice(const std::string& sentence) override {
        notices_.emplace_back(clock_.Elapsed().count(), sentence);
    }
    /// Attempts of `length` each fail until `there`.
    void Await(bool listens, std::chrono::seconds length, std::chrono::seconds there) {
        const auto attempt = [&](bool told) {
            attempts_.emplace_back(clock_.Elapsed().count(), told);
            if (clock_.Elapsed() + length > there) {
                return;
            }
            clock_.Pass(length);
            throw SourceAbsent("nobody is there");
        };
        AwaitSource(listens, attempt, *this, clock_);
    }

    DrivenClock clock_;
    /// Seconds, and what was told then; seconds, and whether the absence had been told.
    std::vector<std::pair<std::int64_t, std::string>> notices_;
    std::vector<std::pair<std::int64_t, bool>> attempts_;
};

constexpr const char* kTold = "nobody is there; waiting for it";

TEST_F(AwaitSourceTest, WhatIsThereIsNotToldOf) {
    Await(false, 5s, 0s);
    EXPECT_THAT(attempts_, ElementsAre(Pair(0, false)));
    EXPECT_TRUE(notices_.empty());
}

TEST_F(AwaitSourceTest, AbsenceIsToldOnceAndThenEveryMinute) {
    // An attempt of a second and a pause of two.
    Await(false, 1s, 182s);
    EXPECT_THAT(notices_, ElementsAre(Pair(1, kTold), Pair(61, kTold), Pair(121, kTold), Pair(181, kTold)));
    // At 0, 3, ... 180 and, with success, 183.
    EXPECT_EQ(attempts_.size(), 62u);
    EXPECT_FALSE(attempts_[0].second);
    EXPECT_TRUE(attempts_[1].second);
}

TEST_F(AwaitSourceTest, WhoListensDoesNotPauseBetweenTwoAttempts) {
    Await(true, 60s, 120s);
    EXPECT_THAT(attempts_, ElementsAre(Pair(0, false), Pair(60, true), Pair(120, true)));
    EXPECT_THAT(notices_, ElementsAre(Pair(60, kTold), Pair(120, kTold)));
}

TEST_F(AwaitSourceTest, ListeningThatFailsAtOnceIsNotTriedInAHurry) {
    Await(true, 0s, 3s);
    // Five times a second, up to the fourth, which is known to have passed three.
    EXPECT_EQ(attempts_.size(), 21u);
    EXPECT_THAT(notices_, ElementsAre(Pair(0, kTold)));
}

TEST_F(AwaitSourceTest, AnotherFailureEndsTheWait) {
    const auto attempt = [](bool) { throw ReceiverError(ExitCode::kSourceUnsuitable, "no video"); };
    EXPECT_THROW(AwaitSource(false, attempt, *this, clock_), ReceiverError);
    EXPECT_TRUE(notices_.empty());
}

TEST_F(AwaitSourceTest, WhoeverStopsEndsTheWait) {
    clock_.stopsAt = 10s;
    EXPECT_THROW(Await(false, 1s, 1000s), Stopped);
    EXPECT_THAT(notices_, ElementsAre(Pair(1, kTold)));
}

TEST(SteadyWaitClockTest, IsEndedByWhoeverStops) {
    SteadyWaitClock clock([] { return true; });
    EXPECT_THROW(clock.SleepUntil(clock.Now() + std::chrono::hours(1)), Stopped);
    EXPECT_NO_THROW(clock.SleepUntil(clock.Now()));
}

}  // namespace
}  // namespace receiver
