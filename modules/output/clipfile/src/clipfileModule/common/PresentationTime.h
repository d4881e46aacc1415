#pragma once

#include <cstdint>

#include "StreamData.h"
#include "common/OutputSettings.h"
#include "common/RtpClock.h"

namespace clipfileModule {

/// How much later than it is decoded a picture may be shown, in ticks of 90 kHz: 3 s. The 16 pictures that a
/// decoder keeps (ITU-T H.264 A.3.1) last less at any rate, and what waits for longer would fill the caches.
inline constexpr std::int32_t kLongestPresentationDelay = 270000;

/// By how much later than it is decoded a video unit in decoding order is shown, as it says itself.
inline std::int32_t StampedDelay(const StreamData& unit) {
    // RTP timestamps have 32 bits (RFC 3550 5.1), whose distance holds over a wrap.
    return static_cast<std::int32_t>(static_cast<std::uint32_t>(unit.presentation_timestamp) -
                                     static_cast<std::uint32_t>(unit.rtp_timestamp));
}

/// False for a video unit in decoding order whose presentation time cannot be.
inline bool HasPresentationTime(const StreamData& unit) {
    return StampedDelay(unit) >= 0 && StampedDelay(unit) <= kLongestPresentationDelay;
}

/// When a video unit is shown, on the clock of its `rtp_timestamp`: when it is decoded, if it does not tell.
inline std::uint64_t PresentationRtp(const StreamData& unit, PictureOrder order) {
    if (order == PictureOrder::kPresentation || !HasPresentationTime(unit)) {
        return unit.rtp_timestamp;
    }
    return unit.rtp_timestamp + static_cast<std::uint64_t>(StampedDelay(unit));
}

/// The same instant in milliseconds, on the clock of its `timestamp`: as a unit is stamped whose RTP
/// timestamp this is.
inline std::uint64_t PresentationMilliSec(const StreamData& unit, PictureOrder order) {
    constexpr auto kTicks = static_cast<std::uint64_t>(kTicksPerMilliSec);
    return unit.timestamp + PresentationRtp(unit, order) / kTicks - unit.rtp_timestamp / kTicks;
}

}  // namespace clipfileModule
