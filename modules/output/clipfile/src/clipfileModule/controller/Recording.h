#pragma once

#include <cstdint>
#include <memory>

#include "buffer/StreamBuffer.h"

namespace clipfileModule {

/// Stop timestamp of a recording that is open.
constexpr std::int64_t kOpenStop = -1;

/// An entry of the controller's list: a recording, and its place among the commands. Places are numbers of
/// one counter of the controller, which events draw from too. They tell what came first, which timestamps
/// cannot: the clock of a stream jumps.
struct Recording {
    std::shared_ptr<StreamBuffer> buffer;
    /// Place of the start.
    std::uint64_t made = 0;
    /// Place of the last time when the buffer was stopped; 0 before the first.
    std::uint64_t stopped = 0;
    /// Stopped, and not started again.
    bool isStopped = false;
    /// With exact rules: its stop had been commanded when it was stopped, so it does not begin again.
    bool isOver = false;
    /// With exact rules: it waits for units behind those that went by before it was started, as its start
    /// timestamp says.
    bool startsBehind = false;

    void MarkStopped(std::uint64_t order) {
        stopped = order;
        isStopped = true;
        startsBehind = false;
    }
    /// No record command has closed it.
    bool IsOpen() const {
        return buffer->GetStopTimestamp() == kOpenStop && buffer->GetEndTimestamp() == kOpenStop;
    }
};

}  // namespace clipfileModule
