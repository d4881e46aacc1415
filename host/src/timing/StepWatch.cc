#include "timing/StepWatch.h"

#include "timing/Saturating.h"

namespace receiver {

std::optional<std::int64_t> StepWatch::Look(Medium medium, std::int64_t expected, std::int64_t distance) {
    if (distance > -kSmallest) {
        return std::nullopt;
    }
    const auto own = static_cast<std::size_t>(medium);
    const std::optional<Step>& other = last_[1 - own];
    const bool agreed = other && Distance(other->distance, distance) <= std::uint64_t{kAgreement} &&
                        Distance(other->time, expected) <= std::uint64_t{kPatience};
    if (!agreed) {
        last_[own] = Step{expected, distance};
        return std::nullopt;
    }
    last_ = {};
    return distance;
}

}  // namespace receiver
