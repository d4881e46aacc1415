#include "module/ModuleLog.h"

#include <algorithm>
#include <optional>
#include <utility>

namespace receiver {
namespace {

/// The path in a line such as "OP: FILE CREATE. (path)", or nothing when `text` does not begin with `prefix`.
std::optional<std::string> PathAfter(std::string_view text, std::string_view prefix) {
    if (!text.starts_with(prefix) || !text.ends_with(')')) {
        return std::nullopt;
    }
    text.remove_prefix(prefix.size());
    text.remove_suffix(1);
    std::string path(text);
    // Inside the module the separator of folders is a backslash.
    std::replace(path.begin(), path.end(), '\\', '/');
    return path;
}

}  // namespace

class ModuleLog::Sink final : public LogSinkInterface {
 public:
    void OnLine(const LogLine& line) override {
        using Kind = ModuleEvent::Kind;
        const std::lock_guard lock(mutex);
        if (line.priority == LOG_PRIORITY_WARNING) {
            losses.video += line.text == "queue overflow (video)" ? 1 : 0;
            losses.audio += line.text == "queue overflow (audio)" ? 1 : 0;
            losses.meta += line.text == "queue overflow (meta)" ? 1 : 0;
        } else if (line.priority == LOG_PRIORITY_ERROR) {
            events.push_back({Kind::kError, std::string(line.text)});
        } else if (auto created = PathAfter(line.text, "OP: FILE CREATE. (")) {
            events.push_back({Kind::kFileOpened, std::move(*created)});
        } else if (auto closed = PathAfter(line.text, "OP: FILE CLOSE. (")) {
            events.push_back({Kind::kFileClosed, std::move(*closed)});
        } else if (line.text.starts_with("OP: REC START.")) {
            ++openRecordings;
            events.push_back({Kind::kRecordStarted, {}});
        } else if (line.text.starts_with("OP: REC STOP.")) {
            ++stops;
            events.push_back({Kind::kRecordStopped, {}});
        } else if (line.text.starts_with("OP: REMOVE STREAM.")) {
            --openRecordings;
            events.push_back({Kind::kRecordRemoved, {}});
        } else if (line.text.starts_with("OP: REC RESTART.")) {
            events.push_back({Kind::kRecordRestarted, {}});
        }
        changed.notify_all();
    }

    std::mutex mutex;
    std::condition_variable changed;
    // Guarded by mutex:
    std::vector<ModuleEvent> events;
    QueueLosses losses;
    int openRecordings = 0;
    int stops = 0;
};

ModuleLog::ModuleLog() : sink_(std::make_shared<Sink>()) {
    LogSinks::Add(sink_, LOG_PRIORITY_WARNING);
}

ModuleLog::~ModuleLog() {
    LogSinks::Remove(sink_.get());
}

std::vector<ModuleEvent> ModuleLog::TakeEvents() {
    const std::lock_guard lock(sink_->mutex);
    return std::exchange(sink_->events, {});
}

QueueLosses ModuleLog::Losses() const {
    const std::lock_guard lock(sink_->mutex);
    return sink_->losses;
}

int ModuleLog::OpenRecordings() const {
    const std::lock_guard lock(sink_->mutex);
    return sink_->openRecordings;
}

int ModuleLog::Stops() const {
    const std::lock_guard lock(sink_->mutex);
    return sink_->stops;
}

bool ModuleLog::WaitForStops(int count, std::chrono::milliseconds patience) const {
    std::unique_lock lock(sink_->mutex);
    return sink_->changed.wait_for(lock, patience, [&] { return sink_->stops >= count; });
}

}  // namespace receiver
