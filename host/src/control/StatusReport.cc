#include "control/StatusReport.h"

#include <algorithm>
#include <filesystem>
#include <nlohmann/json.hpp>

#include "display/JsonDisplay.h"
#include "display/StatusWords.h"

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;

/// The module stops when less is left (`kMinFreeBytes` of the output folder).
constexpr std::uint64_t kReservedBytes = 157286400;

template <typename T>
Json OrNull(const std::optional<T>& value) {
    return value ? Json(*value) : Json(nullptr);
}

Json AddressOrNull(const std::optional<Timecode>& address) {
    return address ? Json(ToString(*address)) : Json(nullptr);
}

/// Hours until the disk is full at the present rate.
Json HoursLeft(const Snapshot& snapshot) {
    const double bytesPerHour = (snapshot.videoKilobits + snapshot.audioKilobits) * 1000 / 8 * 3600;
    if (!snapshot.freeBytes || bytesPerHour <= 0) {
        return nullptr;
    }
    const std::uint64_t usable = *snapshot.freeBytes - std::min(*snapshot.freeBytes, kReservedBytes);
    return static_cast<double>(usable) / bytesPerHour;
}

Json LengthOf(const RunFile& file, const std::optional<Timecode>& present) {
    // What was closed without an end has been cut off by a fault.
    const std::optional<Timecode> end = file.end || file.closed ? file.end : present;
    if (!file.start || !end || file.frameRate.numerator == 0) {
        return nullptr;
    }
    return SecondsBetween(*file.start, *end, file.frameRate);
}

Json ReportOf(const RunFile& file, const std::optional<Timecode>& present, const FileSizer& sizer) {
    return {{"path", file.path},
            {"state", file.closed ? "closed" : "open"},
            {"timecode", AddressOrNull(file.start)},
            {"opened", IsoTime(file.opened)},
            {"closed", file.closed ? Json(IsoTime(*file.closed)) : Json(nullptr)},
            {"seconds", LengthOf(file, present)},
            {"bytes", OrNull(sizer(file.path))}};
}

Json SourceReport(const RunState::View& view) {
    if (!view.source) {
        return nullptr;
    }
    const SourceEvents& source = view.snapshot.source;
    return {{"summary", view.source->summary},
            {"width", view.source->width},
            {"height", view.source->height},
            {"frame_rate", static_cast<double>(view.source->frameRate.key) / 1000},
            {"away", source.away},
            {"reconnections", source.reconnections},
            {"changes", source.changes},
            {"silent_frames", source.silentFrames},
            {"early_pictures", source.earlyPictures},
            {"frames_per_second", view.snapshot.framesPerSecond},
            {"video_kilobits", view.snapshot.videoKilobits},
            {"audio_kilobits", view.snapshot.audioKilobits},
            {"klv_packets", view.snapshot.klvPackets}};
}

Json LossReport(const Snapshot& snapshot) {
    const Losses& losses = snapshot.losses;
    return {{"total", snapshot.lost},          {"pictures", losses.pictures},
            {"packets", losses.packets},       {"video_units", losses.video},
            {"audio_units", losses.audio},     {"metadata_units", losses.metadata},
            {"klv_packets", losses.klvPackets}};
}

}  // namespace

std::optional<std::uint64_t> SizeOnDisk(const std::string& path) {
    std::error_code error;
    const std::uintmax_t size = std::filesystem::file_size(path, error);
    return error ? std::nullopt : std::optional<std::uint64_t>(size);
}

const char* NameOf(RunPhase phase) {
    switch (phase) {
        case RunPhase::kWaitingForSource:
            return "waiting_for_source";
        case RunPhase::kIdle:
            return "idle";
        case RunPhase::kWaitingForIdr:
            return "waiting_for_idr";
        case RunPhase::kRecording:
            return "recording";
        case RunPhase::kSourceLost:
            return "source_lost";
        case RunPhase::kFailed:
            return "failed";
        case RunPhase::kEnded:
            return "ended";
    }
    return "";
}

Json StatusReport(const RunState::View& view, const FileSizer& sizer) {
    const Snapshot& snapshot = view.snapshot;
    return {{"state", NameOf(view.phase)},
            {"since", IsoTime(view.since)},
            {"started", IsoTime(view.started)},
            {"timecode", AddressOrNull(snapshot.timecode)},
            {"seconds", snapshot.seconds},
            {"source", SourceReport(view)},
            {"file", view.openFile ? ReportOf(*view.openFile, snapshot.timecode, sizer) : Json(nullptr)},
            {"files", view.files},
            {"recordings", view.recordings},
            {"buffered_pictures", snapshot.heldPictures},
            {"losses", LossReport(snapshot)},
            {"disk", {{"free_bytes", OrNull(snapshot.freeBytes)}, {"hours", HoursLeft(snapshot)}}},
            {"module",
             {{"status", snapshot.status.status},
              {"cause", snapshot.status.cause},
              {"words", StatusWords(snapshot.status)},
              {"faults", view.faults}}},
            {"hooks", {{"delivered", snapshot.hooksTold}, {"failed", snapshot.hooksFailed}}}};
}

Json FilesReport(const std::vector<RunFile>& files, const std::optional<Timecode>& present,
                 const FileSizer& sizer) {
    Json list = Json::array();
    for (const RunFile& file : files) {
        list.push_back(ReportOf(file, present, sizer));
    }
    return {{"files", list}};
}

}  // namespace receiver
