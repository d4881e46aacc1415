#include "common/FrameRate.h"

#include <array>
#include <charconv>
#include <cmath>

namespace receiver {
namespace {

constexpr std::array<FrameRate, 8> kFrameRates{{
    {23980, 24000, 1001, 24, false},
    {24000, 24, 1, 24, false},
    {25000, 25, 1, 25, false},
    {29970, 30000, 1001, 30, true},
    {30000, 30, 1, 30, false},
    {50000, 50, 1, 50, false},
    {59940, 60000, 1001, 60, true},
    {60000, 60, 1, 60, false},
}};

/// 23.98 and 23.976, 29.97 and 29.9700, 59.94 and 59.9401 are what people and programs write for the exact
/// rates; the nearest two rates of the table, 23.976 and 24, lie 0.024 apart.
constexpr double kTolerance = 0.006;

std::optional<FrameRate> Nearest(double framesPerSecond) {
    for (const FrameRate& rate : kFrameRates) {
        const double exact = static_cast<double>(rate.numerator) / static_cast<double>(rate.denominator);
        if (std::abs(exact - framesPerSecond) < kTolerance) {
            return rate;
        }
    }
    return std::nullopt;
}

}  // namespace

std::optional<FrameRate> ParseFrameRate(std::string_view text) {
    double value = 0;
    const char* const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, value, std::chars_format::fixed);
    if (error != std::errc() || stop != end) {
        return std::nullopt;
    }
    return Nearest(value);
}

std::optional<FrameRate> NearestFrameRate(std::int64_t numerator, std::int64_t denominator) {
    if (numerator <= 0 || denominator <= 0) {
        return std::nullopt;
    }
    return Nearest(static_cast<double>(numerator) / static_cast<double>(denominator));
}

}  // namespace receiver
