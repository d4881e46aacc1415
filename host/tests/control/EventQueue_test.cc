#include "control/EventQueue.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <nlohmann/json.hpp>

namespace receiver {
namespace {

using ::testing::IsEmpty;
using ::testing::SizeIs;

TEST(EventQueueTest, GivesEachEventAsALineOnceAndCalls) {
    int added = 0;
    EventQueue events([&] { ++added; });
    events.Display().Notice("hello");
    events.Display().RecordStarted({10, 0, 0, 0, false});
    EXPECT_EQ(added, 2);
    const auto lines = events.Take();
    ASSERT_THAT(lines, SizeIs(2));
    EXPECT_EQ(nlohmann::json::parse(lines[0])["text"], "hello");
    EXPECT_EQ(nlohmann::json::parse(lines[1])["event"], "record_started");
    EXPECT_THAT(events.Take(), IsEmpty());
}

TEST(EventQueueTest, TheOldestGiveWayAndANoticeTellsHowMany) {
    EventQueue events([] {});
    for (std::size_t i = 0; i < EventQueue::kBound + 3; ++i) {
        events.Display().Notice(std::to_string(i));
    }
    const auto lines = events.Take();
    ASSERT_THAT(lines, SizeIs(EventQueue::kBound + 1));
    EXPECT_EQ(nlohmann::json::parse(lines[0])["text"], "3 messages could not be shown");
    EXPECT_EQ(nlohmann::json::parse(lines[1])["text"], "3");
}

}  // namespace
}  // namespace receiver
