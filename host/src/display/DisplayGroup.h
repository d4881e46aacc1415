#pragma once

#include <vector>

#include "display/DisplayInterface.h"

namespace receiver {

/// Several displays that are told the same, in the order in which they were added.
class DisplayGroup final : public DisplayInterface {
 public:
    /// `display` must outlive the group.
    void Add(DisplayInterface& display) { displays_.push_back(&display); }

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
    std::vector<DisplayInterface*> displays_;
};

}  // namespace receiver
