#pragma once

#include <memory>

#include "control/Control.h"
#include "display/DisplayGroup.h"
#include "hooks/Hooks.h"
#include "operator/CommandQueue.h"
#include "options/Options.h"
#include "source/SourceInterface.h"

namespace receiver {

/// All who follow a run: the operator's display, the clients of the control socket, and hooks. None of them
/// holds it up. One thread at a time.
class Observers {
 public:
    /// `display` must outlive it.
    explicit Observers(DisplayInterface& display) { group_.Add(display); }

    /// Adds those that the options ask for. Throws `ReceiverError` (`kUsage`) where that can't be.
    void Start(const Options& options, const std::shared_ptr<CommandQueue>& commands);

    /// Tells all of them.
    DisplayInterface& Display() { return group_; }
    /// The source is there, or has become another one.
    void Describe(const SourceDescription& source);
    /// A unit of the source goes by.
    void LookAt(const SourceUnit& unit);
    /// Tells the operator what has become of hooks and of the control socket.
    void Follow();
    HookCounts Hooked() const { return hooks_ ? hooks_->Counts() : HookCounts(); }
    /// The last file is closed: waits for hooks, for a bounded time, while their failures can still be told.
    void Settle();
    /// The run is over, and the command queue is closed.
    void End();

 private:
    DisplayGroup group_;
    std::unique_ptr<Control> control_;
    std::unique_ptr<Hooks> hooks_;
};

}  // namespace receiver
