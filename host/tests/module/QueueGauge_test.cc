#include "module/QueueGauge.h"

#include <gtest/gtest.h>

#include <thread>

#include "support/WaitTimes.h"

namespace receiver {
namespace {

TEST(QueueGauge, CountsEverythingThatEnteredUntilAMarkComesThrough) {
    QueueGauge gauge;
    gauge.Enter();
    gauge.Enter();
    std::shared_ptr<StreamData> mark = gauge.MakeMark();
    gauge.Enter();
    EXPECT_EQ(gauge.Bound(), 4u);
    mark.reset();
    EXPECT_EQ(gauge.Bound(), 1u);
}

TEST(QueueGauge, AMarkIsAUnitWithoutPayload) {
    QueueGauge gauge;
    EXPECT_EQ(gauge.MakeMark()->payload, nullptr);
}

TEST(QueueGauge, AMarkThatAFullQueueDropsHasNotComeThrough) {
    QueueGauge gauge;
    gauge.Enter();
    std::shared_ptr<StreamData> first = gauge.MakeMark();
    gauge.Enter();
    gauge.MakeMark().reset();
    EXPECT_EQ(gauge.Bound(), 2u);
    EXPECT_EQ(gauge.Passed(), 0u);
    EXPECT_EQ(gauge.Dropped(), 1u);
    first.reset();
    EXPECT_EQ(gauge.Bound(), 0u);
    EXPECT_EQ(gauge.Passed(), 2u);
}

TEST(QueueGauge, WaitsForTheMarkAndNoLongerThanItsPatience) {
    QueueGauge gauge;
    gauge.Enter();
    std::shared_ptr<StreamData> mark = gauge.MakeMark();
    EXPECT_FALSE(gauge.WaitForBound(1, kNow));
    EXPECT_TRUE(gauge.WaitForBound(2, kNow));
    std::thread queue([taken = std::move(mark)]() mutable { taken.reset(); });
    EXPECT_TRUE(gauge.WaitForBound(0, kDeadline));
    queue.join();
}

TEST(QueueGauge, AMarkMayOutliveTheGauge) {
    std::shared_ptr<StreamData> mark;
    {
        QueueGauge gauge;
        mark = gauge.MakeMark();
    }
    mark.reset();
}

}  // namespace
}  // namespace receiver
