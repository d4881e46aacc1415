#pragma once

#include <cstdint>

namespace clipfileModule {

/// Bytes of a timecode sample, which holds one frame number.
inline constexpr std::uint32_t kTimecodeSize = 4;

/// The number of frames from 00:00:00:00 to a timecode of four bytes, hours, minutes, seconds, frames, which
/// is the value of a timecode sample. `numFrames` is the nominal rate in frames a second. With `dropFrame`
/// the numbers that drop-frame counting leaves out are not counted: at 30, two of each minute but every
/// tenth, at 60 four (SMPTE ST 12-1).
std::uint32_t FrameNumber(const unsigned char* timecode, std::uint32_t numFrames, bool dropFrame);

}  // namespace clipfileModule
