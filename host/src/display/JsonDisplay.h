#pragma once

#include <chrono>
#include <optional>
#include <ostream>

#include "display/DisplayInterface.h"

namespace receiver {

/// One JSON object a line, for programs. The member "event" tells what it is: "notice", "failure", "status",
/// "file_opened", "file_closed", "progress" once a second and at each begin and end of a recording, and
/// "summary" as the last one. The stream must outlive it.
class JsonDisplay final : public DisplayInterface {
 public:
    explicit JsonDisplay(std::ostream& out) : out_(out) {}

    void Notice(const std::string& sentence) override;
    void Failure(ExitCode code, const std::string& sentence) override;
    void Status(const ModuleStatus& status) override;
    void FileOpened(const std::string& path) override;
    void FileClosed(const std::string& path) override;
    void Show(const Snapshot& snapshot) override;
    void Finish(const Summary& summary) override;

 private:
    std::ostream& out_;
    std::optional<std::chrono::steady_clock::time_point> shown_;
    bool recording_ = false;
};

}  // namespace receiver
