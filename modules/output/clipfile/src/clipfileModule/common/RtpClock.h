#pragma once

#include <cstdint>

namespace clipfileModule {

/// Ticks in a millisecond of the 90 kHz clock (RFC 6184 8.2.1) that start and stop timestamps count.
inline constexpr std::int64_t kTicksPerMilliSec = 90;

}  // namespace clipfileModule
