#include "buffer/state/EndSyncRecState.h"

namespace clipfileModule {

EndSyncRecState::EndSyncRecState(StreamBufferInterface* owner)
    : CacheState("end_sync_rec", kEndSyncRecState, owner) {}

void EndSyncRecState::OnEnter() {
    buffer->NotifyEndSync();
}

std::shared_ptr<CacheState> EndSyncRecState::Execute(const std::shared_ptr<StreamData>& /*unit*/,
                                                     std::shared_ptr<StreamQueue>& /*queue*/,
                                                     const char* /*mediaType*/) {
    return nullptr;
}

bool EndSyncRecState::CanFinish(const StreamDataQueue& queue) {
    return queue.Size() == 0;
}

}  // namespace clipfileModule
