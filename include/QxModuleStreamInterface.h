#pragma once

#include <memory>

#include "StreamData.h"

/// The road of the stream into the module. The order of the operations is an ABI.
///
/// The host may call the operations from any of its threads, also at the same time, between a successful
/// `QxModuleInterface::Initialize` and `Uninitialize`. None of them waits for a disk.
class QxModuleStreamInterface {
 public:
    /// Has no effect; keeps its place in the table.
    virtual void PushReserved(const std::shared_ptr<StreamData>& unit) = 0;
    /// One H.264 access unit as Annex B byte stream.
    virtual void PushVideo(const std::shared_ptr<StreamData>& unit) = 0;
    /// One AAC frame.
    virtual void PushAudio(const std::shared_ptr<StreamData>& unit) = 0;
    /// One timed metadata unit, which also carries timecode and record flag.
    virtual void PushMeta(const std::shared_ptr<StreamData>& unit) = 0;

 protected:
    ~QxModuleStreamInterface() = default;
};
