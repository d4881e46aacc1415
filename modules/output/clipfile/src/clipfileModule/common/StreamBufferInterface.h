#pragma once

#include <cstdint>
#include <memory>

#include "StreamAnalyzer.h"
#include "StreamData.h"

namespace clipfileModule {

struct ChunkData;

/// What the recording states and `FileOutput` may call on a `StreamBuffer`.
class StreamBufferInterface {
 public:
    virtual ~StreamBufferInterface() = default;
    /// The recording begins at `unit`, an IDR frame that came with these parameter sets: trims the caches,
    /// starts the file output and puts the unit into the video cache.
    /// Called by `StartCacheState::OnEnter` alone, under the lock that guards the change of state.
    virtual void SetVideoSequenceHeader(const nal_access::NalUnit& sps, const nal_access::NalUnit& pps,
                                        const std::shared_ptr<StreamData>& unit) = 0;
    /// Works out the timecode of a file that begins with `chunk`, which must carry `firstVideo` and
    /// `firstMeta`. True when the file timecode now holds a value read from the stream. File output thread.
    virtual bool MakeFileTimecode(const std::shared_ptr<ChunkData>& chunk) = 0;
    /// Copies hours, minutes, seconds and frames of the current file's first frame to `timecode` (four bytes)
    /// and its drop-frame flag. False, and nothing written, before the first `MakeFileTimecode` of a
    /// recording. File output thread.
    virtual bool GetFileTimecode(unsigned char* timecode, bool* dropFrame) = 0;
    /// The same without the flag.
    virtual bool GetFileTimecode(unsigned char* timecode) = 0;
    /// Where the record starts, in 90 kHz ticks. Any thread.
    virtual std::int64_t GetStartTimestamp() const = 0;
    /// Where it ends, in 90 kHz ticks; -1 while it is open. Any thread.
    virtual std::int64_t GetStopTimestamp() const = 0;
    /// With exact rules: the first instant, in 90 kHz ticks, that does not belong to the record any more; -1
    /// while the record is open. Any thread.
    virtual std::int64_t GetEndTimestamp() const = 0;
    /// Asks the controller to remove this recording. Throws `std::bad_weak_ptr` when the buffer does not live
    /// in a `shared_ptr`. Any thread.
    virtual void NotifyEndSync() = 0;
};

}  // namespace clipfileModule
