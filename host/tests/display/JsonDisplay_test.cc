#include "display/JsonDisplay.h"

#include <gtest/gtest.h>

#include <nlohmann/json.hpp>
#include <sstream>

#include "Snapshots.h"

namespace receiver {
namespace {

class JsonDisplayTest : public ::testing::Test {
 protected:
    std::string Said() {
        std::string text = out_.str();
        out_.str("");
        return text;
    }

    std::ostringstream out_;
    // A Saturday.
    JsonDisplay display_{out_, [] {
                             return std::chrono::sys_days(std::chrono::year(2026) / 11 / 21) +
                                    std::chrono::hours(20) + std::chrono::minutes(15) +
                                    std::chrono::milliseconds(7042);
                         }};
};

TEST_F(JsonDisplayTest, EachEventIsOneObjectOnOneLine) {
    display_.Notice("say \"a\"\nb");
    EXPECT_EQ(Said(), R"({"event":"notice","time":"2026-11-21T20:15:07.042Z","text":"say \"a\"\nb"})"
                      "\n");
    display_.Failure(ExitCode::kModule, "no module.");
    EXPECT_EQ(Said(),
              R"({"event":"failure","time":"2026-11-21T20:15:07.042Z","exit_code":5,"text":"no module."})"
              "\n");
    display_.Status({3, 0});
    EXPECT_EQ(
        Said(),
        R"({"event":"status","time":"2026-11-21T20:15:07.042Z","status":3,"cause":0,"words":"buffering has stopped"})"
        "\n");
    display_.FileOpened("a.MP4");
    EXPECT_EQ(Said(), R"({"event":"file_opened","time":"2026-11-21T20:15:07.042Z","path":"a.MP4"})"
                      "\n");
    display_.FileClosed("a.MP4");
    EXPECT_EQ(Said(), R"({"event":"file_closed","time":"2026-11-21T20:15:07.042Z","path":"a.MP4"})"
                      "\n");
    display_.RecordStarted({10, 20, 18, 0, true});
    EXPECT_EQ(Said(),
              R"({"event":"record_started","time":"2026-11-21T20:15:07.042Z","timecode":"10:20:18;00"})"
              "\n");
    display_.RecordStopped({10, 20, 40, 12, false});
    EXPECT_EQ(Said(),
              R"({"event":"record_stopped","time":"2026-11-21T20:15:07.042Z","timecode":"10:20:40:12"})"
              "\n");
}

TEST_F(JsonDisplayTest, ProgressHoldsTheWholeSnapshot) {
    display_.Show(RecordingSnapshot());
    EXPECT_EQ(
        Said(),
        R"({"event":"progress","time":"2026-11-21T20:15:07.042Z","timecode":"10:20:30;12","seconds":12.5,"recording":true,)"
        R"("waiting_for_idr":false,"frames_per_second":59.94,"video_kilobits":8123.4,"audio_kilobits":192.2,)"
        R"("klv_packets":7,"status":4,"cause":0,"file":"/srv/rec/20261121/CAM1/10_20_18_00.MP4",)"
        R"("free_bytes":123456789012,"sync_milliseconds":12,"lost":0})"
        "\n");
}

TEST_F(JsonDisplayTest, WhatIsNotKnownIsNull) {
    display_.Show({});
    const auto object = nlohmann::json::parse(Said());
    EXPECT_TRUE(object["timecode"].is_null());
    EXPECT_TRUE(object["file"].is_null());
    EXPECT_TRUE(object["free_bytes"].is_null());
    EXPECT_TRUE(object["sync_milliseconds"].is_null());
}

TEST_F(JsonDisplayTest, ProgressComesAtOnceWhenARecordingBeginsOrEnds) {
    Snapshot snapshot;
    display_.Show(snapshot);
    Said();
    display_.Show(snapshot);
    EXPECT_EQ(Said(), "");
    snapshot.recording = true;
    display_.Show(snapshot);
    EXPECT_NE(Said(), "");
}

TEST_F(JsonDisplayTest, TheSummaryListsTheFiles) {
    display_.Finish({{ClosedFile()}, 2, ExitCode::kLost});
    EXPECT_EQ(
        Said(),
        R"({"event":"summary","time":"2026-11-21T20:15:07.042Z","files":[{"path":"/srv/rec/20261121/CAM1/10_20_18_00.MP4","bytes":12345678,)"
        R"("start_timecode":"10:20:18;00","seconds":7.04,"frames":176,"problem":null}],"lost":2,"exit_code":8})"
        "\n");
}

TEST_F(JsonDisplayTest, WhatNobodyHasReadIsANotice) {
    const auto object = nlohmann::json::parse(JsonRemark(2));
    EXPECT_EQ(object["event"], "notice");
    EXPECT_EQ(object["text"], "2 messages could not be shown");
    EXPECT_EQ(object["time"].get<std::string>().size(), 24u);
    EXPECT_EQ(JsonRemark(1).back(), '\n');
}

TEST_F(JsonDisplayTest, BytesThatAreNoTextAreReplaced) {
    display_.FileOpened("a\xFFz");
    EXPECT_EQ(nlohmann::json::parse(Said())["path"], "a\xEF\xBF\xBDz");
}

}  // namespace
}  // namespace receiver
