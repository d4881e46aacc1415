#pragma once

#include "buffer/state/CacheState.h"

namespace clipfileModule {

/// The recording runs: every unit goes to its cache.
class StartCacheState : public CacheState {
 public:
    /// `firstUnit` is the IDR frame that begins the recording, with the parameter sets it refers to.
    StartCacheState(StreamBufferInterface* owner, const nal_access::NalUnit& sequenceParameterSet,
                    const nal_access::NalUnit& pictureParameterSet,
                    const std::shared_ptr<StreamData>& firstUnit);

    /// Hands parameter sets and IDR frame to the buffer.
    void OnEnter() override;
    /// Queues the unit. Waits while the queue is full.
    std::shared_ptr<CacheState> Execute(const std::shared_ptr<StreamData>& unit,
                                        std::shared_ptr<StreamQueue>& queue, const char* mediaType) override;
    /// False: more units are to come.
    bool CanFinish(const StreamDataQueue& queue) override;

 private:
    const nal_access::NalUnit sps;
    const nal_access::NalUnit pps;
    const std::shared_ptr<StreamData> idrUnit;
};

}  // namespace clipfileModule
