#include "source/RetryPauses.h"

#include <algorithm>
#include <array>

#include "source/AwaitSource.h"

namespace receiver {
namespace {

/// In front of each attempt; the last one repeats.
constexpr std::array<std::chrono::seconds, 5> kPauses{std::chrono::seconds(1), std::chrono::seconds(2),
                                                      std::chrono::seconds(4), std::chrono::seconds(8),
                                                      std::chrono::seconds(15)};
/// A connection that has held so long was a good one.
constexpr std::chrono::seconds kGood{30};

}  // namespace

void RetryPauses::Lost(Clock::duration held) {
    if (held > kGood) {
        attempts_ = 0;
    }
}

std::chrono::milliseconds RetryPauses::Next(Clock::time_point now) const {
    using std::chrono::milliseconds;
    if (!listens_) {
        return kPauses[attempts_];
    }
    return std::max(milliseconds(0), std::chrono::ceil<milliseconds>(tried_ + kListenEvery - now));
}

void RetryPauses::Tried(Clock::time_point now) {
    attempts_ = std::min(attempts_ + 1, kPauses.size() - 1);
    tried_ = now;
}

}  // namespace receiver
