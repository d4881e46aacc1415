#pragma once

#include <cstdint>

#include "reader/MetadataUnit.h"

namespace clipfile {

/// Number of the frame with a timecode, counted from 00:00:00:00 at `rate` frames a timecode second. With
/// drop frame, numbers that the rule leaves out are not counted: at 30, two of each minute but every tenth,
/// at 60 four (SMPTE ST 12-1 5.2.2).
std::int64_t FrameNumberOf(const Timecode& timecode, std::uint32_t rate);

/// The timecode of a frame number, which wraps at 24 hours. `rate` is not 0.
Timecode TimecodeOf(std::int64_t frameNumber, std::uint32_t rate, bool dropFrame);

}  // namespace clipfile
