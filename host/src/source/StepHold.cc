#include "source/StepHold.h"

#include <utility>

#include "timing/Timeline.h"

namespace receiver {
namespace {

/// Of shorter steps the time of arrival does not tell whether something is missing. In ticks.
constexpr std::int64_t kShortest = 36000;
/// Ticks behind a mark in which a late stamp is a loss.
constexpr std::int64_t kUnclean = 90000;

}  // namespace

void StepHold::Put(AVPacket& packet, std::optional<StepWatch::Medium> medium, std::int64_t picture,
                   const Sink& sink) {
    using Verdict = ForwardSteps::Verdict;
    if (held_.empty()) {
        if (medium && LooksLikeAStep(*medium, packet, picture)) {
            Hold(packet);
        } else {
            sink(packet);
        }
        return;
    }
    const auto offset = medium ? clock_.OffsetOf(*medium, packet) : std::nullopt;
    const Verdict verdict =
        offset ? steps_.Look(*medium, offset->expected, offset->distance) : Verdict::kUnknown;
    if (verdict == Verdict::kUnknown && (!medium || steps_.IsOf(*medium))) {
        Hold(packet);
        return;
    }
    if (verdict == Verdict::kStep && IsClean(picture)) {
        clock_.StepForward(steps_.Ticks());
    }
    if (verdict != Verdict::kUnknown) {
        Release(sink);
    }
    sink(packet);
}

void StepHold::Release(const Sink& sink) {
    for (const auto& packet : std::exchange(held_, {})) {
        sink(*packet);
    }
}

bool StepHold::LooksLikeAStep(StepWatch::Medium medium, const AVPacket& packet, std::int64_t picture) {
    const auto offset = clock_.OffsetOf(medium, packet);
    if (!offset || offset->distance < kShortest || offset->distance > Timeline::kLongestGap ||
        !IsClean(picture) || clock_.HasPaused(medium, offset->distance)) {
        return false;
    }
    steps_.Suspect(medium, offset->expected, offset->distance);
    return true;
}

bool StepHold::IsClean(std::int64_t picture) const {
    return !marked_ || picture - *marked_ > kUnclean;
}

void StepHold::Hold(AVPacket& packet) {
    libav::Owner<AVPacket> held = libav::NewPacket();
    av_packet_move_ref(held.get(), &packet);
    held_.push_back(std::move(held));
}

}  // namespace receiver
