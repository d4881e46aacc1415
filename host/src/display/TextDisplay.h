#pragma once

#include <chrono>
#include <functional>
#include <optional>
#include <ostream>
#include <string>
#include <utility>

#include "display/DisplayInterface.h"

namespace receiver {

/// Text for people: a line for each change, and the table of files at the end. The streams must outlive it.
class TextDisplay : public DisplayInterface {
 public:
    using Clock = std::function<std::chrono::steady_clock::time_point()>;

    /// `messages` is for what happens, `results` for the table of files.
    TextDisplay(std::ostream& messages, std::ostream& results, Clock clock = std::chrono::steady_clock::now)
        : messages_(messages), results_(results), clock_(std::move(clock)) {}

    void Notice(const std::string& sentence) override;
    void Failure(ExitCode code, const std::string& sentence) override;
    void Status(const ModuleStatus& status) override;
    void FileOpened(const std::string& path) override;
    void FileClosed(const std::string& path) override;
    void RecordStarted(const Timecode& at) override;
    void RecordStopped(const Timecode& at) override;
    /// A line when a recording waits for its IDR frame, and one when units were lost: at once, and then at
    /// most every five seconds, with the total.
    void Show(const Snapshot& snapshot) override;
    void Finish(const Summary& summary) override;

 protected:
    virtual void Line(const std::string& text);
    std::ostream& Messages() { return messages_; }

 private:
    std::ostream& messages_;
    std::ostream& results_;
    const Clock clock_;
    bool waiting_ = false;
    /// What was told last, and when.
    std::uint64_t lost_ = 0;
    std::optional<std::chrono::steady_clock::time_point> lossTold_;
};

/// Units in words: "1 unit", "2 units".
std::string Counted(std::uint64_t count, const std::string& noun);

/// "2 messages could not be shown"
std::string Unshown(std::uint64_t count);
/// The line in the place of `count` messages that nobody has read.
std::string TextRemark(std::uint64_t count);

}  // namespace receiver
