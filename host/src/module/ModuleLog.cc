#include "module/ModuleLog.h"

#include <map>
#include <optional>
#include <thread>
#include <utility>

#include "common/NativePath.h"

namespace receiver {
namespace {

/// What stands between `prefix` and `suffix` in a line, with slashes for the backslashes that separate
/// folders inside the module. Nothing when the line is another one.
std::optional<std::string> PathBetween(std::string_view text, std::string_view prefix,
                                       std::string_view suffix) {
    if (!text.starts_with(prefix) || !text.ends_with(suffix) || text.size() < prefix.size() + suffix.size()) {
        return std::nullopt;
    }
    text.remove_prefix(prefix.size());
    text.remove_suffix(suffix.size());
    return NativePath(std::string(text));
}

constexpr std::string_view kOutputPath = "file output path = ";

/// The line of a refused logon ends with path, user name and password, which may hold anything, commas and
/// line breaks included. So what is shown of it ends with the path, which is known, or in front of it where
/// it is another one.
std::string_view WithoutLogon(std::string_view text, std::string_view outputPath) {
    if (!text.starts_with("LogonUser call failed.")) {
        return text;
    }
    std::size_t end = text.find(", ");
    end = end == std::string_view::npos ? end : text.find(", ", end + 2);
    if (end == std::string_view::npos) {
        return text;
    }
    const bool known = !outputPath.empty() && text.substr(end + 2).starts_with(outputPath);
    return text.substr(0, known ? end + 2 + outputPath.size() : end);
}

}  // namespace

class ModuleLog::Sink final : public LogSinkInterface {
 public:
    void OnLine(const LogLine& line) override {
        switch (line.priority) {
            case LOG_PRIORITY_OPERATOR:
                OnOperatorLine(line.text);
                break;
            case LOG_PRIORITY_ERROR:
                OnError(line.text);
                break;
            case LOG_PRIORITY_WARNING:
                OnWarning(line.text);
                break;
            case LOG_PRIORITY_TRACE:
                OnTrace(line.text, line.function);
                break;
            default:
                break;
        }
    }

    std::mutex mutex;
    std::condition_variable changed;
    // Guarded by mutex:
    std::vector<ModuleEvent> events;
    QueueLosses losses;
    int openRecordings = 0;
    int stops = 0;

 private:
    /// What a writer works on.
    struct Writer {
        std::string folder;
        /// Empty when none is open.
        std::string file;
    };

    void OnError(std::string_view text) {
        const std::lock_guard lock(mutex);
        events.push_back({ModuleEvent::Kind::kError, std::string(WithoutLogon(text, outputPath_))});
    }

    void OnOperatorLine(std::string_view text) {
        using Kind = ModuleEvent::Kind;
        const std::lock_guard lock(mutex);
        if (text.starts_with("OP: REC START.")) {
            ++openRecordings;
            events.push_back({Kind::kRecordStarted, {}});
        } else if (text.starts_with("OP: REC STOP.")) {
            events.push_back({Kind::kRecordStopped, {}});
        } else if (text.starts_with("OP: REMOVE STREAM.")) {
            --openRecordings;
            events.push_back({Kind::kRecordRemoved, {}});
        } else if (text.starts_with("OP: REC RESTART.")) {
            events.push_back({Kind::kRecordRestarted, {}});
        }
    }

    void OnWarning(std::string_view text) {
        const std::lock_guard lock(mutex);
        losses.video += text == "queue overflow (video)" ? 1 : 0;
        losses.audio += text == "queue overflow (audio)" ? 1 : 0;
        losses.meta += text == "queue overflow (meta)" ? 1 : 0;
    }

    /// The trace has a few lines for each unit, so most of them are passed over without the lock.
    void OnTrace(std::string_view text, const char* function) {
        if (text.starts_with(kOutputPath) && text.ends_with('.')) {
            const std::lock_guard lock(mutex);
            outputPath_ = text.substr(kOutputPath.size());
            // The full stop.
            outputPath_.pop_back();
        } else if (std::optional<std::string> folder = PathBetween(text, "output path = \"", "\".")) {
            const std::lock_guard lock(mutex);
            writers_[std::this_thread::get_id()].folder = std::move(*folder);
        } else if (const std::optional<std::string> name = PathBetween(text, "ST: out_filename = \"", "\"")) {
            const std::lock_guard lock(mutex);
            Writer& writer = writers_[std::this_thread::get_id()];
            Close(writer);
            writer.file = writer.folder.empty() ? *name : writer.folder + "/" + *name;
            events.push_back({ModuleEvent::Kind::kFileOpened, writer.file});
        } else if (text == "start. event_id = 6.") {
            const std::lock_guard lock(mutex);
            const auto writer = writers_.find(std::this_thread::get_id());
            if (writer != writers_.end()) {
                Close(writer->second);
                writers_.erase(writer);
            }
        } else if (text == "end." && function != nullptr &&
                   std::string_view(function).ends_with("Controller::OnStopStream")) {
            const std::lock_guard lock(mutex);
            ++stops;
            changed.notify_all();
        }
    }

    void Close(Writer& writer) {
        if (!writer.file.empty()) {
            events.push_back({ModuleEvent::Kind::kFileClosed, std::exchange(writer.file, {})});
        }
    }

    // Guarded by mutex:
    std::map<std::thread::id, Writer> writers_;
    /// As the module writes it.
    std::string outputPath_;
};

ModuleLog::ModuleLog() : sink_(std::make_shared<Sink>()) {
    LogSinks::Add(sink_, LOG_PRIORITY_TRACE);
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
