#pragma once

#include <cstdint>
#include <functional>
#include <optional>

#include "source/LookAhead.h"
#include "source/StreamClock.h"
#include "timing/ForwardSteps.h"

namespace receiver {

/// Holds the packets of a live transport stream behind what may be a step forward of its clock, until it is
/// known whether it is one or pictures are lost: at most a second of stream. It is one where no packet is
/// marked, no time has passed, and both media make it. Not for several threads.
class StepHold {
 public:
    using Sink = std::function<void(AVPacket&)>;

    /// `clock` must outlive this.
    explicit StepHold(StreamClock& clock) : clock_(clock) {}

    /// A packet behind the picture at `picture` is damaged, or some in front of it are missing.
    void Mark(std::int64_t picture) { marked_ = picture; }
    /// Takes the next packet, of pictures or sound where `medium` tells, behind the picture at `picture`, and
    /// gives `sink` those that may go on, in their order but for the medium that is waited for.
    void Put(AVPacket& packet, std::optional<StepWatch::Medium> medium, std::int64_t picture,
             const Sink& sink);
    /// Gives `sink` what is held.
    void Release(const Sink& sink);

 private:
    /// Nothing is known to be missing in front of the packet, but its stamp is late.
    bool LooksLikeAStep(StepWatch::Medium medium, const AVPacket& packet, std::int64_t picture);
    bool IsClean(std::int64_t picture) const;
    void Hold(AVPacket& packet);

    StreamClock& clock_;
    ForwardSteps steps_;
    Packets held_;
    std::optional<std::int64_t> marked_;
};

}  // namespace receiver
