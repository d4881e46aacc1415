#pragma once

#include <cstdint>
#include <optional>
#include <vector>

#include "reader/ElementaryStream.h"
#include "reader/Samples.h"

namespace clipfile {

/// What a fragment falls back on where it says nothing itself (8.8.3).
struct SampleDefaults {
    std::uint32_t duration = 0;
    std::uint32_t size = 0;
    std::uint32_t flags = 0;
};

/// The decoder configuration of H.264 (ISO/IEC 14496-15 5.3.3.1).
struct AvcConfiguration {
    /// Version, profile, compatibility, level.
    std::uint32_t head = 0;
    /// Bytes of the length in front of each NAL unit.
    std::uint32_t lengthSize = 4;
    std::vector<std::vector<unsigned char>> sps;
    std::vector<std::vector<unsigned char>> pps;
};

/// The sample entry of a timecode track.
struct TimecodeEntry {
    std::uint32_t flags = 0;
    std::uint32_t timescale = 0;
    std::uint32_t frameDuration = 0;
    /// Frames of a timecode second.
    std::uint32_t frameCount = 0;

    bool IsDropFrame() const { return (flags & 1) != 0; }
};

struct Edit {
    /// In ticks of the movie.
    std::uint64_t segmentDuration = 0;
    /// In ticks of the track; -1 for an empty edit.
    std::int64_t mediaTime = 0;
};

struct Track {
    std::uint32_t id = 0;
    std::uint32_t handler = 0;
    /// Ticks per second.
    std::uint32_t timescale = 0;
    /// Of `mdhd`, in ticks.
    std::uint64_t duration = 0;
    /// Type of the first sample entry, 0 without one.
    std::uint32_t entry = 0;
    std::optional<AvcConfiguration> avc;
    /// Pixels; of a video entry.
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    /// Of an audio entry.
    std::uint32_t channels = 0;
    std::uint32_t sampleRate = 0;
    std::optional<ElementaryStream> elementaryStream;
    std::optional<TimecodeEntry> timecode;
    /// The first of its edit list.
    std::optional<Edit> edit;
    SampleTables tables;
    SampleDefaults defaults;
};

/// What `moov` tells.
struct Movie {
    /// Seconds since 1904.
    std::uint64_t creationTime = 0;
    std::uint32_t timescale = 0;
    /// In ticks of the movie.
    std::uint64_t duration = 0;
    std::vector<Track> tracks;
    /// There may be fragments behind it (`mvex`).
    bool isFragmented = false;
    /// Length with all fragments (`mehd`).
    std::optional<std::uint64_t> fragmentDuration;

    /// The first track with this handler, or null.
    const Track* Find(std::uint32_t handler) const;
};

/// Reads a whole `moov`. Throws `FormatError` where a box that it needs is missing or broken.
Movie ReadMovie(const InputFile& file, const Box& moov);

}  // namespace clipfile
