#include "module/ModuleLog.h"

#include <map>
#include <optional>
#include <thread>
#include <utility>

#include "common/NativePath.h"
#include "module/ModuleLines.h"

namespace receiver {
namespace {

/// The line of a refused logon ends with path, user name and password, which may hold anything, commas and
/// line breaks included. So what is shown of it ends with the path, which is known, or in front of it where
/// it is another one.
std::string_view WithoutLogon(std::string_view text, std::string_view outputPath) {
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
        // Most lines mean nothing: the trace has a few for each unit. They are passed over without the lock.
        const std::optional<UnderstoodLine> understood = Understand(line);
        if (!understood && line.priority != LOG_PRIORITY_ERROR) {
            return;
        }
        const std::lock_guard lock(mutex);
        if (line.priority == LOG_PRIORITY_ERROR) {
            events.push_back({ModuleEvent::Kind::kError,
                              std::string(understood ? WithoutLogon(line.text, outputPath_) : line.text)});
        } else {
            Follow(*understood);
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

    void Follow(const UnderstoodLine& line) {
        using Kind = ModuleEvent::Kind;
        switch (line.meaning) {
            case LineMeaning::kOutputPath:
                outputPath_ = line.rest;
                break;
            case LineMeaning::kFolder:
                writers_[std::this_thread::get_id()].folder = NativePath(std::string(line.rest));
                break;
            case LineMeaning::kFile:
                Open(writers_[std::this_thread::get_id()], NativePath(std::string(line.rest)));
                break;
            case LineMeaning::kWriterEnded:
                EndWriter();
                break;
            case LineMeaning::kRecordStarted:
                ++openRecordings;
                events.push_back({Kind::kRecordStarted, {}});
                break;
            case LineMeaning::kRecordStopped:
                events.push_back({Kind::kRecordStopped, {}});
                break;
            case LineMeaning::kRecordRemoved:
                --openRecordings;
                events.push_back({Kind::kRecordRemoved, {}});
                break;
            case LineMeaning::kRecordRestarted:
                events.push_back({Kind::kRecordRestarted, {}});
                break;
            case LineMeaning::kStopCarriedOut:
                ++stops;
                changed.notify_all();
                break;
            case LineMeaning::kVideoDropped:
                ++losses.video;
                break;
            case LineMeaning::kAudioDropped:
                ++losses.audio;
                break;
            case LineMeaning::kMetaDropped:
                ++losses.meta;
                break;
            case LineMeaning::kLogonRefused:
                break;
        }
    }

    void Open(Writer& writer, std::string name) {
        Close(writer);
        writer.file = writer.folder.empty() ? std::move(name) : writer.folder + "/" + name;
        events.push_back({ModuleEvent::Kind::kFileOpened, writer.file});
    }

    void EndWriter() {
        const auto writer = writers_.find(std::this_thread::get_id());
        if (writer != writers_.end()) {
            Close(writer->second);
            writers_.erase(writer);
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
