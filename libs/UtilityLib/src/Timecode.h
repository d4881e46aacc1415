#pragma once

#include <cstdint>

namespace nal_access {

/// A time address (SMPTE ST 12-1) as plain numbers.
struct Timecode {
    std::uint8_t hours = 0;
    std::uint8_t minutes = 0;
    std::uint8_t seconds = 0;
    std::uint8_t frames = 0;
    bool dropFrame = false;
};

/// Rates whose frame numbers a byte holds.
constexpr unsigned int kMaxTimecodeRate = 256;

/// False for hours above 23, minutes or seconds above 59, and, when `rate`, the nominal number of frames a
/// second, is not 0, for frames not below it. Rates above `kMaxTimecodeRate` know no valid address.
bool IsValid(const Timecode& timecode, unsigned int rate);

/// The address `offset` frames later, or earlier, at the nominal rate `rate` of 1 to `kMaxTimecodeRate`; it
/// wraps at 24 hours. At 30 and 60 with the drop-frame flag, each minute but every tenth begins with frame
/// number 2 or 4 (SMPTE ST 12-1 5.2.2); an address that the rule leaves out stands for the first of its
/// minute. At other rates the flag means nothing.
Timecode AddFrames(const Timecode& timecode, unsigned int rate, std::int64_t offset);

}  // namespace nal_access
