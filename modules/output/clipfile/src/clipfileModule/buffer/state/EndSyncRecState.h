#pragma once

#include "buffer/state/CacheState.h"

namespace clipfileModule {

/// The record is complete, or was stopped before it began. The recording waits for its removal.
class EndSyncRecState : public CacheState {
 public:
    explicit EndSyncRecState(StreamBufferInterface* owner);

    /// Asks for the recording's removal.
    void OnEnter() override;
    /// Drops the unit.
    std::shared_ptr<CacheState> Execute(const std::shared_ptr<StreamData>& unit,
                                        std::shared_ptr<StreamQueue>& queue, const char* mediaType) override;
    /// True when `queue` is empty.
    bool CanFinish(const StreamDataQueue& queue) override;
};

}  // namespace clipfileModule
