#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "reader/MetadataUnit.h"
#include "reader/Recording.h"

namespace clipfile {

/// What a track holds, counted over the whole file.
struct TrackSummary {
    Track track;
    std::uint64_t samples = 0;
    /// Of these, the ones that are shown: others may need pictures behind the end of a record.
    std::uint64_t shown = 0;
    std::uint64_t bytes = 0;
    std::uint64_t syncSamples = 0;
    /// Chunks of `moov` and runs of fragments.
    std::uint64_t chunks = 0;
    /// Samples in the longest stretch from one sync sample to the next.
    std::uint64_t longestGroup = 0;
    /// In ticks of the track.
    std::uint64_t duration = 0;
    /// Where its first sample is shown, in seconds.
    double start = 0;
    std::optional<Sample> first;
    std::optional<Sample> last;
    /// All samples have the same duration.
    bool isEven = true;
    /// The tables name samples that are not in the file; they are not counted.
    bool lacksSamples = false;

    /// Of what is shown.
    double Seconds() const;
};

/// What is in a file, for people and programs.
struct Inspection {
    std::string path;
    std::uint64_t bytes = 0;
    Recording recording;
    std::vector<TrackSummary> tracks;
    /// First and last unit of metadata whose bytes are in the file.
    std::optional<MetadataUnit> firstUnit;
    std::optional<MetadataUnit> lastUnit;
    /// The timecode of the first picture: of the timecode sample, or where that is missing or says nothing,
    /// of the first unit of metadata.
    std::optional<Timecode> start;
    /// That of the last picture.
    std::optional<Timecode> end;
    /// Frames from the first picture to the first unit of metadata, by their timecodes.
    std::optional<std::int64_t> metadataDistance;
    /// Why the counting stopped before the end of the file, or empty.
    std::string fault;

    const TrackSummary* Find(std::uint32_t handler) const;
};

/// Reads headers and tables of a recording, and two units of metadata. Throws as `ReadRecording`.
Inspection Inspect(const InputFile& file);

}  // namespace clipfile
