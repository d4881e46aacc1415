#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "reader/InputFile.h"

namespace clipfile {

/// A packet of timed metadata (SMPTE ST 336).
struct KlvPacket {
    Bytes label;
    Bytes value;
    /// Bytes of all of it.
    std::size_t size = 0;
};

/// The packet at the front of `bytes`: 01, label, length, value. Nothing when there is none, or when it runs
/// past the end.
std::optional<KlvPacket> ReadKlvPacket(Bytes bytes);

/// A time address (SMPTE ST 12-1).
struct Timecode {
    std::uint8_t hours = 0;
    std::uint8_t minutes = 0;
    std::uint8_t seconds = 0;
    std::uint8_t frames = 0;
    bool dropFrame = false;

    bool operator==(const Timecode&) const = default;
};

/// "10:20:30:12", with ";" in front of the frames for drop frame.
std::string TimecodeText(const Timecode& timecode);

/// What a unit of metadata tells.
struct MetadataUnit {
    std::size_t packets = 0;
    std::optional<bool> recordFlag;
    std::optional<Timecode> timecode;
    /// Bytes up to the end of the recorder's own block, which ends every sample; 0 without one.
    std::size_t blockEnd = 0;
};

/// Reads packet by packet. Any bytes are accepted; reading ends where no packet begins.
MetadataUnit ReadMetadataUnit(Bytes bytes);

/// Whether `packet` is the block that the recorder adds to each unit.
bool IsRecorderBlock(const KlvPacket& packet);

}  // namespace clipfile
