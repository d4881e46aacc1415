#include "control/StatusReport.h"

#include <gtest/gtest.h>
#include <stdlib.h>

#include <fstream>
#include <nlohmann/json.hpp>

#include "support/TemporaryFolder.h"

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;
using std::chrono::seconds;

std::optional<std::uint64_t> TwelveBytes(const std::string& /*path*/) {
    return 12;
}

RunState::WallClock::time_point Second(int second) {
    return std::chrono::sys_days(std::chrono::year(2026) / 11 / 21) + std::chrono::hours(20) +
           seconds(second);
}

RunFile OpenFile() {
    RunFile file;
    file.path = "/srv/10_00_00_00.MP4";
    file.start = Timecode{10, 0, 0, 0, false};
    file.frameRate = ParseFrameRate("25").value();
    file.opened = Second(1);
    return file;
}

TEST(StatusReportTest, ARunThatWaitsForItsSourceSaysSo) {
    RunState::View view;
    view.started = view.since = Second(0);
    EXPECT_EQ(StatusReport(view, TwelveBytes), Json::parse(R"({
        "state": "waiting_for_source", "since": "2026-11-21T20:00:00.000Z",
        "started": "2026-11-21T20:00:00.000Z", "timecode": null, "seconds": 0.0, "source": null, "file": null,
        "files": 0, "recordings": 0, "buffered_pictures": 0,
        "losses": {"total": 0, "pictures": 0, "packets": 0, "video_units": 0, "audio_units": 0,
                   "metadata_units": 0, "klv_packets": 0},
        "disk": {"free_bytes": null, "hours": null},
        "module": {"status": 0, "cause": 0, "words": "starting", "faults": 0},
        "hooks": {"delivered": 0, "failed": 0}})"));
}

TEST(StatusReportTest, TellsAllOfARecording) {
    RunState::View view;
    view.phase = RunPhase::kRecording;
    view.started = Second(0);
    view.since = Second(2);
    SourceDescription source;
    source.summary = "H.264";
    source.width = 1280;
    source.height = 720;
    source.frameRate = ParseFrameRate("29.97").value();
    view.source = source;
    Snapshot& snapshot = view.snapshot;
    snapshot.timecode = Timecode{10, 0, 8, 10, false};
    snapshot.seconds = 8.5;
    snapshot.framesPerSecond = 25;
    // A thousand bytes a millisecond: 3.6 GB an hour.
    snapshot.videoKilobits = 7800;
    snapshot.audioKilobits = 200;
    snapshot.klvPackets = 3;
    snapshot.status = {4, 0};
    // Two hours, and what the module leaves free.
    snapshot.freeBytes = 7200000000 + 157286400;
    snapshot.lost = 9;
    snapshot.losses = {1, 2, 3, 4, 5, 6};
    snapshot.source = {1, 2, 3, 4, false};
    snapshot.heldPictures = 17;
    snapshot.hooksTold = 7;
    snapshot.hooksFailed = 8;
    view.faults = 1;
    view.files = 2;
    view.recordings = 1;
    view.openFile = OpenFile();
    EXPECT_EQ(StatusReport(view, TwelveBytes), Json::parse(R"({
        "state": "recording", "since": "2026-11-21T20:00:02.000Z", "started": "2026-11-21T20:00:00.000Z",
        "timecode": "10:00:08:10", "seconds": 8.5,
        "source": {"summary": "H.264", "width": 1280, "height": 720, "frame_rate": 29.97, "away": false,
                   "reconnections": 1, "changes": 2, "silent_frames": 3, "early_pictures": 4,
                   "frames_per_second": 25.0, "video_kilobits": 7800.0, "audio_kilobits": 200.0,
                   "klv_packets": 3},
        "file": {"path": "/srv/10_00_00_00.MP4", "state": "open", "timecode": "10:00:00:00",
                 "opened": "2026-11-21T20:00:01.000Z", "closed": null, "seconds": 8.4, "bytes": 12},
        "files": 2, "recordings": 1, "buffered_pictures": 17,
        "losses": {"total": 9, "pictures": 1, "packets": 2, "video_units": 3, "audio_units": 4,
                   "metadata_units": 5, "klv_packets": 6},
        "disk": {"free_bytes": 7357286400, "hours": 2.0},
        "module": {"status": 4, "cause": 0, "words": "buffering", "faults": 1},
        "hooks": {"delivered": 7, "failed": 8}})"));
}

TEST(StatusReportTest, ADiskWithNothingLeftForTheModuleHasNoHours) {
    RunState::View view;
    view.snapshot.videoKilobits = 8000;
    view.snapshot.freeBytes = 1000;
    EXPECT_EQ(StatusReport(view, TwelveBytes)["disk"]["hours"], 0.0);
}

TEST(FilesReportTest, AFileReachesToItsEndAndAnOpenOneToThePresent) {
    RunFile closed = OpenFile();
    closed.end = Timecode{10, 0, 5, 0, false};
    closed.closed = Second(7);
    RunFile cutOff = OpenFile();
    cutOff.closed = Second(8);
    const Json report = FilesReport({closed, cutOff, OpenFile()}, Timecode{10, 0, 1, 0, false},
                                    [](const std::string&) { return std::nullopt; });
    ASSERT_EQ(report["files"].size(), 3u);
    EXPECT_EQ(report["files"][0]["seconds"], 5.0);
    EXPECT_EQ(report["files"][0]["state"], "closed");
    EXPECT_EQ(report["files"][0]["closed"], "2026-11-21T20:00:07.000Z");
    EXPECT_EQ(report["files"][0]["bytes"], nullptr);
    EXPECT_EQ(report["files"][1]["seconds"], nullptr);
    EXPECT_EQ(report["files"][2]["seconds"], 1.0);
}

TEST(SizeOnDiskTest, IsThatOfTheFileOrNothing) {
    const endtoend::TemporaryFolder folder;
    const std::string path = (folder.Path() / "a").string();
    std::ofstream(path) << "12345";
    EXPECT_EQ(SizeOnDisk(path), 5u);
    EXPECT_EQ(SizeOnDisk(path + "b"), std::nullopt);
}

}  // namespace
}  // namespace receiver
