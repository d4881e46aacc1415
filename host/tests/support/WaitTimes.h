#pragma once

#include <chrono>

/// For waits with a time-out: one that asks and does not wait, and one that no healthy test comes near.
inline constexpr std::chrono::milliseconds kNow{0};
inline constexpr std::chrono::seconds kDeadline{30};
