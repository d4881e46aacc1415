#pragma once

#include <memory>

#include "StreamData.h"

/// The road of the stream into the module. The order of the operations is an ABI.
///
/// The host may call the operations from any of its threads, also at the same time, between a successful
/// `QxModuleInterface::Initialize` and `Uninitialize`. None of them waits for a disk. Units of one medium are
/// pushed in their order, by one thread at a time. With exact record rules the module keeps up to 64 video,
/// 128 audio and 64 metadata units for recordings that start in the past.
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
