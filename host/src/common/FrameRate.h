#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace receiver {

/// One of the eight frame rates that the module records.
struct FrameRate {
    /// The module's name of the rate: frames per 1000 seconds, rounded as the trade writes it (29.97 is
    /// 29970).
    std::uint32_t key = 0;
    /// The exact rate: `numerator / denominator` frames a second (30000 / 1001).
    std::int64_t numerator = 0;
    std::int64_t denominator = 1;
    /// Frames counted in a second of timecode: 24, 25, 30, 50 or 60.
    std::uint32_t timecodeFrames = 0;
    /// 29.97 and 59.94 count by the drop-frame rule (SMPTE ST 12-1) unless told otherwise.
    bool dropFrame = false;

    friend bool operator==(const FrameRate&, const FrameRate&) = default;
};

/// The rate that an operator writes: "23.98", "23.976", "24", "25", "29.97", "30", "50", "59.94", "60", with
/// or without zeros behind the point. Nothing for any other text.
std::optional<FrameRate> ParseFrameRate(std::string_view text);

/// The rate of the table that stands within 0.006 frames a second of `numerator / denominator`. Nothing when
/// there is none or a number is not positive.
std::optional<FrameRate> NearestFrameRate(std::int64_t numerator, std::int64_t denominator);

}  // namespace receiver
