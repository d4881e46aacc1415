#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "display/FileReport.h"
#include "operator/RecordPlan.h"

namespace receiver {

/// What a run leaves, as far as it tells whether everything is there that was to be recorded.
struct RunRecord {
    /// The operator ended the run: what had not begun by then was not to be recorded any more.
    bool endedByOperator = false;
    /// Frames that came, from the first IDR frame of the source on, and those that belong to recordings.
    bool anyFrame = false;
    /// Pictures in front of it: the source was there, and nothing could begin with them.
    bool earlyPictures = false;
    /// The pictures are converted.
    bool transcode = false;
    std::uint64_t recordedFrames = 0;
    /// Everything from the first IDR frame on was to be recorded, without a command.
    bool everything = false;
    /// Length of the stream in ticks of 90000 a second.
    std::int64_t length = 0;
    /// The first range that the stream did not come to.
    std::optional<RecordRange> unreached;
    /// Audio frames that are silence because those of the source were missing.
    std::uint64_t silentFrames = 0;
    /// The files, read back.
    std::vector<RecordedFile> files;
};

/// What is missing from the files of a run that did not fail, and has not been told while it went on: a
/// sentence each, without a full stop.
std::vector<std::string> ShortfallsOf(const RunRecord& run);

/// The sentence about a recording of which there is nothing.
std::string Describe(const MissedRecording& missed);

}  // namespace receiver
