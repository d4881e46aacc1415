#include "source/RetryPauses.h"

#include <algorithm>
#include <array>

#include "source/AwaitSource.h"

namespace receiver {
namespace {

using std::chrono::milliseconds;
using std::chrono::seconds;

/// In front of each attempt; the last one repeats.
constexpr std::array<seconds, 5> kPauses{seconds(1), seconds(2), seconds(4), seconds(8), seconds(15)};
/// A connection that has held so long was a good one.
constexpr seconds kGood{30};

}  // namespace

void RetryPauses::Lost(Clock::duration held) {
    if (held > kGood) {
        attempts_ = 0;
    }
}

milliseconds RetryPauses::Next(Clock::time_point now) const {
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
