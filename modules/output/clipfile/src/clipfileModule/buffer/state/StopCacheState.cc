#include "buffer/state/StopCacheState.h"

namespace clipfileModule {

StopCacheState::StopCacheState(StreamBufferInterface* owner) : CacheState("stop", kStopState, owner) {}

std::shared_ptr<CacheState> StopCacheState::Execute(const std::shared_ptr<StreamData>& /*unit*/,
                                                    std::shared_ptr<StreamQueue>& /*queue*/,
                                                    const char* /*mediaType*/) {
    return nullptr;
}

}  // namespace clipfileModule
