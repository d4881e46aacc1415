#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>

#include "StreamData.h"
#include "buffer/queue/StreamQueue.h"
#include "common/StreamBufferInterface.h"

namespace clipfileModule {

/// Numbers of the recording states.
///
///            Start             IDR frame with both
///                              parameter sets
///     stop ---------> wait_state ---------------> start
///      ^               |     |                   |     |
///      |    past the   |     |  limit    limit   |     | end of record
///      |    stop time  |     +----> error <------+     |
///      |               v             |                 |
///      |          end_sync_rec <-----|-----------------+
///      |               |             |
///      +---------------+-------------+   Stop, from any state
enum CacheStateId : std::int32_t {
    kStopState = 1,
    kWaitStartState = 2,
    kStartState = 3,
    kErrorState = 4,
    kEndSyncRecState = 5,
};

/// A state of a recording: decides what becomes of each unit that is pushed to it.
///
/// A state never changes the state itself. `Execute` returns the next one and `StreamBuffer::changeState`
/// installs it. All operations run under the lock that guards the buffer's state.
class CacheState {
 public:
    /// `owner` outlives the state.
    CacheState(const char* stateName, CacheStateId stateId, StreamBufferInterface* owner);
    virtual ~CacheState() = default;

    /// The state is about to be installed; the buffer still holds the old one.
    virtual void OnEnter() {}
    /// Takes a unit of the medium `mediaType` ("video", "audio" or "meta"), whose way into the cache is
    /// `queue`. Returns the next state, or null to stay in this one.
    virtual std::shared_ptr<CacheState> Execute(const std::shared_ptr<StreamData>& unit,
                                                std::shared_ptr<StreamQueue>& queue,
                                                const char* mediaType) = 0;
    /// The state has been replaced.
    virtual void OnExit() {}
    /// True when a recording in this state has nothing left to do with the units of `queue`.
    virtual bool CanFinish(const StreamDataQueue& queue);

    const std::string& GetName() const { return name; }
    CacheStateId GetId() const { return id; }

 protected:
    /// Logs `size` bytes in hexadecimal, 32 to a line, under `text`.
    static void dump(const char* text, const unsigned char* data, std::uint64_t size);

    const std::string name;
    const CacheStateId id;
    /// Not owned.
    StreamBufferInterface* const buffer;
};

}  // namespace clipfileModule
