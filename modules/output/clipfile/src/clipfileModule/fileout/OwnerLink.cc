#include "fileout/OwnerLink.h"

#include <utility>

namespace clipfileModule {

void OwnerLink::SetStatus(int status, int cause) {
    const std::lock_guard lock(mutex_);
    if (!cut_) {
        controller_->SetStatus(status, cause);
    }
}

void OwnerLink::PostEvent(std::shared_ptr<Event> event) {
    const std::lock_guard lock(mutex_);
    if (!cut_) {
        controller_->PostEvent(std::move(event));
    }
}

bool OwnerLink::MakeFileTimecode(const std::shared_ptr<ChunkData>& chunk) {
    const std::lock_guard lock(mutex_);
    return !cut_ && buffer_->MakeFileTimecode(chunk);
}

bool OwnerLink::GetFileTimecode(unsigned char* timecode, bool* dropFrame) {
    const std::lock_guard lock(mutex_);
    return !cut_ && buffer_->GetFileTimecode(timecode, dropFrame);
}

bool OwnerLink::GetFileTimecode(unsigned char* timecode) {
    const std::lock_guard lock(mutex_);
    return !cut_ && buffer_->GetFileTimecode(timecode);
}

bool OwnerLink::Cut(std::chrono::milliseconds wait) {
    cut_ = true;
    const std::unique_lock lock(mutex_, wait);
    return lock.owns_lock();
}

}  // namespace clipfileModule
