#pragma once

#include <cstdint>

/// Of the clock of all times, 90000 ticks a second, and a frame at 25 frames a second.
inline constexpr std::int64_t kSecond = 90000;
inline constexpr std::int64_t kFrame = 3600;
