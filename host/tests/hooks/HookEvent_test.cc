#include "hooks/HookEvent.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

namespace receiver {
namespace {

using ::testing::ElementsAre;

TEST(HookEventTest, EachMemberIsAVariable) {
    const std::string line =
        R"({"event":"failure","time":"2026-11-21T20:15:07.042Z","exit_code":6,"text":"no \"disk\"."})"
        "\n";
    const auto event = HookEventOf(line);
    ASSERT_TRUE(event);
    EXPECT_EQ(event->name, "failure");
    EXPECT_EQ(event->json, line);
    EXPECT_THAT(event->environment,
                ElementsAre("CLIPFILE_EVENT=failure", "CLIPFILE_TIME=2026-11-21T20:15:07.042Z",
                            "CLIPFILE_EXIT_CODE=6", "CLIPFILE_TEXT=no \"disk\"."));
}

TEST(HookEventTest, HooksHearOfFilesRecordingsFaultsAndFailures) {
    for (const char* const told :
         {R"({"event":"file_closed","path":"a"})", R"({"event":"record_started","timecode":"10:00:00:00"})",
          R"({"event":"record_stopped","timecode":"10:00:00:00"})", R"({"event":"failure","exit_code":1})",
          R"({"event":"status","status":6,"cause":22})", R"({"event":"status","status":7,"cause":4})"}) {
        EXPECT_TRUE(HookEventOf(told)) << told;
    }
    for (const char* const untold :
         {R"({"event":"progress"})", R"({"event":"notice","text":"x"})", R"({"event":"file_opened"})",
          R"({"event":"summary"})", R"({"event":"status","status":4,"cause":0})", "", "{", "[]", "{}"}) {
        EXPECT_FALSE(HookEventOf(untold)) << untold;
    }
}

}  // namespace
}  // namespace receiver
