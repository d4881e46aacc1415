#pragma once

#include <chrono>
#include <memory>
#include <optional>
#include <string>
#include <vector>

#include "display/JsonDisplay.h"
#include "display/OutputQueue.h"
#include "hooks/HookQueue.h"

namespace receiver {

/// Programs and servers that are told what happens in a run, in the background. One thread at a time.
class Hooks {
 public:
    /// How long the end of a run waits for what is not delivered.
    static constexpr std::chrono::seconds kEndPatience{5};

    /// The program and the address, where there is one.
    Hooks(const std::optional<std::string>& program, const std::optional<std::string>& url);

    /// To be told all that a display is told.
    DisplayInterface& Display() { return display_; }
    /// What there is to tell the operator since the last call.
    std::vector<std::string> TakeSentences();
    HookCounts Counts() const;
    /// Waits for what is not delivered, for a bounded time. Who has not taken it by then is told nothing
    /// more.
    void Settle();

 private:
    void Post(std::string_view line);

    std::vector<std::unique_ptr<HookQueue>> queues_;
    MessageStream stream_;
    JsonDisplay display_;
};

}  // namespace receiver
