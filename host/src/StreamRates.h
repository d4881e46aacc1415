#pragma once

#include <cstdint>
#include <optional>

#include "source/SourceInterface.h"

namespace receiver {

/// Rates of a stream over its last whole second, measured on the stream's own clock.
class StreamRates {
 public:
    void Count(const SourceUnit& unit);

    double FramesPerSecond() const { return framesPerSecond_; }
    double VideoKilobits() const { return videoKilobits_; }
    double AudioKilobits() const { return audioKilobits_; }
    /// Since the beginning.
    std::uint64_t KlvPackets() const { return klvPackets_; }

 private:
    std::optional<std::int64_t> begin_;
    std::uint64_t frames_ = 0;
    std::uint64_t videoBytes_ = 0;
    std::uint64_t audioBytes_ = 0;
    std::uint64_t klvPackets_ = 0;
    double framesPerSecond_ = 0;
    double videoKilobits_ = 0;
    double audioKilobits_ = 0;
};

}  // namespace receiver
