#include "GroupWatch.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <numeric>

namespace receiver {
namespace {

constexpr std::int64_t kChunk = 8;
/// How long a file may grow beyond its length until an IDR frame comes in step.
constexpr std::int64_t kPatienceSeconds = 120;
/// Groups of which no two that follow each other are alike.
constexpr std::size_t kIrregular = 8;
/// With so many IDR frames to be expected in step within the patience, one will come.
constexpr std::int64_t kChances = 5;
/// The longest group that is recommended, in seconds.
constexpr std::int64_t kLongestAdvice = 4;

}  // namespace

std::int64_t CadenceOf(const FrameRate& rate) {
    std::int64_t pictures = kChunk;
    while (pictures * rate.denominator * kAudioClock % (rate.numerator * kAudioFrame) != 0) {
        pictures += kChunk;
    }
    return pictures;
}

GroupWatch::GroupWatch(const FrameRate& rate, std::int64_t minutes, std::uint32_t expected, bool reordered)
    : rate_(rate), minutes_(minutes), expected_(expected), cadence_(CadenceOf(rate)), reordered_(reordered) {}

std::optional<std::string> GroupWatch::Look(const SourceUnit& unit) {
    if (done_ || unit.medium != Medium::kVideo) {
        return std::nullopt;
    }
    if (!told_ && expected_ > 0) {
        told_ = true;
        if (auto notice = Judge(expected_)) {
            return notice;
        }
    }
    if (!unit.keyFrame) {
        return std::nullopt;
    }
    if (lastKeyFrame_) {
        // By time, so that lost pictures count.
        const std::int64_t period = kVideoClock * rate_.denominator;
        groups_.push_back(((unit.time - *lastKeyFrame_) * rate_.numerator + period / 2) / period);
    }
    lastKeyFrame_ = unit.time;
    return Measured();
}

std::optional<std::string> GroupWatch::Measured() {
    const std::size_t count = groups_.size();
    if (count >= 2 && groups_[count - 1] == groups_[count - 2]) {
        done_ = true;
        const std::int64_t group = groups_.back();
        if (expected_ == 0) {
            return Judge(group);
        }
        if (group == expected_) {
            return std::nullopt;
        }
        const auto judgement = Judge(group);
        return "the source has " + std::to_string(group) + " pictures in a group, and --gop says " +
               std::to_string(expected_) + (judgement ? ": " + *judgement : "");
    }
    if (count >= kIrregular) {
        done_ = true;
        return JudgeIrregular();
    }
    return std::nullopt;
}

bool GroupWatch::EndsInTime(std::int64_t group) const {
    const std::int64_t meeting = std::lcm(cadence_, group) * rate_.denominator;
    // In ticks of which a second has `numerator`.
    const std::int64_t length = minutes_ * 60 * rate_.numerator;
    const std::int64_t end = std::max<std::int64_t>(1, (length + meeting - 1) / meeting) * meeting;
    return end - length < kPatienceSeconds * rate_.numerator;
}

std::int64_t GroupWatch::BetterThan(std::int64_t group) const {
    const std::int64_t longest = std::max<std::int64_t>(group, kLongestAdvice * rate_.timecodeFrames);
    for (std::int64_t distance = 1; distance < longest; ++distance) {
        for (const std::int64_t other : {group - distance, group + distance}) {
            if (other > 0 && other <= longest && EndsInTime(other)) {
                return other;
            }
        }
    }
    return kChunk;
}

std::optional<std::string> GroupWatch::Judge(std::int64_t group) const {
    if (EndsInTime(group)) {
        return std::nullopt;
    }
    const std::int64_t meeting = std::lcm(cadence_, group);
    return "an IDR frame comes every " + std::to_string(group) + " pictures, " + InStep() +
           ", and the two meet every " + Seconds(meeting) + " only: " +
           (reordered_ ? Files() + " get two minutes more"
                       : "the file behind one of " + std::to_string(minutes_) +
                             " minutes begins with a picture that cannot be shown by itself") +
           "; set the encoder to groups of " + std::to_string(BetterThan(group)) + " pictures";
}

std::optional<std::string> GroupWatch::JudgeIrregular() const {
    const auto [shortest, longest] = std::minmax_element(groups_.begin(), groups_.end());
    const std::int64_t sum = std::accumulate(groups_.begin(), groups_.end(), std::int64_t{0});
    const std::int64_t inStep = kPatienceSeconds * rate_.numerator / rate_.denominator / cadence_;
    if (inStep * static_cast<std::int64_t>(groups_.size()) >= kChances * sum) {
        return std::nullopt;
    }
    return "IDR frames come at distances that vary from " + std::to_string(*shortest) + " to " +
           std::to_string(*longest) + " pictures, and " + InStep() +
           (reordered_ ? ": " + Files() + " may get two minutes more"
                       : ": a file that follows on another may begin with a picture that cannot be shown by "
                         "itself") +
           "; set the encoder to groups of one length";
}

std::string GroupWatch::Files() const {
    return "files of " + std::to_string(minutes_) + " minutes";
}

std::string GroupWatch::InStep() const {
    return "picture and sound are in step every " + std::to_string(cadence_);
}

std::string GroupWatch::Seconds(std::int64_t pictures) const {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%.1f s",
                  static_cast<double>(pictures * rate_.denominator) / static_cast<double>(rate_.numerator));
    return text.data();
}

}  // namespace receiver
