#include "display/TextDisplay.h"

#include "display/StatusWords.h"

namespace receiver {
namespace {

std::string At(const std::optional<Timecode>& timecode) {
    return timecode ? " at " + ToString(*timecode) : "";
}

}  // namespace

std::string Counted(std::uint64_t count, const std::string& noun) {
    return std::to_string(count) + " " + noun + (count == 1 ? "" : "s");
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
    const bool fault = status.status == 6 || status.status == 7;
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

void TextDisplay::Show(const Snapshot& snapshot) {
    if (snapshot.waiting && !waiting_) {
        Line("recording begins with the next IDR frame");
    }
    if (snapshot.recording != recording_) {
        Line((snapshot.recording ? "recording" : "not recording") + At(snapshot.since));
    }
    if (snapshot.lost != lost_) {
        Line("lost: " + Counted(snapshot.lost, "unit") + " so far" + At(snapshot.timecode));
    }
    waiting_ = snapshot.waiting;
    recording_ = snapshot.recording;
    lost_ = snapshot.lost;
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
