#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <nlohmann/json_fwd.hpp>
#include <optional>
#include <ostream>
#include <string>

#include "display/DisplayInterface.h"

namespace receiver {

/// One JSON object a line, for programs. The member "event" tells what it is: "notice", "failure", "status",
/// "file_opened", "file_closed", "record_started", "record_stopped", "progress" once a second and at each
/// begin and end of a recording, and "summary" as the last one. "time" is the moment of the event (ISO 8601,
/// UTC, milliseconds). The stream must outlive it.
class JsonDisplay final : public DisplayInterface {
 public:
    using WallClock = std::function<std::chrono::system_clock::time_point()>;

    explicit JsonDisplay(std::ostream& out, WallClock clock = std::chrono::system_clock::now)
        : out_(out), clock_(std::move(clock)) {}

    void Notice(const std::string& sentence) override;
    void Failure(ExitCode code, const std::string& sentence) override;
    void Status(const ModuleStatus& status) override;
    void FileOpened(const std::string& path) override;
    void FileClosed(const std::string& path) override;
    void RecordStarted(const Timecode& at) override;
    void RecordStopped(const Timecode& at) override;
    void Show(const Snapshot& snapshot) override;
    void Finish(const Summary& summary) override;

 private:
    void Write(const char* event, const nlohmann::ordered_json& members);

    std::ostream& out_;
    const WallClock clock_;
    std::optional<std::chrono::steady_clock::time_point> shown_;
    bool recording_ = false;
};

/// A moment as events tell it: "2026-11-21T20:15:07.042Z".
std::string IsoTime(std::chrono::system_clock::time_point moment);

/// The event in the place of `count` events that nobody has read.
std::string JsonRemark(std::uint64_t count);

}  // namespace receiver
