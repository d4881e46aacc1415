#include "operator/RecordPlan.h"

#include <charconv>
#include <cmath>

#include "source/SourceInterface.h"

namespace receiver {
namespace {

/// A year; beyond it somebody has mistyped.
constexpr double kMaxSeconds = 366.0 * 86400;

std::optional<std::int64_t> ParseSeconds(std::string_view text) {
    double seconds = 0;
    const char* const end = text.data() + text.size();
    const auto [stop, error] = std::from_chars(text.data(), end, seconds, std::chars_format::fixed);
    if (error != std::errc() || stop != end || !(seconds >= 0) || seconds > kMaxSeconds) {
        return std::nullopt;
    }
    return std::llround(seconds * static_cast<double>(kVideoClock));
}

std::optional<RecordRange> ParseRange(std::string_view text) {
    const std::size_t dash = text.find('-');
    if (dash == std::string_view::npos) {
        return std::nullopt;
    }
    const std::optional<std::int64_t> begin = ParseSeconds(text.substr(0, dash));
    if (!begin) {
        return std::nullopt;
    }
    if (dash + 1 == text.size()) {
        return RecordRange{*begin, std::nullopt};
    }
    const std::optional<std::int64_t> end = ParseSeconds(text.substr(dash + 1));
    if (!end || *end <= *begin) {
        return std::nullopt;
    }
    return RecordRange{*begin, end};
}

}  // namespace

std::optional<std::vector<RecordRange>> ParseRecordRanges(std::string_view text) {
    std::vector<RecordRange> ranges;
    while (true) {
        const std::size_t comma = text.find(',');
        const std::optional<RecordRange> range = ParseRange(text.substr(0, comma));
        if (!range) {
            return std::nullopt;
        }
        if (!ranges.empty() && (!ranges.back().end || *ranges.back().end >= range->begin)) {
            return std::nullopt;
        }
        ranges.push_back(*range);
        if (comma == std::string_view::npos) {
            return ranges;
        }
        text.remove_prefix(comma + 1);
    }
}

RecordPlan::RecordPlan(std::vector<RecordRange> ranges) : wanted_(ranges.empty()) {
    for (const RecordRange& range : ranges) {
        borders_.push_back({range.begin, true});
        if (range.end) {
            borders_.push_back({*range.end, false});
        }
    }
}

bool RecordPlan::Next(std::int64_t elapsed, bool keyFrame) {
    bool ended = false;
    for (; passed_ < borders_.size() && borders_[passed_].time <= elapsed; ++passed_) {
        wanted_ = borders_[passed_].record && !finished_;
        ended = ended || !wanted_;
    }
    // An end that the next beginning follows within a frame still takes a frame without the flag, or the two
    // ranges would be one recording.
    const bool goesOn = recording_ && !ended;
    const bool begins = !recording_ && keyFrame;
    recording_ = wanted_ && (goesOn || begins);
    return recording_;
}

}  // namespace receiver
