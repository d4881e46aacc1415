#pragma once

#include "display/DisplayInterface.h"

namespace receiver {

/// A receiver in the middle of a recording.
inline Snapshot RecordingSnapshot() {
    Snapshot snapshot;
    snapshot.timecode = Timecode{10, 20, 30, 12, true};
    snapshot.seconds = 12.5;
    snapshot.recording = true;
    snapshot.framesPerSecond = 59.94;
    snapshot.videoKilobits = 8123.4;
    snapshot.audioKilobits = 192.2;
    snapshot.klvPackets = 7;
    snapshot.status = {4, 0};
    snapshot.file = "/srv/rec/20261121/CAM1/10_20_18_00.MP4";
    snapshot.freeBytes = 123456789012;
    snapshot.syncTime = std::chrono::milliseconds(12);
    return snapshot;
}

inline RecordedFile ClosedFile() {
    return {"/srv/rec/20261121/CAM1/10_20_18_00.MP4", 12345678, "10:20:18;00", 7.04, 176, ""};
}

}  // namespace receiver
