#pragma once

#include <cstdint>

#include "StreamData.h"
#include "common/OutputSettings.h"
#include "common/RtpClock.h"

namespace clipfileModule {

/// When a video unit is shown, on the clock of its `rtp_timestamp`.
inline std::uint64_t PresentationRtp(const StreamData& unit, PictureOrder order) {
    if (order == PictureOrder::kPresentation) {
        return unit.rtp_timestamp;
    }
    // RTP timestamps have 32 bits (RFC 3550 5.1), whose distance holds over a wrap.
    const auto later = static_cast<std::int32_t>(static_cast<std::uint32_t>(unit.presentation_timestamp) -
                                                 static_cast<std::uint32_t>(unit.rtp_timestamp));
    return unit.rtp_timestamp + static_cast<std::uint64_t>(std::int64_t{later});
}

/// The same instant in milliseconds, on the clock of its `timestamp`: as a unit is stamped whose RTP
/// timestamp this is.
inline std::uint64_t PresentationMilliSec(const StreamData& unit, PictureOrder order) {
    constexpr auto kTicks = static_cast<std::uint64_t>(kTicksPerMilliSec);
    return unit.timestamp + PresentationRtp(unit, order) / kTicks - unit.rtp_timestamp / kTicks;
}

}  // namespace clipfileModule
