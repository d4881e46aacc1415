#pragma once

#include <optional>
#include <string>

#include "hooks/HookEvent.h"

namespace receiver {

/// Where events go.
class HookTargetInterface {
 public:
    virtual ~HookTargetInterface() = default;
    /// Delivers an event, within a bounded time. Nothing when that is done; else why not, in words.
    virtual std::optional<std::string> Deliver(const HookEvent& event) = 0;
    /// Ends the delivery that goes on, and each later one at once. From any thread.
    virtual void End() = 0;
    /// What it is, for the operator: "hook /usr/bin/notify".
    virtual std::string Name() const = 0;
};

}  // namespace receiver
