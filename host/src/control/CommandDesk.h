#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <mutex>
#include <nlohmann/json.hpp>
#include <optional>
#include <vector>

#include "control/JsonRpc.h"
#include "control/RunState.h"
#include "operator/CommandQueue.h"

namespace receiver {

/// Gives record commands of clients to the command queue, and waits, without holding up anybody, until each
/// has taken effect: a start or split when its recording has a file, a stop when its file is closed. One
/// thread; the queue's answers come from others.
class CommandDesk {
 public:
    using Clock = std::chrono::steady_clock;

    /// Commands that may wait at a time, those of clients that are gone included.
    static constexpr std::size_t kMostCommands = 64;
    /// A command that has taken effect is answered without its file when that has not come so far: as long as
    /// the end of a recording waits for a slow disk.
    static constexpr std::chrono::seconds kFilePatience{30};

    /// What a client is told of its command.
    struct Outcome {
        std::uint64_t client = 0;
        nlohmann::ordered_json id;
        nlohmann::ordered_json result;
        /// Instead of a result.
        std::optional<RpcError> error;
    };

    /// `state` must outlive the desk. `answered` is called behind each answer of the queue, on any thread.
    CommandDesk(std::shared_ptr<CommandQueue> commands, const RunState& state,
                std::function<void()> answered);

    /// Throws `RpcError` where the command can't be taken. Without an `id` nobody is told.
    void Post(RecordCommand command, std::uint64_t client, const std::optional<nlohmann::ordered_json>& id);
    /// What can be told by now; with `all` also of commands that wait for their file alone.
    std::vector<Outcome> Settle(bool all);
    /// Commands of a client that wait to be answered.
    bool Owes(std::uint64_t client) const;
    /// The client is gone: its commands go on.
    void Forget(std::uint64_t client);
    /// When patience with a file ends.
    std::optional<Clock::time_point> NextDeadline() const;

 private:
    /// On its way from the queue; it may outlive the desk.
    struct Answers {
        std::mutex mutex;
        std::vector<std::pair<std::uint64_t, CommandResult>> come;
    };
    struct Waiting {
        std::uint64_t number = 0;
        RecordCommand command = RecordCommand::kStart;
        /// 0 for nobody.
        std::uint64_t client = 0;
        nlohmann::ordered_json id;
        /// Set once the command has taken effect.
        std::optional<Clock::time_point> patience;
        std::optional<Timecode> at;
    };

    void TakeAnswers(std::vector<Outcome>& outcomes);
    /// What is to be told of a command that has taken effect; nothing while its file is waited for.
    std::optional<nlohmann::ordered_json> ResultOf(const Waiting& waiting, bool all) const;

    const std::shared_ptr<CommandQueue> commands_;
    const RunState& state_;
    const std::function<void()> answered_;
    const std::shared_ptr<Answers> answers_ = std::make_shared<Answers>();
    std::vector<Waiting> waiting_;
    std::uint64_t posted_ = 0;
};

}  // namespace receiver
