#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

#include "common/FrameRate.h"

namespace receiver {

/// A time address of one frame (SMPTE ST 12-1), in plain numbers.
struct Timecode {
    std::uint8_t hours = 0;
    std::uint8_t minutes = 0;
    std::uint8_t seconds = 0;
    std::uint8_t frames = 0;
    bool dropFrame = false;

    friend bool operator==(const Timecode&, const Timecode&) = default;
};

/// The frame number of an address since 00:00:00:00: with drop frame, two numbers (four at 60) are left out
/// in each minute but every tenth (SMPTE ST 12-1). `timecodeFrames` is the count in a second, 24 to 60.
std::int64_t FrameNumberOf(const Timecode& timecode, std::uint32_t timecodeFrames);

/// The inverse. Numbers wrap at 24 hours; negative ones count back from midnight.
Timecode TimecodeOf(std::int64_t frameNumber, std::uint32_t timecodeFrames, bool dropFrame);

/// False for fields out of range and for an address that the drop-frame rule leaves out.
bool IsValid(const Timecode& timecode, std::uint32_t timecodeFrames);

/// "10:20:30:12", with ';' before the frames of a drop-frame address.
std::string ToString(const Timecode& timecode);

/// Reads HH:MM:SS:FF, with ':' or ';' before the frames: ';' is drop frame. Nothing when the text has another
/// form.
std::optional<Timecode> ParseTimecode(std::string_view text);

}  // namespace receiver
