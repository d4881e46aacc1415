#pragma once

#include <atomic>
#include <chrono>
#include <memory>
#include <mutex>

#include "buffer/chunk/ChunkData.h"
#include "common/ControllerInterface.h"
#include "common/RecursiveTimedMutex.h"
#include "common/StreamBufferInterface.h"

namespace clipfileModule {

/// The only road of a writer to its controller and its stream buffer, which it may outlive: once the link is
/// cut, nothing passes any more. All operations may be called from any thread.
class OwnerLink {
 public:
    OwnerLink(ControllerInterface* controller, StreamBufferInterface* buffer)
        : controller_(controller), buffer_(buffer) {}
    OwnerLink(const OwnerLink&) = delete;
    OwnerLink& operator=(const OwnerLink&) = delete;

    // As the operations of the same names. Nothing happens once the link is cut, and the results are false.
    void SetStatus(int status, int cause);
    void PostEvent(std::shared_ptr<Event> event);
    bool MakeFileTimecode(const std::shared_ptr<ChunkData>& chunk);
    bool GetFileTimecode(unsigned char* timecode, bool* dropFrame);
    bool GetFileTimecode(unsigned char* timecode);

    /// No call begins from now on, and none is in progress when this returns true. False when one that had
    /// begun did not end within `wait`: a host can keep the call of a status as long as it likes.
    bool Cut(std::chrono::milliseconds wait);
    bool IsCut() const { return cut_; }

 private:
    /// Held during each call.
    RecursiveTimedMutex mutex_;
    std::atomic<bool> cut_ = false;
    ControllerInterface* const controller_;
    StreamBufferInterface* const buffer_;
};

}  // namespace clipfileModule
