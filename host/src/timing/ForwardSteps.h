#pragma once

#include <cstdint>

#include "timing/StepWatch.h"

namespace receiver {

/// Tells a step forward of a source's clock from a loss where nothing else is known to be missing: the media
/// of a clock all make the step, and of what is lost in one medium alone the other goes on. Until then what
/// has made the step must wait. Ticks of 90000 a second. Not for several threads.
class ForwardSteps {
 public:
    using Medium = StepWatch::Medium;

    /// How long one medium waits for the other, in the time of either.
    static constexpr std::int64_t kPatience = 90000;

    /// A unit of `medium` stands `distance` behind `expected`, where it would stand were the source to go on
    /// evenly. Nothing may be in question.
    void Suspect(Medium medium, std::int64_t expected, std::int64_t distance) {
        suspect_ = Suspicion{medium, expected, distance};
    }

    enum class Verdict { kUnknown, kStep, kLoss };
    /// What the next unit of a medium tells of the suspicion, which is over with any other verdict than
    /// `kUnknown`.
    Verdict Look(Medium medium, std::int64_t expected, std::int64_t distance);

    /// Of the step that is in question, or was found last.
    std::int64_t Ticks() const { return suspect_.distance; }
    bool IsOf(Medium medium) const { return suspect_.medium == medium; }

 private:
    struct Suspicion {
        Medium medium = Medium::kVideo;
        std::int64_t expected = 0;
        std::int64_t distance = 0;
    };
    Suspicion suspect_;
};

}  // namespace receiver
