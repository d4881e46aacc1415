#pragma once

#include <filesystem>
#include <optional>
#include <string>
#include <vector>

#include "common/FrameRate.h"
#include "common/Timecode.h"
#include "support/CodedMedia.h"

namespace endtoend {

/// What was sent.
struct Sent {
    explicit Sent(const std::filesystem::path& material);

    std::filesystem::path file;
    CodedMedia media;
    /// Checksums of the decoded pictures.
    std::vector<std::string> pictures;
};

/// What a recording of it should be like.
struct Expected {
    receiver::FrameRate rate;
    bool fragmented = false;
    /// Of the first picture that was sent, and whether the recording counts by the drop-frame rule.
    receiver::Timecode timecode;
    /// It is that of the first picture that is recorded.
    bool timecodeOfRecording = false;
    /// KLV packets are compared too.
    bool klv = false;
    /// The audio is the source's own.
    bool audioUntouched = true;
    /// How far the times of units in the source's container are off, in seconds.
    double stampSlack = 0.0015;
};

/// Where a recording lies in what was sent: its first picture with its timecode, and how many there are.
struct Range {
    std::size_t first = 0;
    std::size_t count = 0;
    receiver::Timecode timecode;
};

/// Compares a recording with what was sent and asks ffprobe, MediaInfo and ffmpeg's decoder about it. Every
/// difference is a failure of the test.
Range CheckRecording(const std::filesystem::path& recording, const Sent& sent, const Expected& expected);

/// KLV packets that the metadata unit of one picture carries, without the recorder's own sets.
std::vector<Bytes> SourcePacketsOf(const Bytes& unit);

/// The name of a recording whose first picture has that timecode.
std::string FileNameOf(const receiver::Timecode& timecode);

}  // namespace endtoend
