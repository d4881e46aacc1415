#include "display/DisplayGroup.h"

namespace receiver {

void DisplayGroup::Notice(const std::string& sentence) {
    for (DisplayInterface* const display : displays_) {
        display->Notice(sentence);
    }
}

void DisplayGroup::Failure(ExitCode code, const std::string& sentence) {
    for (DisplayInterface* const display : displays_) {
        display->Failure(code, sentence);
    }
}

void DisplayGroup::Status(const ModuleStatus& status) {
    for (DisplayInterface* const display : displays_) {
        display->Status(status);
    }
}

void DisplayGroup::FileOpened(const std::string& path) {
    for (DisplayInterface* const display : displays_) {
        display->FileOpened(path);
    }
}

void DisplayGroup::FileClosed(const std::string& path) {
    for (DisplayInterface* const display : displays_) {
        display->FileClosed(path);
    }
}

void DisplayGroup::RecordStarted(const Timecode& at) {
    for (DisplayInterface* const display : displays_) {
        display->RecordStarted(at);
    }
}

void DisplayGroup::RecordStopped(const Timecode& at) {
    for (DisplayInterface* const display : displays_) {
        display->RecordStopped(at);
    }
}

void DisplayGroup::Show(const Snapshot& snapshot) {
    for (DisplayInterface* const display : displays_) {
        display->Show(snapshot);
    }
}

void DisplayGroup::Finish(const Summary& summary) {
    for (DisplayInterface* const display : displays_) {
        display->Finish(summary);
    }
}

}  // namespace receiver
