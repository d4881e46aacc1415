#pragma once

#include <memory>

#include "common/Event.h"

namespace clipfileModule {

/// What the other classes of the module see of `Controller`. All operations may be called from any thread.
class ControllerInterface {
 public:
    virtual ~ControllerInterface() = default;
    /// Appends the event to those that wait. Never waits for an event to run.
    virtual void PostEvent(std::shared_ptr<Event> event) = 0;
    /// Puts the event ahead of all that wait. Never waits for an event to run.
    virtual void SendEvent(std::shared_ptr<Event> event) = 0;
    /// Starts buffering: status 4, and in "on" mode a recording.
    virtual void BufferingStart() = 0;
    /// Stops every recording: status 3.
    virtual void BufferingStop() = 0;
    /// Tells the host status and cause, unless the final status 7 came before or the host already holds it.
    /// While another thread tells the host something, that thread goes on with this status, and the call
    /// returns at once.
    virtual void SetStatus(int status, int cause) = 0;
    /// True while the module may be called: from a successful `Initialize` to `Uninitialize`.
    virtual bool IsRunning() const { return true; }
};

}  // namespace clipfileModule
