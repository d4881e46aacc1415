#pragma once

#include "buffer/state/CacheState.h"

namespace clipfileModule {

/// A limit was passed. The recording waits for `StreamBuffer::Stop`.
class ErrorCacheState : public CacheState {
 public:
    explicit ErrorCacheState(StreamBufferInterface* owner);

    /// Drops the unit.
    std::shared_ptr<CacheState> Execute(const std::shared_ptr<StreamData>& unit,
                                        std::shared_ptr<StreamQueue>& queue, const char* mediaType) override;
};

}  // namespace clipfileModule
