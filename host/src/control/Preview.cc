#include "control/Preview.h"

namespace receiver {
namespace {

/// A second, and one frame in front of it.
constexpr std::size_t kAudioFrames = (kAudioClock + kAudioFrame - 1) / kAudioFrame + 1;

}  // namespace

void Preview::LookAt(const SourceUnit& unit) {
    if (unit.medium == Medium::kVideo && unit.keyFrame) {
        const std::lock_guard lock(mutex_);
        picture_ = unit.data;
        pictureSize_ = unit.size;
        ++number_;
    } else if (unit.medium == Medium::kAudio) {
        const std::lock_guard lock(mutex_);
        audio_.push_back({unit.data, unit.size});
        if (audio_.size() > kAudioFrames) {
            audio_.pop_front();
        }
    }
}

Preview::Material Preview::Take() const {
    const std::lock_guard lock(mutex_);
    return {picture_, pictureSize_, number_, {audio_.begin(), audio_.end()}};
}

}  // namespace receiver
