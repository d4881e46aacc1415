#include "timing/AudioBalance.h"

#include "timing/AudioGrid.h"

namespace receiver {
namespace {

constexpr std::int64_t kHalf = AudioGrid::kFrame / 2;

}  // namespace

void AudioBalance::Begin(std::int64_t picture, std::optional<std::int64_t> last) {
    picture_ = picture;
    behind_.reset();
    // The recorder takes it for the first one.
    if (last && *last >= picture - kHalf) {
        behind_ = picture - *last;
        next_ = *last + AudioGrid::kFrame;
    }
}

bool AudioBalance::Takes(std::int64_t time, std::int64_t passed) {
    if (!picture_) {
        return true;
    }
    if (behind_) {
        *behind_ += passed - (time - next_);
    } else {
        behind_ = *picture_ - time;
    }
    next_ = time + AudioGrid::kFrame;
    // Without a gap only the source's own clocks drift.
    behindGap_ = (behindGap_ || passed != 0) && *behind_ > kHalf;
    if (!behindGap_) {
        return true;
    }
    *behind_ -= AudioGrid::kFrame;
    return false;
}

}  // namespace receiver
