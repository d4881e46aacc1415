#include "buffer/state/ErrorCacheState.h"

namespace clipfileModule {

ErrorCacheState::ErrorCacheState(StreamBufferInterface* owner) : CacheState("error", kErrorState, owner) {}

std::shared_ptr<CacheState> ErrorCacheState::Execute(const std::shared_ptr<StreamData>& /*unit*/,
                                                     std::shared_ptr<StreamQueue>& /*queue*/,
                                                     const char* /*mediaType*/) {
    return nullptr;
}

}  // namespace clipfileModule
