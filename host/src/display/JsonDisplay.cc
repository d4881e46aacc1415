#include "display/JsonDisplay.h"

#include <array>
#include <cstdio>
#include <ctime>
#include <nlohmann/json.hpp>

#include "display/StatusWords.h"
#include "display/TextDisplay.h"

namespace receiver {
namespace {

using nlohmann::ordered_json;

constexpr std::chrono::seconds kInterval{1};

ordered_json Event(const char* name, std::chrono::system_clock::time_point moment) {
    return {{"event", name}, {"time", IsoTime(moment)}};
}

std::string Line(const ordered_json& object) {
    // Paths and addresses may hold any bytes.
    return object.dump(-1, ' ', false, ordered_json::error_handler_t::replace) + '\n';
}

ordered_json TextOrNull(const std::string& text) {
    return text.empty() ? ordered_json(nullptr) : ordered_json(text);
}

}  // namespace

std::string IsoTime(std::chrono::system_clock::time_point moment) {
    const auto milliseconds = std::chrono::floor<std::chrono::milliseconds>(moment.time_since_epoch());
    const auto seconds = std::chrono::floor<std::chrono::seconds>(milliseconds);
    const std::time_t time = seconds.count();
    std::tm parts{};
    gmtime_r(&time, &parts);
    std::array<char, 32> date{};
    std::strftime(date.data(), date.size(), "%FT%T", &parts);
    std::array<char, 48> text{};
    std::snprintf(text.data(), text.size(), "%s.%03dZ", date.data(),
                  static_cast<int>((milliseconds - seconds).count()));
    return text.data();
}

void JsonDisplay::Write(const char* event, const ordered_json& members) {
    ordered_json object = Event(event, clock_());
    object.update(members);
    out_ << Line(object) << std::flush;
}

void JsonDisplay::Notice(const std::string& sentence) {
    Write("notice", {{"text", sentence}});
}

void JsonDisplay::Failure(ExitCode code, const std::string& sentence) {
    Write("failure", {{"exit_code", static_cast<int>(code)}, {"text", sentence}});
}

void JsonDisplay::Status(const ModuleStatus& status) {
    Write("status", {{"status", status.status}, {"cause", status.cause}, {"words", StatusWords(status)}});
}

void JsonDisplay::FileOpened(const std::string& path) {
    Write("file_opened", {{"path", path}});
}

void JsonDisplay::FileClosed(const std::string& path) {
    Write("file_closed", {{"path", path}});
}

void JsonDisplay::RecordStarted(const Timecode& at) {
    Write("record_started", {{"timecode", ToString(at)}});
}

void JsonDisplay::RecordStopped(const Timecode& at) {
    Write("record_stopped", {{"timecode", ToString(at)}});
}

void JsonDisplay::Show(const Snapshot& snapshot) {
    const auto now = std::chrono::steady_clock::now();
    if (shown_ && now - *shown_ < kInterval && snapshot.recording == recording_) {
        return;
    }
    shown_ = now;
    recording_ = snapshot.recording;
    ordered_json object;
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
    object["sync_milliseconds"] =
        snapshot.syncTime ? ordered_json(snapshot.syncTime->count()) : ordered_json(nullptr);
    object["lost"] = snapshot.lost;
    Write("progress", object);
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
    Write("summary",
          {{"files", files}, {"lost", summary.lost}, {"exit_code", static_cast<int>(summary.exitCode)}});
}

std::string JsonRemark(std::uint64_t count) {
    ordered_json object = Event("notice", std::chrono::system_clock::now());
    object["text"] = Unshown(count);
    return Line(object);
}

}  // namespace receiver
