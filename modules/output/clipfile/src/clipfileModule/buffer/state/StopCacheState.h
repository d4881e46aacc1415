#pragma once

#include "buffer/state/CacheState.h"

namespace clipfileModule {

/// Nothing is recorded: before `StreamBuffer::Start` and after `StreamBuffer::Stop`.
class StopCacheState : public CacheState {
 public:
    explicit StopCacheState(StreamBufferInterface* owner);

    /// Drops the unit.
    std::shared_ptr<CacheState> Execute(const std::shared_ptr<StreamData>& unit,
                                        std::shared_ptr<StreamQueue>& queue, const char* mediaType) override;
};

}  // namespace clipfileModule
