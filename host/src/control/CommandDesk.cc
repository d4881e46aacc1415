#include "control/CommandDesk.h"

#include <algorithm>
#include <utility>

namespace receiver {
namespace {

using Json = nlohmann::ordered_json;

}  // namespace

CommandDesk::CommandDesk(std::shared_ptr<CommandQueue> commands, const RunState& state,
                         std::function<void()> answered)
    : commands_(std::move(commands)), state_(state), answered_(std::move(answered)) {}

void CommandDesk::Post(RecordCommand command, std::uint64_t client, const std::optional<Json>& id) {
    if (!state_.HasSource()) {
        throw RpcError(RpcCode::kNoSource, "the source is not there yet");
    }
    if (waiting_.size() >= kMostCommands) {
        throw RpcError(RpcCode::kBusy, "too many commands wait to take effect");
    }
    Waiting waiting;
    waiting.number = ++posted_;
    waiting.command = command;
    waiting.client = id ? client : 0;
    waiting.id = id.value_or(nullptr);
    waiting_.push_back(std::move(waiting));
    commands_->Post(
        command, [answers = answers_, answered = answered_, number = posted_](const CommandResult& result) {
            {
                const std::lock_guard lock(answers->mutex);
                answers->come.emplace_back(number, result);
            }
            answered();
        });
}

std::vector<CommandDesk::Outcome> CommandDesk::Settle(bool all) {
    std::vector<Outcome> outcomes;
    TakeAnswers(outcomes);
    std::erase_if(waiting_, [&](Waiting& waiting) {
        const std::optional<Json> result = waiting.patience ? ResultOf(waiting, all) : std::nullopt;
        if (result) {
            outcomes.push_back({waiting.client, waiting.id, *result, std::nullopt});
        }
        return result.has_value();
    });
    std::erase_if(outcomes, [](const Outcome& outcome) { return outcome.client == 0; });
    return outcomes;
}

void CommandDesk::TakeAnswers(std::vector<Outcome>& outcomes) {
    std::vector<std::pair<std::uint64_t, CommandResult>> come;
    {
        const std::lock_guard lock(answers_->mutex);
        come.swap(answers_->come);
    }
    for (const auto& [number, result] : come) {
        const auto waiting =
            std::find_if(waiting_.begin(), waiting_.end(),
                         [sought = number](const Waiting& one) { return one.number == sought; });
        if (waiting == waiting_.end()) {
            continue;
        }
        if (result.reason.empty()) {
            waiting->at = result.at;
            waiting->patience = Clock::now() + kFilePatience;
        } else {
            outcomes.push_back(
                {waiting->client, waiting->id, nullptr, RpcError(RpcCode::kNoEffect, result.reason)});
            waiting_.erase(waiting);
        }
    }
}

std::optional<Json> CommandDesk::ResultOf(const Waiting& waiting, bool all) const {
    const bool stop = waiting.command == RecordCommand::kStop;
    std::optional<RunFile> file;
    if (waiting.at) {
        file = stop ? state_.LastFileTo(*waiting.at) : state_.FirstFileFrom(*waiting.at);
    }
    // A stop of what was not recording yet has no frame and no file.
    const bool complete = !waiting.at || (file && (!stop || file->closed));
    if (!complete && !all && Clock::now() < *waiting.patience) {
        return std::nullopt;
    }
    Json result;
    result["timecode"] = waiting.at ? Json(ToString(*waiting.at)) : Json(nullptr);
    result["file"] = file ? Json(file->path) : Json(nullptr);
    if (stop) {
        result["closed"] = file && file->closed;
    }
    return result;
}

bool CommandDesk::Owes(std::uint64_t client) const {
    return std::any_of(waiting_.begin(), waiting_.end(),
                       [client](const Waiting& waiting) { return waiting.client == client; });
}

void CommandDesk::Forget(std::uint64_t client) {
    for (Waiting& waiting : waiting_) {
        if (waiting.client == client) {
            waiting.client = 0;
        }
    }
}

std::optional<CommandDesk::Clock::time_point> CommandDesk::NextDeadline() const {
    std::optional<Clock::time_point> next;
    for (const Waiting& waiting : waiting_) {
        if (waiting.patience && (!next || *waiting.patience < *next)) {
            next = waiting.patience;
        }
    }
    return next;
}

}  // namespace receiver
