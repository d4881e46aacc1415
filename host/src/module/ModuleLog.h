#pragma once

#include <chrono>
#include <condition_variable>
#include <cstdint>
#include <memory>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

#include "LogSink.h"

namespace receiver {

/// Units, marks among them, that the module could not take because one of its queues was full.
struct QueueLosses {
    std::uint64_t video = 0;
    std::uint64_t audio = 0;
    std::uint64_t meta = 0;

    std::uint64_t Total() const { return video + audio + meta; }
};

/// Something that the module wrote to its log and that the receiver tells its operator.
struct ModuleEvent {
    enum class Kind {
        /// `text` is the path of a file, with slashes. It is about to be made.
        kFileOpened,
        /// It is complete.
        kFileClosed,
        /// A recording was commanded, was stopped, is over, began anew after a fault.
        kRecordStarted,
        kRecordStopped,
        kRecordRemoved,
        kRecordRestarted,
        /// A line at the priority of errors, as it stands.
        kError,
    };
    Kind kind;
    std::string text;
};

/// Follows the module through its log, which is its only word about files and about units that it had to
/// drop. Only the trace tells of fragmented files, of folders and of what is complete: a writer's thread
/// names the folder, then the file, and the file is closed when the same thread names the next one, or when
/// it posts the status of its end. The operator's line about the end of a file comes before its last boxes
/// are written.
///
/// Lines arrive on the module's threads; the operations may be called from any thread.
class ModuleLog {
 public:
    /// Listens from now on.
    ModuleLog();
    ~ModuleLog();
    ModuleLog(const ModuleLog&) = delete;
    ModuleLog& operator=(const ModuleLog&) = delete;

    /// What happened since the last call, in its order.
    std::vector<ModuleEvent> TakeEvents();
    QueueLosses Losses() const;
    /// Recordings that were commanded and have not ended.
    int OpenRecordings() const;
    /// Stop commands that the module's event thread has carried out, whether or not there was anything to
    /// stop.
    int Stops() const;
    /// Waits until there are `count` of them. False after `patience`.
    bool WaitForStops(int count, std::chrono::milliseconds patience) const;

 private:
    class Sink;
    const std::shared_ptr<Sink> sink_;
};

}  // namespace receiver
