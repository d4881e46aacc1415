#include "StreamRates.h"

namespace receiver {

void StreamRates::Count(const SourceUnit& unit) {
    switch (unit.medium) {
        case Medium::kKlv:
            ++klvPackets_;
            return;
        case Medium::kAudio:
            audioBytes_ += unit.size;
            return;
        case Medium::kVideo:
            break;
    }
    begin_ = begin_.value_or(unit.time);
    const std::int64_t ticks = unit.time - *begin_;
    if (ticks >= kVideoClock) {
        const double seconds = static_cast<double>(ticks) / static_cast<double>(kVideoClock);
        framesPerSecond_ = static_cast<double>(frames_) / seconds;
        videoKilobits_ = static_cast<double>(videoBytes_) * 8 / 1000 / seconds;
        audioKilobits_ = static_cast<double>(audioBytes_) * 8 / 1000 / seconds;
        begin_ = unit.time;
        frames_ = 0;
        videoBytes_ = 0;
        audioBytes_ = 0;
    }
    ++frames_;
    videoBytes_ += unit.size;
}

}  // namespace receiver
