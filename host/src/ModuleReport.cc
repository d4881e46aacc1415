#include "ModuleReport.h"

#include "QxModuleStatus.h"

namespace receiver {

void ModuleReport::Tell(const std::vector<ModuleStatus>& statuses, bool ending) {
    for (const ModuleStatus& status : statuses) {
        if (status.status == QxStatus::kStreamFault) {
            // Going offline is how each session ends.
            if (ending && status.cause == QxStreamFault::kOffline) {
                continue;
            }
            ++faults_;
        }
        // The module says more than once that buffering has stopped.
        if (status != told_) {
            told_ = status;
            display_.Status(status);
        }
    }
}

void ModuleReport::Tell(const std::vector<ModuleEvent>& events) {
    for (const ModuleEvent& event : events) {
        switch (event.kind) {
            case ModuleEvent::Kind::kFileOpened:
                openFile_ = event.text;
                files_.push_back({event.text, false});
                display_.FileOpened(event.text);
                break;
            case ModuleEvent::Kind::kFileClosed:
                TellClosed(event.text);
                break;
            case ModuleEvent::Kind::kRecordRestarted:
                display_.Notice("the recording begins anew after a fault");
                break;
            case ModuleEvent::Kind::kError:
                display_.Notice("module log: " + event.text);
                break;
            case ModuleEvent::Kind::kRecordStarted:
            case ModuleEvent::Kind::kRecordStopped:
            case ModuleEvent::Kind::kRecordRemoved:
                break;
        }
    }
}

void ModuleReport::TellClosed(const std::string& path) {
    for (WrittenFile& file : files_) {
        file.closed = file.closed || file.path == path;
    }
    if (openFile_ == path) {
        openFile_.clear();
    }
    display_.FileClosed(path);
}

}  // namespace receiver
