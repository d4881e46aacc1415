#pragma once

#include <array>
#include <cstdint>
#include <optional>

#include "reader/Box.h"

namespace clipfile {

/// The `FPRF` words of the two kinds of file.
inline constexpr std::uint32_t kNormalProfile = 0x20000000;
inline constexpr std::uint32_t kFragmentedProfile = 0x30000000;

struct AudioProfile {
    std::uint32_t trackId = 0;
    std::uint32_t codec = 0;
    /// kbit/s.
    std::uint32_t averageBitrate = 0;
    std::uint32_t maximumBitrate = 0;
    std::uint32_t samplingRate = 0;
    std::uint32_t channels = 0;
};

struct VideoProfile {
    std::uint32_t trackId = 0;
    std::uint32_t codec = 0;
    /// Version, profile, compatibility and level of `avcC`; 0 where the recorder had no parameter sets.
    std::uint32_t codecInformation = 0;
    /// In the unit of the host that recorded.
    std::uint32_t averageBitrate = 0;
    std::uint32_t maximumBitrate = 0;
    /// Frames per second: integer part, and fraction in 1/65536.
    std::uint16_t frameRate = 0;
    std::uint16_t frameRateFraction = 0;
    /// Pixels.
    std::uint16_t width = 0;
    std::uint16_t height = 0;
};

/// The recorder's profile box, which stands in front of everything that a recording holds.
struct Profile {
    std::uint32_t format = 0;
    std::optional<AudioProfile> audio;
    std::optional<VideoProfile> video;
};

/// The profile in a `uuid` box, or nothing when it is of another kind. Throws `FormatError` for one that is
/// cut.
std::optional<Profile> ReadProfile(const InputFile& file, const Box& uuid);

}  // namespace clipfile
