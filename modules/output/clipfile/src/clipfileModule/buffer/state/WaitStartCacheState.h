#pragma once

#include "buffer/state/CacheState.h"

namespace clipfileModule {

/// The recording waits for its first IDR frame with both parameter sets. Audio and metadata are cached from
/// the start timestamp on, video is dropped.
class WaitStartCacheState : public CacheState {
 public:
    explicit WaitStartCacheState(StreamBufferInterface* owner);

    /// Drops or queues the unit, or takes it as the start of the recording. The IDR frame that starts it is
    /// not queued: it reaches the video cache on entry of the start state.
    std::shared_ptr<CacheState> Execute(const std::shared_ptr<StreamData>& unit,
                                        std::shared_ptr<StreamQueue>& queue, const char* mediaType) override;

 private:
    nal_access::NalUnit sps;
    nal_access::NalUnit pps;
};

}  // namespace clipfileModule
