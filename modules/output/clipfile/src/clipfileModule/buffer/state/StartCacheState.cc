#include "buffer/state/StartCacheState.h"

namespace clipfileModule {

StartCacheState::StartCacheState(StreamBufferInterface* owner,
                                 const nal_access::NalUnit& sequenceParameterSet,
                                 const nal_access::NalUnit& pictureParameterSet,
                                 const std::shared_ptr<StreamData>& firstUnit)
    : CacheState("start", kStartState, owner),
      sps(sequenceParameterSet),
      pps(pictureParameterSet),
      idrUnit(firstUnit) {}

void StartCacheState::OnEnter() {
    buffer->SetVideoSequenceHeader(sps, pps, idrUnit);
}

std::shared_ptr<CacheState> StartCacheState::Execute(const std::shared_ptr<StreamData>& unit,
                                                     std::shared_ptr<StreamQueue>& queue,
                                                     const char* /*mediaType*/) {
    if (queue != nullptr) {
        queue->queue.Push(unit);
    }
    return nullptr;
}

bool StartCacheState::CanFinish(const StreamDataQueue& /*queue*/) {
    return false;
}

}  // namespace clipfileModule
