#include "timing/ForwardSteps.h"

#include <algorithm>

#include "timing/Saturating.h"

namespace receiver {

ForwardSteps::Verdict ForwardSteps::Look(Medium medium, std::int64_t expected, std::int64_t distance) {
    if (medium == suspect_.medium) {
        const bool patient = distance - suspect_.distance <= kPatience;
        return patient ? Verdict::kUnknown : Verdict::kLoss;
    }
    if (Distance(distance, suspect_.distance) <= std::uint64_t{StepWatch::kAgreement}) {
        return Verdict::kStep;
    }
    const bool goesOn = expected >= suspect_.expected + std::min(suspect_.distance, kPatience);
    return goesOn ? Verdict::kLoss : Verdict::kUnknown;
}

}  // namespace receiver
