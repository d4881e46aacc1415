#include "display/DisplayGroup.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "fakes/FakeDisplay.h"

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::SizeIs;

TEST(DisplayGroupTest, AllAreToldTheSameInTheirOrder) {
    FakeDisplay first;
    FakeDisplay second;
    std::vector<int> order;
    first.onNotice = [&](const std::string&) { order.push_back(1); };
    second.onNotice = [&](const std::string&) { order.push_back(2); };
    DisplayGroup group;
    group.Notice("nobody");
    group.Add(first);
    group.Add(second);
    group.Notice("a");
    group.Failure(ExitCode::kOutput, "b.");
    group.Status({4, 0});
    group.FileOpened("c");
    group.FileClosed("d");
    group.RecordStarted({1, 2, 3, 4, false});
    group.RecordStopped({5, 6, 7, 8, false});
    group.Show({});
    group.Finish({{}, 9, ExitCode::kLost});
    EXPECT_THAT(order, ElementsAre(1, 2));
    for (const FakeDisplay* const display : {&first, &second}) {
        EXPECT_THAT(display->notices, ElementsAre("a"));
        EXPECT_EQ(display->failureCode, ExitCode::kOutput);
        EXPECT_EQ(display->failure, "b.");
        EXPECT_THAT(display->statuses, ElementsAre(ModuleStatus{4, 0}));
        EXPECT_THAT(display->opened, ElementsAre("c"));
        EXPECT_THAT(display->closed, ElementsAre("d"));
        EXPECT_THAT(display->started, ElementsAre(Timecode{1, 2, 3, 4, false}));
        EXPECT_THAT(display->stopped, ElementsAre(Timecode{5, 6, 7, 8, false}));
        EXPECT_THAT(display->snapshots, SizeIs(1));
        EXPECT_EQ(display->summary.lost, 9u);
        EXPECT_EQ(display->finished, 1);
    }
}

}  // namespace
}  // namespace receiver
