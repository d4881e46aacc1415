#pragma once

#include <cstddef>
#include <list>
#include <memory>
#include <vector>

#include "controller/Controller.h"

namespace clipfileModule {

/// What tests see of a `Controller` beyond its public operations.
class ControllerPeer {
 public:
    explicit ControllerPeer(Controller& controller) : controller_(controller) {}

    OutputSettings Settings() const { return controller_.getSettings(); }
    StreamDataQueue& Queue(std::size_t index) { return *controller_.queues[index]; }
    std::size_t QueueCount() const { return controller_.queues.size(); }
    /// Held by a test, it keeps every unit and every command from the recordings.
    Mutex& StreamBuffersMutex() { return controller_.streamBuffersMutex; }
    std::vector<std::shared_ptr<StreamBuffer>> StreamBuffers() {
        MutexLock lock(controller_.streamBuffersMutex);
        std::vector<std::shared_ptr<StreamBuffer>> buffers;
        for (const Recording& recording : controller_.streamBuffers) {
            buffers.push_back(recording.buffer);
        }
        return buffers;
    }
    std::size_t WaitingEvents() {
        MutexLock lock(controller_.eventQueueMutex);
        return controller_.eventQueue.size();
    }
    /// A signal that no post goes with, as a system may give one on its own.
    void SignalEventLoop() { controller_.eventCondition.notify_one(); }
    void SetTerminated(bool terminated) { controller_.terminated = terminated; }

 private:
    Controller& controller_;
};

}  // namespace clipfileModule
