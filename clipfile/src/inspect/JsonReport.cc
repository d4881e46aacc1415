#include "inspect/JsonReport.h"

#include "reader/BigEndian.h"

namespace clipfile {

namespace {

using Json = nlohmann::ordered_json;

Json ToJson(const TrackSummary& summary) {
    const Track& track = summary.track;
    Json json = {
        {"id", track.id},
        {"handler", FourCcText(track.handler)},
        {"entry", FourCcText(track.entry)},
        {"timescale", track.timescale},
        {"samples", summary.samples},
        {"chunks", summary.chunks},
        {"bytes", summary.bytes},
        {"sync_samples", summary.syncSamples},
        {"longest_group", summary.longestGroup},
        {"duration", summary.duration},
        {"seconds", summary.Seconds()},
    };
    if (summary.shown < summary.samples) {
        json["shown"] = summary.shown;
    }
    if (track.handler == FourCc("vide")) {
        json["width"] = track.width;
        json["height"] = track.height;
    }
    if (track.handler == FourCc("soun")) {
        json["channels"] = track.channels;
        json["sample_rate"] = track.sampleRate;
    }
    if (track.timecode) {
        json["timecode_rate"] = track.timecode->frameCount;
        json["drop_frame"] = track.timecode->IsDropFrame();
    }
    return json;
}

Json ToJson(const Profile& profile) {
    Json json = {{"format", profile.format}};
    if (profile.video) {
        const VideoProfile& video = *profile.video;
        json["video"] = {{"codec", FourCcText(video.codec)},
                         {"codec_information", video.codecInformation},
                         {"width", video.width},
                         {"height", video.height},
                         {"frame_rate", video.frameRate + video.frameRateFraction / 65536.0},
                         {"average_bitrate", video.averageBitrate},
                         {"maximum_bitrate", video.maximumBitrate}};
    }
    if (profile.audio) {
        const AudioProfile& audio = *profile.audio;
        json["audio"] = {{"codec", FourCcText(audio.codec)},
                         {"sampling_rate", audio.samplingRate},
                         {"channels", audio.channels},
                         {"average_bitrate", audio.averageBitrate},
                         {"maximum_bitrate", audio.maximumBitrate}};
    }
    return json;
}

Json ToJson(const std::optional<Timecode>& timecode) {
    return timecode ? Json(TimecodeText(*timecode)) : Json();
}

Json ToJson(const std::optional<MetadataUnit>& unit) {
    if (!unit) {
        return Json();
    }
    return {{"packets", unit->packets},
            {"record_flag", unit->recordFlag ? Json(*unit->recordFlag) : Json()},
            {"timecode", ToJson(unit->timecode)}};
}

}  // namespace

Json ToJson(const Inspection& inspection) {
    const Recording& recording = inspection.recording;
    Json json = {
        {"file", inspection.path},
        {"bytes", inspection.bytes},
        {"kind", recording.kind == FileKind::kNormal ? "normal" : "fragmented"},
        {"closed", recording.completion == Completion::kClosed},
        {"reason", recording.reason},
        {"fragments", recording.fragmentCount},
        {"start", ToJson(inspection.start)},
        {"end", ToJson(inspection.end)},
        {"metadata_distance", inspection.metadataDistance ? Json(*inspection.metadataDistance) : Json()},
        {"tracks", Json::array()},
        {"first_unit", ToJson(inspection.firstUnit)},
        {"last_unit", ToJson(inspection.lastUnit)},
        {"profile", ToJson(recording.profile)},
        {"fault", inspection.fault},
    };
    for (const TrackSummary& track : inspection.tracks) {
        json["tracks"].push_back(ToJson(track));
    }
    return json;
}

}  // namespace clipfile
