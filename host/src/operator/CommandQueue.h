#pragma once

#include <functional>
#include <future>
#include <mutex>
#include <optional>
#include <string>
#include <vector>

#include "common/Timecode.h"
#include "operator/RecordPlan.h"

namespace receiver {

/// What an operator can ask of a recording.
enum class RecordCommand {
    /// A recording begins with the next IDR frame.
    kStart,
    /// It ends in front of the next frame.
    kStop,
    /// It ends in front of the next IDR frame, and another one begins with that: nothing is lost in between.
    kSplit,
};

/// What became of a command.
struct CommandResult {
    /// The first frame of the recording that began, or the first one behind the recording that ended. Nothing
    /// where there was no such frame: a stop while nothing was recorded yet, a command without effect.
    std::optional<Timecode> at;
    /// Why the command had no effect, in words for the operator; empty when it had one.
    std::string reason;

    friend bool operator==(const CommandResult&, const CommandResult&) = default;
};

/// The commands of all who may command, in the order in which they came. Each one takes effect, however many
/// come at once: a stop with a start behind it ends a recording and begins another one. Only a start or split
/// that still waits for its IDR frame when a stop comes is withdrawn, and two that wait for the same frame
/// begin one recording.
///
/// Commands may come from any thread; one thread carries them out.
class CommandQueue {
 public:
    /// Called once for its command, on the thread that carries it out; once the queue is closed, on that of
    /// the caller. It must not call back into the queue.
    using Callback = std::function<void(const CommandResult&)>;

    /// The queue is closed with the object.
    ~CommandQueue();
    CommandQueue() = default;
    CommandQueue(const CommandQueue&) = delete;
    CommandQueue& operator=(const CommandQueue&) = delete;

    void Post(RecordCommand command, Callback told);
    std::future<CommandResult> Post(RecordCommand command);

    /// Enters what has come into the plan.
    void Apply(RecordPlan& plan);
    /// Tells those whose commands took effect with a frame, of which `decision` is what the plan has said.
    void Settle(const RecordDecision& decision, const Timecode& at);
    /// Nothing is carried out any more: what waits and what comes has no effect, for that reason.
    void Close(const std::string& reason);

 private:
    struct Posted {
        RecordCommand command;
        Callback told;
    };

    void Enter(Posted posted, RecordPlan& plan);
    void EnterStop(Posted posted, RecordPlan& plan);
    static void TellAll(std::vector<Callback>& waiting, const CommandResult& result);

    // Of the thread that carries out:
    /// Wait for the next frame, and for the next recording.
    std::vector<Callback> stops_;
    std::vector<Callback> begins_;

    std::mutex mutex_;
    // Guarded by mutex_:
    std::vector<Posted> posted_;
    /// Why nothing is taken any more.
    std::optional<std::string> closed_;
};

}  // namespace receiver
