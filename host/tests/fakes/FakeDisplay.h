#pragma once

#include <functional>
#include <string>
#include <vector>

#include "display/DisplayInterface.h"

namespace receiver {

/// Keeps what it is told.
class FakeDisplay final : public DisplayInterface {
 public:
    void Notice(const std::string& sentence) override {
        notices.push_back(sentence);
        if (onNotice) {
            onNotice(sentence);
        }
    }
    void Failure(ExitCode code, const std::string& sentence) override {
        failureCode = code;
        failure = sentence;
    }
    void Status(const ModuleStatus& status) override { statuses.push_back(status); }
    void FileOpened(const std::string& path) override { opened.push_back(path); }
    void FileClosed(const std::string& path) override { closed.push_back(path); }
    void RecordStarted(const Timecode& at) override { started.push_back(at); }
    void RecordStopped(const Timecode& at) override { stopped.push_back(at); }
    void Show(const Snapshot& snapshot) override { snapshots.push_back(snapshot); }
    void Finish(const Summary& end) override {
        summary = end;
        ++finished;
    }

    /// Called with each notice.
    std::function<void(const std::string& sentence)> onNotice;
    std::vector<std::string> notices;
    ExitCode failureCode = ExitCode::kSuccess;
    std::string failure;
    std::vector<ModuleStatus> statuses;
    std::vector<std::string> opened;
    std::vector<std::string> closed;
    std::vector<Timecode> started;
    std::vector<Timecode> stopped;
    std::vector<Snapshot> snapshots;
    Summary summary;
    int finished = 0;
};

}  // namespace receiver
