#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <optional>

namespace receiver {

/// Finds steps back of a source's clock that are too small to be told from jitter by one medium alone: all
/// media make the same step within a few seconds. A step forward looks like a loss of both, and is placed
/// like one unless `ForwardSteps` has told it from that. Ticks of 90000 a second. Not for several threads.
class StepWatch {
 public:
    /// Two media.
    enum class Medium : std::size_t { kVideo, kAudio };

    /// The smallest step that counts: below it audio frames keep their places.
    static constexpr std::int64_t kSmallest = 1350;
    /// How far the steps of two media may differ.
    static constexpr std::int64_t kAgreement = 720;
    /// How long one medium waits for the other.
    static constexpr std::int64_t kPatience = std::int64_t{5} * 90000;

    /// A unit stands `distance` away from `expected`, where it would stand were the source to go on evenly.
    /// Gives the step, below 0, when the other medium has made it before.
    std::optional<std::int64_t> Look(Medium medium, std::int64_t expected, std::int64_t distance);

 private:
    struct Step {
        std::int64_t time = 0;
        std::int64_t distance = 0;
    };

    std::array<std::optional<Step>, 2> last_;
};

}  // namespace receiver
