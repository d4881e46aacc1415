#include "module/ModuleLog.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <thread>

namespace receiver {
namespace {

using ::testing::ElementsAre;
using ::testing::IsEmpty;
using Kind = ModuleEvent::Kind;

void Operator(const char* text) {
    Logger::Put(LOG_PRIORITY_OPERATOR, nullptr, nullptr, 0, "%s", text);
}

void Trace(const char* text) {
    Logger::Put(LOG_PRIORITY_TRACE, "a.cc", "f", 1, "%s", text);
}

/// "opened PATH" and "closed PATH" of the events of files.
std::vector<std::string> Files(ModuleLog& log) {
    std::vector<std::string> files;
    for (const ModuleEvent& event : log.TakeEvents()) {
        if (event.kind == Kind::kFileOpened) {
            files.push_back("opened " + event.text);
        } else if (event.kind == Kind::kFileClosed) {
            files.push_back("closed " + event.text);
        }
    }
    return files;
}

// The line of its end comes before the file is complete.
TEST(ModuleLog, ANormalFileIsToldWithItsFolderAndClosedByTheEndOfItsWriter) {
    ModuleLog log;
    Trace("output path = \"/srv/rec\\20261121\\CAM (1)\".");
    Trace("ST: out_filename = \"10_20_30_12.MP4\"");
    Operator("OP: FILE CREATE. (10_20_30_12.MP4)");
    EXPECT_THAT(Files(log), ElementsAre("opened /srv/rec/20261121/CAM (1)/10_20_30_12.MP4"));
    Operator("OP: FILE CLOSE. (10_20_30_12.MP4)");
    EXPECT_THAT(Files(log), IsEmpty());
    Trace("start. event_id = 6.");
    EXPECT_THAT(Files(log), ElementsAre("closed /srv/rec/20261121/CAM (1)/10_20_30_12.MP4"));
}

// No line of its own tells of the end of a fragmented file.
TEST(ModuleLog, AFragmentedFileIsClosedByTheNextOneOfItsWriterAndByTheEndOfThat) {
    ModuleLog log;
    Trace("output path = \"a\".");
    Trace("ST: out_filename = \"1.MP4\"");
    Trace("output path = \"b\".");
    Trace("ST: out_filename = \"2.MP4\"");
    Trace("start. event_id = 6.");
    EXPECT_THAT(Files(log),
                ElementsAre("opened a/1.MP4", "closed a/1.MP4", "opened b/2.MP4", "closed b/2.MP4"));
}

TEST(ModuleLog, WritersOfOverlappingRecordingsAreToldApart) {
    ModuleLog log;
    Trace("output path = \"a\".");
    Trace("ST: out_filename = \"1.MP4\"");
    std::thread([] {
        Trace("start. event_id = 6.");
        Trace("output path = \"b\".");
        Trace("ST: out_filename = \"2.MP4\"");
    }).join();
    EXPECT_THAT(Files(log), ElementsAre("opened a/1.MP4", "opened b/2.MP4"));
    Trace("start. event_id = 6.");
    EXPECT_THAT(Files(log), ElementsAre("closed a/1.MP4"));
}

TEST(ModuleLog, CountsTheUnitsThatEachQueueDropped) {
    const ModuleLog log;
    Logger::Put(LOG_PRIORITY_WARNING, "a.cc", "f", 1, "queue overflow (video)");
    Logger::Put(LOG_PRIORITY_WARNING, "a.cc", "f", 1, "queue overflow (video)");
    Logger::Put(LOG_PRIORITY_WARNING, "a.cc", "f", 1, "queue overflow (audio)");
    Logger::Put(LOG_PRIORITY_WARNING, "a.cc", "f", 1, "queue overflow (meta)");
    Logger::Put(LOG_PRIORITY_WARNING, "a.cc", "f", 1, "another warning");
    EXPECT_EQ(log.Losses().video, 2u);
    EXPECT_EQ(log.Losses().audio, 1u);
    EXPECT_EQ(log.Losses().meta, 1u);
    EXPECT_EQ(log.Losses().Total(), 4u);
}

TEST(ModuleLog, FollowsRecordingsFromStartToRemoval) {
    ModuleLog log;
    Operator("OP: REC START. 10:00:00:00. RTPTS = 900000. -> -1");
    EXPECT_EQ(log.OpenRecordings(), 1);
    Operator("OP: REC STOP. 10:00:02:00. RTPTS = 900000 -> 1080000.");
    EXPECT_EQ(log.OpenRecordings(), 1);
    Operator("OP: REMOVE STREAM. RTPTS = 900000 -> 1080000.");
    EXPECT_EQ(log.OpenRecordings(), 0);
    std::vector<Kind> kinds;
    for (const ModuleEvent& event : log.TakeEvents()) {
        kinds.push_back(event.kind);
    }
    EXPECT_EQ(kinds, (std::vector<Kind>{Kind::kRecordStarted, Kind::kRecordStopped, Kind::kRecordRemoved}));
}

TEST(ModuleLog, ErrorsAndRestartsAreEvents) {
    ModuleLog log;
    Logger::Put(LOG_PRIORITY_ERROR, "a.cc", "f", 1, "mp4 file open error.");
    Operator("OP: REC RESTART. RTPTS = 0 -> -1.");
    const std::vector<ModuleEvent> events = log.TakeEvents();
    ASSERT_EQ(events.size(), 2u);
    EXPECT_EQ(events[0].kind, Kind::kError);
    EXPECT_EQ(events[0].text, "mp4 file open error.");
    EXPECT_EQ(events[1].kind, Kind::kRecordRestarted);
}

/// What is told of a line at the priority of errors.
std::string Told(ModuleLog& log, const char* line) {
    Logger::Put(LOG_PRIORITY_ERROR, "a.cc", "f", 1, "%s", line);
    const std::vector<ModuleEvent> events = log.TakeEvents();
    return events.size() == 1 ? events.front().text : std::to_string(events.size()) + " events";
}

TEST(ModuleLog, ARefusedLogonIsToldWithoutUserAndPassword) {
    ModuleLog log;
    Trace("file output path = \\\\server\\rec, old.");
    EXPECT_EQ(Told(log, "LogonUser call failed. 0, 52e, \\\\server\\rec, old, user, pass"),
              "LogonUser call failed. 0, 52e, \\\\server\\rec, old");
    EXPECT_EQ(Told(log, "LogonUser call failed. 0, 52e, \\\\server\\rec, old, DOMAIN\\a, b, c\nd, e\n"),
              "LogonUser call failed. 0, 52e, \\\\server\\rec, old");
}

TEST(ModuleLog, ARefusedLogonAtAnUnknownPathIsToldWithItsNumberAlone) {
    ModuleLog log;
    EXPECT_EQ(Told(log, "LogonUser call failed. 0, 52e, \\\\server\\rec, user, pass"),
              "LogonUser call failed. 0, 52e");
}

TEST(ModuleLog, OtherLinesAreNoEvents) {
    ModuleLog log;
    Operator("OP: CHANGE STATE stop -> wait_state.");
    Operator("OP: FILE CREATE. (a.MP4)");
    Operator("OP: FILE CLOSE. (a.MP4)");
    Trace("output path = \"unfinished");
    Trace("ST: out_filename = \"");
    Trace("start. event_id = 6.");
    Logger::Put(LOG_PRIORITY_NOTICE, nullptr, nullptr, 0, "queue overflow (video)");
    EXPECT_TRUE(log.TakeEvents().empty());
    EXPECT_EQ(log.Losses().Total(), 0u);
}

// Also one that found nothing to stop, which no line for operators tells of.
TEST(ModuleLog, WaitsForTheStopOfAnotherThread) {
    const ModuleLog log;
    EXPECT_FALSE(log.WaitForStops(1, std::chrono::milliseconds(0)));
    std::thread stops([] {
        Logger::Put(LOG_PRIORITY_TRACE, "a.cc", "clipfileModule::Controller::StopStream", 1, "end.");
        Logger::Put(LOG_PRIORITY_TRACE, "a.cc", "clipfileModule::Controller::OnStopStream", 1, "start.");
        Logger::Put(LOG_PRIORITY_TRACE, "a.cc", "clipfileModule::Controller::OnStopStream", 1, "end.");
    });
    EXPECT_TRUE(log.WaitForStops(1, std::chrono::seconds(30)));
    stops.join();
    EXPECT_EQ(log.Stops(), 1);
}

TEST(ModuleLog, HearsNothingOnceItIsGone) {
    { const ModuleLog log; }
    Operator("OP: REC START. 10:00:00:00. RTPTS = 900000. -> -1");
    const ModuleLog log;
    EXPECT_EQ(log.OpenRecordings(), 0);
}

}  // namespace
}  // namespace receiver
