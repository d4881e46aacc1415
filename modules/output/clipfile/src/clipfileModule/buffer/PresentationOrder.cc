#include "buffer/PresentationOrder.h"

#include <algorithm>

namespace clipfileModule {

namespace {

/// More pictures than are ever decoded ahead of the end of a record: what a cache can hold.
constexpr std::size_t kKept = 600;

}  // namespace

void PresentationOrder::Begin(std::int64_t delay) {
    delay_ = delay;
    decoded_ = 0;
    firstFree_ = 0;
    taken_.clear();
    lately_.clear();
}

std::int32_t PresentationOrder::Place(const std::uint64_t* times, std::size_t count, bool isIdr) {
    if (isIdr) {
        firstFree_ = decoded_;
        taken_.clear();
    }
    // Those that follow and are shown earlier leave it the next one of the free places.
    auto before = isIdr ? 0 : std::count_if(times + 1, times + count, [shown = times[0]](std::uint64_t time) {
        return time < shown;
    });
    std::uint64_t place = firstFree_;
    for (; before > 0 || taken_.contains(place); ++place) {
        before -= taken_.contains(place) ? 0 : 1;
    }
    taken_.insert(place);
    while (taken_.erase(firstFree_) != 0) {
        ++firstFree_;
    }
    lately_.push_back(times[0]);
    if (lately_.size() > kKept) {
        lately_.pop_front();
    }
    const auto later = static_cast<std::int64_t>(place - decoded_++) + delay_;
    return static_cast<std::int32_t>(std::max<std::int64_t>(0, later));
}

std::uint64_t PresentationOrder::CountFrom(std::uint64_t end) const {
    return static_cast<std::uint64_t>(
        std::count_if(lately_.begin(), lately_.end(), [end](std::uint64_t time) { return time >= end; }));
}

}  // namespace clipfileModule
