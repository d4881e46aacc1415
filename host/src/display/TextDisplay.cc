#include "display/TextDisplay.h"

#include "QxModuleStatus.h"
#include "display/StatusWords.h"

namespace receiver {
namespace {

constexpr std::chrono::seconds kLossInterval{5};

}  // namespace

std::string Counted(std::uint64_t count, const std::string& noun) {
    return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
}

std::string Unshown(std::uint64_t count) {
    return Counted(count, "message") + " could not be shown";
}

std::string TextRemark(std::uint64_t count) {
    return Unshown(count) + "\n";
}

void TextDisplay::Line(const std::string& text) {
    messages_ << text << std::endl;
}

void TextDisplay::Notice(const std::string& sentence) {
    Line(sentence);
}

void TextDisplay::Failure(ExitCode, const std::string& sentence) {
    Line("receiver: " + sentence);
}

void TextDisplay::Status(const ModuleStatus& status) {
    const bool fault = status.status == QxStatus::kStreamFault || status.status == QxStatus::kFailed;
    const std::string numbers =
        fault ? " (status " + std::to_string(status.status) + ", cause " + std::to_string(status.cause) + ")"
              : "";
    Line("module: " + StatusWords(status) + numbers);
}

void TextDisplay::FileOpened(const std::string& path) {
    Line("writing " + path);
}

void TextDisplay::FileClosed(const std::string& path) {
    Line("closed  " + path);
}

void TextDisplay::RecordStarted(const Timecode& at) {
    Line("recording at " + ToString(at));
}

void TextDisplay::RecordStopped(const Timecode& at) {
    Line("not recording at " + ToString(at));
}

void TextDisplay::Show(const Snapshot& snapshot) {
    if (snapshot.waiting && !waiting_) {
        Line("recording begins with the next IDR frame");
    }
    waiting_ = snapshot.waiting;
    if (snapshot.lost == lost_) {
        return;
    }
    const auto now = clock_();
    if (!lossTold_ || now - *lossTold_ >= kLossInterval) {
        lossTold_ = now;
        lost_ = snapshot.lost;
        Line("lost: " + Counted(lost_, "unit") + " so far" +
             (snapshot.timecode ? " at " + ToString(*snapshot.timecode) : ""));
    }
}

void TextDisplay::Finish(const Summary& summary) {
    if (summary.files.empty()) {
        Line("no file was written");
    }
    PrintFiles(results_, summary.files);
    results_ << std::flush;
    if (summary.lost != 0) {
        Line("lost: " + Counted(summary.lost, "unit"));
    }
}

}  // namespace receiver
