#include "inspect/TextReport.h"

#include <array>
#include <cmath>
#include <cstdio>
#include <string>

#include "reader/BigEndian.h"

namespace clipfile {

namespace {

template <typename... Arguments>
std::string Format(const char* format, Arguments... arguments) {
    std::array<char, 256> text = {};
    std::snprintf(text.data(), text.size(), format, arguments...);
    return text.data();
}

/// "12.3 MB", in units of 1000.
std::string SizeText(std::uint64_t bytes) {
    static constexpr const char* kUnits[] = {"bytes", "kB", "MB", "GB", "TB"};
    auto value = static_cast<double>(bytes);
    std::size_t unit = 0;
    while (value >= 999.95 && unit + 1 < std::size(kUnits)) {
        value /= 1000;
        ++unit;
    }
    return unit == 0 ? Format("%llu bytes", static_cast<unsigned long long>(bytes))
                     : Format("%.1f %s", value, kUnits[unit]);
}

std::string DurationText(double seconds) {
    const auto milliseconds = static_cast<unsigned long long>(std::llround(seconds * 1000));
    return Format("%02llu:%02llu:%02llu.%03llu", milliseconds / 3600000, milliseconds / 60000 % 60,
                  milliseconds / 1000 % 60, milliseconds % 1000);
}

std::string RateText(const VideoProfile& video) {
    return Format("%.2f", video.frameRate + video.frameRateFraction / 65536.0);
}

/// Bits per second of a track, in kbit.
std::string BitrateText(const TrackSummary& track) {
    const double seconds = track.Seconds();
    return seconds == 0 ? "" : Format(", %.0f kbit/s", static_cast<double>(track.bytes) * 8 / 1000 / seconds);
}

/// Profile and level as they are named (ISO/IEC 14496-10 Annex A).
std::string AvcText(std::uint32_t head) {
    const auto profile = static_cast<unsigned>(head >> 16 & 0xFF);
    const auto level = static_cast<unsigned>(head & 0xFF);
    const char* name = nullptr;
    switch (profile) {
        case 66:
            name = "Baseline";
            break;
        case 77:
            name = "Main";
            break;
        case 100:
            name = "High";
            break;
        case 110:
            name = "High 10";
            break;
        case 122:
            name = "High 4:2:2";
            break;
        default:
            break;
    }
    const std::string text = name != nullptr ? name : Format("profile %u", profile);
    return text + Format(" level %u.%u", level / 10, level % 10);
}

std::string VideoText(const TrackSummary& video, const Inspection& inspection) {
    std::string text = Format("%ux%u", video.track.width, video.track.height);
    if (video.track.avc) {
        text += ", " + AvcText(video.track.avc->head);
    }
    if (inspection.recording.profile.video) {
        text += ", " + RateText(*inspection.recording.profile.video) + " frames/s";
    }
    if (video.shown < video.samples) {
        text += Format(", %llu pictures shown", static_cast<unsigned long long>(video.shown));
    }
    return text + Format(", %llu pictures in %llu chunks, %llu of them IDR, at most %llu apart",
                         static_cast<unsigned long long>(video.samples),
                         static_cast<unsigned long long>(video.chunks),
                         static_cast<unsigned long long>(video.syncSamples),
                         static_cast<unsigned long long>(video.longestGroup));
}

std::string TrackText(const TrackSummary& track, const Inspection& inspection) {
    switch (track.track.handler) {
        case FourCc("vide"):
            return VideoText(track, inspection) + BitrateText(track);
        case FourCc("soun"):
            return Format("%u Hz, %u channels, %llu frames", track.track.sampleRate, track.track.channels,
                          static_cast<unsigned long long>(track.samples)) +
                   BitrateText(track);
        case FourCc("tmcd"):
            return track.track.timecode ? Format("%u frames a second%s", track.track.timecode->frameCount,
                                                 track.track.timecode->IsDropFrame() ? ", drop frame" : "")
                                        : std::string("no entry");
        default:
            return Format("%llu units", static_cast<unsigned long long>(track.samples)) + BitrateText(track);
    }
}

const char* TrackName(std::uint32_t handler) {
    switch (handler) {
        case FourCc("vide"):
            return "video";
        case FourCc("soun"):
            return "audio";
        case FourCc("tmcd"):
            return "timecode";
        case FourCc("meta"):
            return "metadata";
        default:
            return "track";
    }
}

void Line(std::ostream& out, const std::string& name, const std::string& text) {
    out << "  " << name << std::string(name.size() < 10 ? 10 - name.size() : 1, ' ') << text << '\n';
}

std::string UnitText(const MetadataUnit& unit) {
    std::string text = unit.recordFlag ? (*unit.recordFlag ? "record on" : "record off") : "no record flag";
    text += unit.timecode ? ", " + TimecodeText(*unit.timecode) : ", no timecode";
    return text + Format(", %zu packets", unit.packets);
}

void PrintProfile(std::ostream& out, const Profile& profile) {
    std::string text = Format("%08X", profile.format);
    if (profile.video) {
        text += ", " + FourCcText(profile.video->codec) +
                Format(" %ux%u, ", profile.video->width, profile.video->height) + RateText(*profile.video) +
                Format(" frames/s, bit rate %u", profile.video->averageBitrate);
        if (profile.video->codecInformation != 0) {
            text += ", " + AvcText(profile.video->codecInformation);
        }
    }
    if (profile.audio) {
        text += ", " + FourCcText(profile.audio->codec) +
                Format(" %u Hz %u channels %u kbit/s", profile.audio->samplingRate, profile.audio->channels,
                       profile.audio->averageBitrate);
    }
    Line(out, "profile", text);
}

void PrintStart(std::ostream& out, const Inspection& inspection) {
    const TrackSummary* const video = inspection.Find(FourCc("vide"));
    const TrackSummary* const audio = inspection.Find(FourCc("soun"));
    std::string text;
    if (video != nullptr && audio != nullptr && audio->samples != 0) {
        text = Format("audio %+.1f ms", (audio->start - video->start) * 1000);
    }
    if (inspection.metadataDistance) {
        text += (text.empty() ? "" : ", ") +
                Format("metadata %+lld frames", static_cast<long long>(*inspection.metadataDistance));
    }
    if (!text.empty()) {
        Line(out, "start", text + " from the first picture");
    }
}

}  // namespace

void PrintText(std::ostream& out, const Inspection& inspection) {
    const Recording& recording = inspection.recording;
    out << inspection.path << ": " << (recording.kind == FileKind::kNormal ? "normal" : "fragmented") << ", "
        << (recording.completion == Completion::kClosed ? "closed" : "unfinished") << ", "
        << SizeText(inspection.bytes);
    if (const TrackSummary* const video = inspection.Find(FourCc("vide"))) {
        out << ", " << DurationText(video->Seconds());
    }
    if (inspection.start) {
        out << ", " << TimecodeText(*inspection.start);
        if (inspection.end) {
            out << " to " << TimecodeText(*inspection.end);
        }
    }
    out << '\n';
    if (!recording.reason.empty()) {
        Line(out, "", recording.reason);
    }
    for (const TrackSummary& track : inspection.tracks) {
        Line(out, TrackName(track.track.handler),
             FourCcText(track.track.entry) + ", " + TrackText(track, inspection));
    }
    if (recording.kind == FileKind::kFragmented) {
        Line(out, "fragments", Format("%llu", static_cast<unsigned long long>(recording.fragmentCount)));
    }
    if (!recording.movie) {
        Line(out, "samples",
             SizeText(recording.dataEnd - recording.dataBegin) + " from " +
                 std::to_string(recording.dataBegin) + " on");
    }
    PrintStart(out, inspection);
    if (inspection.firstUnit) {
        Line(out, "first", UnitText(*inspection.firstUnit));
    }
    if (inspection.lastUnit) {
        Line(out, "last", UnitText(*inspection.lastUnit));
    }
    PrintProfile(out, recording.profile);
    if (!inspection.fault.empty()) {
        Line(out, "fault", inspection.fault);
    }
}

}  // namespace clipfile
