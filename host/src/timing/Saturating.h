#pragma once

#include <cstdint>
#include <limits>

namespace receiver {

/// Sums of what a source stamps, which may be anything: what does not fit stays at the end of the range.
constexpr std::int64_t SaturatingAdd(std::int64_t a, std::int64_t b) {
    constexpr std::int64_t kLowest = std::numeric_limits<std::int64_t>::min();
    constexpr std::int64_t kHighest = std::numeric_limits<std::int64_t>::max();
    if (b > 0 && a > kHighest - b) {
        return kHighest;
    }
    if (b < 0 && a < kLowest - b) {
        return kLowest;
    }
    return a + b;
}

constexpr std::int64_t SaturatingSubtract(std::int64_t a, std::int64_t b) {
    constexpr std::int64_t kLowest = std::numeric_limits<std::int64_t>::min();
    constexpr std::int64_t kHighest = std::numeric_limits<std::int64_t>::max();
    if (b < 0 && a > kHighest + b) {
        return kHighest;
    }
    if (b > 0 && a < kLowest + b) {
        return kLowest;
    }
    return a - b;
}

/// How far apart two numbers are. Always fits.
constexpr std::uint64_t Distance(std::int64_t a, std::int64_t b) {
    const auto low = static_cast<std::uint64_t>(a < b ? a : b);
    const auto high = static_cast<std::uint64_t>(a < b ? b : a);
    return high - low;
}

}  // namespace receiver
