#include "display/JsonDisplay.h"

#include <nlohmann/json.hpp>

#include "display/StatusWords.h"

namespace receiver {
namespace {

using nlohmann::ordered_json;

constexpr std::chrono::seconds kInterval{1};

void Write(std::ostream& out, const ordered_json& object) {
    // Paths and addresses may hold any bytes.
    out << object.dump(-1, ' ', false, ordered_json::error_handler_t::replace) << std::endl;
}

ordered_json TextOrNull(const std::string& text) {
    return text.empty() ? ordered_json(nullptr) : ordered_json(text);
}

}  // namespace

void JsonDisplay::Notice(const std::string& sentence) {
    Write(out_, {{"event", "notice"}, {"text", sentence}});
}

void JsonDisplay::Failure(ExitCode code, const std::string& sentence) {
    Write(out_, {{"event", "failure"}, {"exit_code", static_cast<int>(code)}, {"text", sentence}});
}

void JsonDisplay::Status(const ModuleStatus& status) {
    Write(out_, {{"event", "status"},
                 {"status", status.status},
                 {"cause", status.cause},
                 {"words", StatusWords(status)}});
}

void JsonDisplay::FileOpened(const std::string& path) {
    Write(out_, {{"event", "file_opened"}, {"path", path}});
}

void JsonDisplay::FileClosed(const std::string& path) {
    Write(out_, {{"event", "file_closed"}, {"path", path}});
}

void JsonDisplay::Show(const Snapshot& snapshot) {
    const auto now = std::chrono::steady_clock::now();
    if (shown_ && now - *shown_ < kInterval && snapshot.recording == recording_) {
        return;
    }
    shown_ = now;
    recording_ = snapshot.recording;
    ordered_json object{{"event", "progress"}};
    object["timecode"] =
        snapshot.timecode ? ordered_json(ToString(*snapshot.timecode)) : ordered_json(nullptr);
    object["seconds"] = snapshot.seconds;
    object["recording"] = snapshot.recording;
    object["waiting_for_idr"] = snapshot.waiting;
    object["frames_per_second"] = snapshot.framesPerSecond;
    object["video_kilobits"] = snapshot.videoKilobits;
    object["audio_kilobits"] = snapshot.audioKilobits;
    object["klv_packets"] = snapshot.klvPackets;
    object["status"] = snapshot.status.status;
    object["cause"] = snapshot.status.cause;
    object["file"] = TextOrNull(snapshot.file);
    object["free_bytes"] = snapshot.freeBytes ? ordered_json(*snapshot.freeBytes) : ordered_json(nullptr);
    object["lost"] = snapshot.lost;
    Write(out_, object);
}

void JsonDisplay::Finish(const Summary& summary) {
    ordered_json files = ordered_json::array();
    for (const RecordedFile& file : summary.files) {
        files.push_back({{"path", file.path},
                         {"bytes", file.bytes},
                         {"start_timecode", TextOrNull(file.startTimecode)},
                         {"seconds", file.seconds},
                         {"frames", file.frames},
                         {"problem", TextOrNull(file.problem)}});
    }
    Write(out_, {{"event", "summary"},
                 {"files", files},
                 {"lost", summary.lost},
                 {"exit_code", static_cast<int>(summary.exitCode)}});
}

}  // namespace receiver
