#include "operator/RecordPlan.h"

#include <charconv>
#include <cmath>
#include <utility>

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

RecordDecision RecordPlan::Next(std::int64_t elapsed, bool keyFrame) {
    bool ends = std::exchange(stopped_, false);
    for (; passed_ < borders_.size() && borders_[passed_].time <= elapsed; ++passed_) {
        const Border& border = borders_[passed_];
        if (!border.record) {
            Unwant(border.time);
            ends = true;
        } else if (!finished_) {
            Want(border.time);
        }
    }
    elapsed_ = elapsed;
    RecordDecision decision;
    decision.ended = recording_ && (ends || !wanted_ || (split_ && keyFrame));
    decision.begun = wanted_ && keyFrame && (!recording_ || decision.ended);
    decision.record = decision.begun || (recording_ && !decision.ended);
    recording_ = decision.record;
    if (decision.begun) {
        begun_ = true;
        split_ = false;
        waitingSince_.reset();
    } else if (wanted_ && !begun_ && !waitingSince_) {
        waitingSince_ = elapsed;
    }
    return decision;
}

void RecordPlan::Start() {
    if (!finished_ && !wanted_) {
        wanted_ = true;
        begun_ = false;
    }
}

void RecordPlan::Stop() {
    Unwant(elapsed_.value_or(0));
    stopped_ = true;
}

void RecordPlan::Finish() {
    Unwant(elapsed_.value_or(0));
    finished_ = true;
}

void RecordPlan::Want(std::int64_t since) {
    if (!wanted_) {
        wanted_ = true;
        begun_ = false;
        waitingSince_ = since;
    }
}

void RecordPlan::Unwant(std::int64_t end) {
    if (wanted_ && waitingSince_) {
        missed_.push_back({*waitingSince_, end});
    }
    wanted_ = false;
    split_ = false;
    waitingSince_.reset();
}

std::vector<MissedRecording> RecordPlan::TakeMissed() {
    return std::exchange(missed_, {});
}

std::optional<RecordRange> RecordPlan::Unreached() const {
    for (std::size_t i = passed_; i < borders_.size(); ++i) {
        if (borders_[i].record) {
            const bool closed = i + 1 < borders_.size();
            return RecordRange{borders_[i].time,
                               closed ? std::optional<std::int64_t>(borders_[i + 1].time) : std::nullopt};
        }
    }
    return std::nullopt;
}

}  // namespace receiver
