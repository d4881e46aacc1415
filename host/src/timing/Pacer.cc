#include "timing/Pacer.h"

#include <algorithm>

namespace receiver {

Pacer::Clock::time_point Pacer::Due(Duration time, Clock::time_point now) const {
    if (!mark_ || time <= mark_->time) {
        return now;
    }
    const std::chrono::duration<double, std::nano> wait(static_cast<double>((time - mark_->time).count()) /
                                                        speed_);
    return std::max(now, mark_->wall + std::chrono::duration_cast<Clock::duration>(wait));
}

void Pacer::Taken(Duration time, Clock::time_point now) {
    if (!mark_) {
        mark_ = {time, now};
    } else if (live_) {
        if (time > mark_->time) {
            mark_ = {time, now};
        }
    } else if (time > mark_->time) {
        const std::chrono::duration<double, std::nano> since(
            static_cast<double>((time - mark_->time).count()) / speed_);
        if (now - (mark_->wall + std::chrono::duration_cast<Clock::duration>(since)) > kCatchUp) {
            mark_ = {time, now};
        }
    }
}

}  // namespace receiver
