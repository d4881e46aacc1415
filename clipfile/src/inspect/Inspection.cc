#include "inspect/Inspection.h"

#include <algorithm>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"
#include "reader/RecordingSamples.h"
#include "reader/TimecodeCount.h"

namespace clipfile {

namespace {

/// Longest unit of metadata that is read.
constexpr std::uint64_t kMaxUnit = 16 * 1024 * 1024;

void Count(const Sample& sample, TrackSummary& summary, std::uint64_t& group) {
    if (!summary.first) {
        summary.first = sample;
    }
    summary.isEven = summary.isEven && sample.duration == summary.first->duration;
    summary.last = sample;
    ++summary.samples;
    summary.bytes += sample.size;
    summary.syncSamples += sample.isSync ? 1 : 0;
    summary.chunks = sample.run + 1;
    summary.duration = sample.time + sample.duration;
    group = sample.isSync ? 1 : group + 1;
    summary.longestGroup = std::max(summary.longestGroup, group);
}

/// Whether all bytes of a sample are in the file.
bool IsThere(const InputFile& file, const Sample& sample) {
    return sample.offset <= file.Size() && sample.size <= file.Size() - sample.offset;
}

/// As many samples as last until the end of the edit, where that hides any: reordered ones that others need.
/// With kept rules the edits of a fragmented file, which all tracks have, end with `moov`.
std::uint64_t ShownByEdit(const Movie& movie, const TrackSummary& summary) {
    const Track* const audio = movie.Find(FourCc("soun"));
    const bool endsWithMoov = movie.isFragmented && audio != nullptr && audio->edit;
    if (!summary.track.tables.hasComposition || !summary.track.edit || !summary.first || endsWithMoov ||
        summary.first->duration == 0 || movie.timescale == 0) {
        return summary.samples;
    }
    return summary.track.edit->segmentDuration * summary.track.timescale / movie.timescale /
           summary.first->duration;
}

TrackSummary Summarize(const InputFile& file, const Recording& recording, std::size_t place,
                       std::string& fault) {
    TrackSummary summary;
    summary.track = recording.movie->tracks[place];
    if (summary.track.edit && summary.track.timescale != 0) {
        // The first sample of a recording is the one that is shown first.
        const std::int64_t first = summary.track.tables.firstOffset;
        summary.start = static_cast<double>(first - summary.track.edit->mediaTime) / summary.track.timescale;
    }
    try {
        RecordingSamples samples(file, recording, place);
        std::uint64_t group = 0;
        while (const auto sample = samples.Next()) {
            if (!IsThere(file, *sample)) {
                summary.lacksSamples = true;
                break;
            }
            Count(*sample, summary, group);
        }
    } catch (const FormatError& error) {
        fault = error.what();
    }
    summary.shown = std::min(summary.samples, ShownByEdit(*recording.movie, summary));
    return summary;
}

std::optional<MetadataUnit> ReadUnit(const InputFile& file, const std::optional<Sample>& sample) {
    if (!sample || sample->size > kMaxUnit) {
        return std::nullopt;
    }
    return ReadMetadataUnit(file.Read(sample->offset, sample->size));
}

/// The first unit of a file without tables: it stands in front of all else.
std::optional<MetadataUnit> ReadFirstUnit(const InputFile& file, const Recording& recording) {
    constexpr std::uint64_t kEnough = 64 * 1024;
    const std::uint64_t size = std::min(recording.dataEnd - recording.dataBegin, kEnough);
    const std::vector<unsigned char> bytes = file.Read(recording.dataBegin, static_cast<std::size_t>(size));
    std::size_t at = 0;
    while (const auto packet = ReadKlvPacket(Bytes(bytes).subspan(at))) {
        at += packet->size;
        if (IsRecorderBlock(*packet)) {
            break;
        }
    }
    if (at == 0) {
        return std::nullopt;
    }
    return ReadMetadataUnit(Bytes(bytes).first(at));
}

void ReadUnits(const InputFile& file, Inspection& inspection) {
    if (!inspection.recording.movie) {
        inspection.firstUnit = ReadFirstUnit(file, inspection.recording);
    } else if (const TrackSummary* const meta = inspection.Find(FourCc("meta"))) {
        inspection.firstUnit = ReadUnit(file, meta->first);
        inspection.lastUnit = ReadUnit(file, meta->last);
    }
}

void ReadTimecodes(const InputFile& file, Inspection& inspection) {
    const auto unitTimecode = inspection.firstUnit ? inspection.firstUnit->timecode : std::nullopt;
    inspection.start = unitTimecode;
    const TrackSummary* const track = inspection.Find(FourCc("tmcd"));
    if (track == nullptr || !track->track.timecode || track->track.timecode->frameCount == 0) {
        return;
    }
    const TimecodeEntry& entry = *track->track.timecode;
    if (track->first && track->first->size == 4) {
        const std::uint32_t number = ReadU32(file.Read(track->first->offset, 4).data());
        // Without a timecode in the stream, and in files that leave its place empty, it is 0.
        if (number != 0 || !unitTimecode) {
            inspection.start = TimecodeOf(number, entry.frameCount, entry.IsDropFrame());
        }
    }
    if (!inspection.start) {
        return;
    }
    const std::int64_t first = FrameNumberOf(*inspection.start, entry.frameCount);
    if (unitTimecode) {
        inspection.metadataDistance = FrameNumberOf(*unitTimecode, entry.frameCount) - first;
    }
    const TrackSummary* const video = inspection.Find(FourCc("vide"));
    if (video != nullptr && video->samples != 0) {
        inspection.end = TimecodeOf(first + static_cast<std::int64_t>(video->shown) - 1, entry.frameCount,
                                    inspection.start->dropFrame);
    }
}

}  // namespace

double TrackSummary::Seconds() const {
    const std::uint64_t hidden = first ? (samples - shown) * first->duration : 0;
    return track.timescale == 0 ? 0 : static_cast<double>(duration - hidden) / track.timescale;
}

const TrackSummary* Inspection::Find(std::uint32_t handler) const {
    const auto found = std::find_if(tracks.begin(), tracks.end(), [&](const TrackSummary& track) {
        return track.track.handler == handler;
    });
    return found == tracks.end() ? nullptr : &*found;
}

Inspection Inspect(const InputFile& file) {
    Inspection inspection;
    inspection.path = file.Path().string();
    inspection.bytes = file.Size();
    inspection.recording = ReadRecording(file);
    if (inspection.recording.movie) {
        for (std::size_t i = 0; i < inspection.recording.movie->tracks.size(); ++i) {
            inspection.tracks.push_back(Summarize(file, inspection.recording, i, inspection.fault));
        }
    }
    ReadUnits(file, inspection);
    ReadTimecodes(file, inspection);
    return inspection;
}

}  // namespace clipfile
