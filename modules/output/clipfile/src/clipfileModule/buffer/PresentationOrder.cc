#include "buffer/PresentationOrder.h"

#include <algorithm>
#include <iterator>

namespace clipfileModule {

namespace {

/// More pictures than are ever decoded ahead of the end of a record: what a cache can hold.
constexpr std::size_t kKept = 600;

}  // namespace

std::int64_t PresentationOrder::FindDelay(const std::vector<std::uint64_t>& times) {
    // What is decoded before a picture and shown behind it, it has to wait for.
    std::ptrdiff_t delay = 0;
    for (auto time = times.begin(); time != times.end(); ++time) {
        delay = std::max(delay, std::count_if(times.begin(), time,
                                              [time](std::uint64_t earlier) { return earlier > *time; }));
    }
    return delay;
}

void PresentationOrder::Begin(std::int64_t delay) {
    *this = PresentationOrder();
    delay_ = delay;
}

std::int32_t PresentationOrder::Place(const std::uint64_t* times, std::size_t count, bool isIdr) {
    if (isIdr) {
        // What was left open has no picture to come.
        firstFree_ = decoded_ + left_;
        taken_.clear();
        latest_.clear();
    }
    // Those that follow and are shown earlier leave it the next one of the free places.
    auto before = isIdr ? 0 : std::count_if(times + 1, times + count, [shown = times[0]](std::uint64_t time) {
        return time < shown;
    });
    std::uint64_t place = nextFree(firstFree_);
    for (; before > 0; --before) {
        place = nextFree(place + 1);
    }
    const std::int64_t earliest = static_cast<std::int64_t>(decoded_) - delay_;
    if (static_cast<std::int64_t>(place) < earliest) {
        leaveBefore(static_cast<std::uint64_t>(earliest));
        place = nextFree(firstFree_);
    }
    taken_.insert(place);
    while (taken_.erase(firstFree_) != 0) {
        ++firstFree_;
    }
    latest_.push_back(times[0]);
    if (latest_.size() > kKept) {
        latest_.pop_front();
    }
    return static_cast<std::int32_t>(static_cast<std::int64_t>(place - decoded_++) + delay_);
}

std::uint64_t PresentationOrder::nextFree(std::uint64_t place) const {
    while (taken_.contains(place)) {
        ++place;
    }
    return place;
}

void PresentationOrder::leaveBefore(std::uint64_t place) {
    for (; firstFree_ < place; ++firstFree_) {
        left_ += taken_.erase(firstFree_) == 0 ? 1 : 0;
    }
}

std::uint64_t PresentationOrder::CountFrom(std::uint64_t end) const {
    return static_cast<std::uint64_t>(
        std::count_if(latest_.begin(), latest_.end(), [end](std::uint64_t time) { return time >= end; }));
}

}  // namespace clipfileModule
