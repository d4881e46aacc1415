#include "operator/CommandQueue.h"

#include <memory>
#include <utility>

namespace receiver {

CommandQueue::~CommandQueue() {
    Close("the run is over");
}

void CommandQueue::Post(RecordCommand command, Callback told) {
    std::string reason;
    {
        const std::lock_guard lock(mutex_);
        if (!closed_) {
            posted_.push_back({command, std::move(told)});
            return;
        }
        reason = *closed_;
    }
    told({std::nullopt, reason});
}

std::future<CommandResult> CommandQueue::Post(RecordCommand command) {
    const auto promise = std::make_shared<std::promise<CommandResult>>();
    std::future<CommandResult> result = promise->get_future();
    Post(command, [promise](const CommandResult& outcome) { promise->set_value(outcome); });
    return result;
}

void CommandQueue::Apply(RecordPlan& plan) {
    std::vector<Posted> taken;
    {
        const std::lock_guard lock(mutex_);
        taken.swap(posted_);
    }
    for (Posted& posted : taken) {
        Enter(std::move(posted), plan);
    }
}

void CommandQueue::Enter(Posted posted, RecordPlan& plan) {
    if (plan.Finished()) {
        posted.told({std::nullopt, "the run ends"});
        return;
    }
    switch (posted.command) {
        case RecordCommand::kStart:
            if (plan.Recording() && plan.Wanted() && !plan.Stopped()) {
                posted.told({std::nullopt, "a recording runs already"});
                return;
            }
            plan.Start();
            begins_.push_back(std::move(posted.told));
            break;
        case RecordCommand::kStop:
            EnterStop(std::move(posted), plan);
            break;
        case RecordCommand::kSplit:
            if (!plan.Wanted()) {
                posted.told({std::nullopt, "no recording runs that could be split"});
                return;
            }
            plan.Split();
            begins_.push_back(std::move(posted.told));
            break;
    }
}

void CommandQueue::EnterStop(Posted posted, RecordPlan& plan) {
    const bool nothing = !plan.Wanted() && !plan.Stopped();
    plan.Stop();
    TellAll(begins_, {std::nullopt, "a stop came before the next IDR frame"});
    if (nothing) {
        posted.told({std::nullopt, "no recording runs"});
    } else if (plan.Recording()) {
        stops_.push_back(std::move(posted.told));
    } else {
        posted.told({});
    }
}

void CommandQueue::Settle(const RecordDecision& decision, const Timecode& at) {
    // A stop takes effect with whatever frame comes next.
    TellAll(stops_, {at, {}});
    if (decision.begun) {
        TellAll(begins_, {at, {}});
    }
}

void CommandQueue::Close(const std::string& reason) {
    std::vector<Posted> left;
    {
        const std::lock_guard lock(mutex_);
        if (closed_) {
            return;
        }
        closed_ = reason;
        left.swap(posted_);
    }
    const CommandResult result{std::nullopt, reason};
    TellAll(stops_, result);
    TellAll(begins_, result);
    for (const Posted& posted : left) {
        posted.told(result);
    }
}

void CommandQueue::TellAll(std::vector<Callback>& waiting, const CommandResult& result) {
    for (const Callback& told : std::exchange(waiting, {})) {
        told(result);
    }
}

}  // namespace receiver
