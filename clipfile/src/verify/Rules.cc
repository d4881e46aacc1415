#include "verify/Rules.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <cstdlib>

#include "reader/BigEndian.h"
#include "reader/FormatError.h"
#include "reader/Fragment.h"
#include "reader/TimecodeCount.h"

namespace clipfile {

namespace {

constexpr std::uint32_t kAudioRate = 48000;
constexpr std::uint32_t kAudioFrame = 1024;

template <typename... Arguments>
std::string Format(const char* format, Arguments... arguments) {
    std::array<char, 256> text = {};
    std::snprintf(text.data(), text.size(), format, arguments...);
    return text.data();
}

unsigned long long Wide(std::uint64_t value) {
    return value;
}

struct ExpectedTrack {
    std::uint32_t handler;
    std::uint32_t entry;
};
constexpr ExpectedTrack kTracks[] = {{FourCc("vide"), FourCc("avc1")},
                                     {FourCc("soun"), FourCc("mp4a")},
                                     {FourCc("tmcd"), FourCc("tmcd")},
                                     {FourCc("meta"), FourCc("rtmd")}};

bool CheckTrackList(const Inspection& inspection, Defects& defects) {
    if (inspection.tracks.size() != std::size(kTracks)) {
        defects.Add(Format("It has %zu tracks instead of 4.", inspection.tracks.size()));
        return false;
    }
    bool isRight = true;
    for (std::size_t i = 0; i < std::size(kTracks); ++i) {
        const Track& track = inspection.tracks[i].track;
        if (track.handler != kTracks[i].handler || track.entry != kTracks[i].entry || track.id != i + 1) {
            defects.Add(Format("Track %zu is number %u, '%s' with '%s', instead of '%s' with '%s'.", i + 1,
                               track.id, FourCcText(track.handler).c_str(), FourCcText(track.entry).c_str(),
                               FourCcText(kTracks[i].handler).c_str(), FourCcText(kTracks[i].entry).c_str()));
            isRight = false;
        }
    }
    return isRight;
}

void CheckProfile(const Inspection& inspection, Defects& defects) {
    const Track& video = inspection.tracks[0].track;
    const auto& profile = inspection.recording.profile.video;
    if (!profile || !inspection.recording.profile.audio) {
        defects.Add("Its profile lacks video or audio.");
        return;
    }
    if (profile->width != video.width || profile->height != video.height) {
        defects.Add(Format("Its profile says %ux%u and its video track %ux%u.", profile->width,
                           profile->height, video.width, video.height));
    }
    if (!video.avc || video.avc->sps.empty() || video.avc->pps.empty()) {
        defects.Add("Its video track has no parameter sets.");
    } else if (video.avc->head != profile->codecInformation) {
        defects.Add(Format("Its profile says codec %08X and its video track %08X.", profile->codecInformation,
                           video.avc->head));
    }
}

void CheckDurations(const Inspection& inspection, Defects& defects) {
    const TrackSummary& video = inspection.tracks[0];
    for (const TrackSummary& track : inspection.tracks) {
        if (!track.isEven) {
            defects.Add(Format("The samples of track %u last differently long.", track.track.id));
        }
    }
    const auto& timecode = inspection.tracks[2].track.timecode;
    if (timecode && video.first && video.first->duration != timecode->frameDuration) {
        defects.Add(Format("A picture lasts %u ticks and a frame of the timecode %u.", video.first->duration,
                           timecode->frameDuration));
    }
    const TrackSummary& audio = inspection.tracks[1];
    if (audio.first && (audio.first->duration != kAudioFrame || audio.track.timescale != kAudioRate)) {
        defects.Add(Format("An audio frame lasts %u ticks of %u a second instead of 1024 of 48000.",
                           audio.first->duration, audio.track.timescale));
    }
}

/// Metadata comes with every picture, and audio ends within half a frame of the pictures.
void CheckCounts(const Inspection& inspection, Defects& defects) {
    const TrackSummary& video = inspection.tracks[0];
    const TrackSummary& audio = inspection.tracks[1];
    const TrackSummary& meta = inspection.tracks[3];
    if (video.samples == 0) {
        defects.Add("It has no picture.");
    }
    if (meta.samples != video.shown) {
        defects.Add(Format("It has %llu pictures and %llu units of metadata.", Wide(video.shown),
                           Wide(meta.samples)));
    }
    const double behind = audio.Seconds() - video.Seconds();
    constexpr double kTolerance = (kAudioFrame / 2 + 1.0) / kAudioRate;
    if (behind > kTolerance || behind < -kTolerance) {
        defects.Add(Format("Audio ends %.1f ms %s the pictures.", std::abs(behind) * 1000,
                           behind > 0 ? "after" : "before"));
    }
}

/// The bytes of all `mdat` boxes.
std::uint64_t DataSize(const InputFile& file) {
    std::uint64_t size = 0;
    BoxCursor cursor(file, 0, file.Size());
    while (const auto box = cursor.Next()) {
        size += box->type == FourCc("mdat") ? box->PayloadSize() : 0;
    }
    return size;
}

/// In ticks of the movie.
std::uint64_t LongestTrack(const Inspection& inspection) {
    std::uint64_t longest = 0;
    for (const TrackSummary& track : inspection.tracks) {
        if (track.track.timescale != 0) {
            longest = std::max(
                longest, track.duration * inspection.recording.movie->timescale / track.track.timescale);
        }
    }
    return longest;
}

std::string NameOf(const Timecode& timecode) {
    return Format("%02u_%02u_%02u_%02u", timecode.hours, timecode.minutes, timecode.seconds, timecode.frames);
}

}  // namespace

void CheckStructure(const InputFile&, const Inspection& inspection, Defects& defects) {
    if (inspection.recording.completion != Completion::kClosed) {
        defects.Add("It is not closed. " + inspection.recording.reason);
    }
    if (!inspection.fault.empty()) {
        defects.Add(inspection.fault);
    }
}

void CheckTracks(const Inspection& inspection, Defects& defects) {
    if (CheckTrackList(inspection, defects)) {
        CheckProfile(inspection, defects);
        CheckDurations(inspection, defects);
        CheckCounts(inspection, defects);
    }
}

void CheckData(const InputFile& file, const Inspection& inspection, Defects& defects) {
    std::uint64_t bytes = 0;
    for (const TrackSummary& track : inspection.tracks) {
        bytes += track.bytes;
        if (track.lacksSamples) {
            defects.Add(
                Format("The tables of track %u name bytes beyond the end of the file.", track.track.id));
        }
        if (track.first && track.first->offset < inspection.recording.dataBegin) {
            defects.Add(Format("The first sample of track %u stands in front of the data.", track.track.id));
        }
    }
    const std::uint64_t data = DataSize(file);
    if (bytes != data) {
        defects.Add(Format("Its samples have %llu bytes and its data %llu.", Wide(bytes), Wide(data)));
    }
}

void CheckTimecode(const std::filesystem::path& path, const Inspection& inspection, Defects& defects) {
    // A stream without timecode gives its files the time of day as their names.
    if (!inspection.start || !inspection.firstUnit || !inspection.firstUnit->timecode) {
        return;
    }
    const std::string stem = path.stem().string();
    const std::string name = NameOf(*inspection.start);
    if (!stem.starts_with(name)) {
        defects.Add("Its timecode is " + TimecodeText(*inspection.start) + ".");
    }
    const auto& entry = inspection.tracks.size() > 2 ? inspection.tracks[2].track.timecode : std::nullopt;
    if (!entry || entry->frameCount == 0) {
        return;
    }
    if (inspection.metadataDistance.value_or(0) != 0) {
        defects.Add(Format("Its metadata begins %lld frames from its first picture.",
                           static_cast<long long>(*inspection.metadataDistance)));
    }
    const TrackSummary* const meta = inspection.Find(FourCc("meta"));
    if (inspection.lastUnit && inspection.lastUnit->timecode && meta != nullptr) {
        const std::int64_t expected = FrameNumberOf(*inspection.firstUnit->timecode, entry->frameCount) +
                                      static_cast<std::int64_t>(meta->samples) - 1;
        const Timecode last =
            TimecodeOf(expected, entry->frameCount, inspection.lastUnit->timecode->dropFrame);
        if (last != *inspection.lastUnit->timecode) {
            defects.Add("The timecode of its last picture is " +
                        TimecodeText(*inspection.lastUnit->timecode) + ", and by count it would be " +
                        TimecodeText(last) + ".");
        }
    }
}

void CheckIndex(const InputFile& file, const Inspection& inspection, Defects& defects) {
    const Recording& recording = inspection.recording;
    if (recording.kind != FileKind::kFragmented) {
        return;
    }
    std::uint32_t number = 0;
    int told = 0;
    FragmentCursor cursor(file, recording);
    try {
        while (const auto moof = cursor.Next()) {
            const std::uint32_t sequence = ReadFragment(file, *moof, *recording.movie).sequenceNumber;
            if (sequence != ++number && told++ < kMaxOfAKind) {
                defects.Add(Format("The fragment at %llu has number %u instead of %u.", Wide(moof->offset),
                                   sequence, number));
            }
        }
    } catch (const FormatError&) {
        return;  // told already, where samples were counted
    }
    const std::uint64_t longest = LongestTrack(inspection);
    if (recording.movie->fragmentDuration && *recording.movie->fragmentDuration != longest) {
        defects.Add(Format("'mehd' says %llu ticks and the longest track has %llu.",
                           Wide(*recording.movie->fragmentDuration), Wide(longest)));
    }
    if (recording.fragmentIndex && recording.fragmentIndex->PayloadSize() >= 16) {
        const Box& mfra = *recording.fragmentIndex;
        const std::uint32_t size = ReadU32(file.Read(mfra.end - 4, 4).data());
        if (size != mfra.size) {
            defects.Add(Format("'mfro' says %u bytes and 'mfra' has %llu.", size, Wide(mfra.size)));
        }
    }
}

}  // namespace clipfile
