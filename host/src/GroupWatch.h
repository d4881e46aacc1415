#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "common/FrameRate.h"
#include "source/SourceInterface.h"

namespace receiver {

/// Pictures from one place to the next at which a file may end: whole chunks of 8, and whole audio frames.
std::int64_t CadenceOf(const FrameRate& rate);

/// Measures the groups of pictures of a stream, and finds out beforehand whether a file of the length that is
/// set can be followed by one that begins with an IDR frame. The module begins a new file where picture and
/// sound are in step, waits for an IDR frame there for two minutes, and then takes any picture; of reordered
/// ones any IDR frame.
class GroupWatch {
 public:
    /// `minutes`: the length of files. `expected`: pictures in a group by the operator's word, 0 without one.
    /// `reordered`: pictures come in another order than they are shown in.
    GroupWatch(const FrameRate& rate, std::int64_t minutes, std::uint32_t expected, bool reordered = false);

    /// What the operator should be told, if anything: once by what is expected, and once by what was measured
    /// if that is something else.
    std::optional<std::string> Look(const SourceUnit& unit);

 private:
    std::optional<std::string> Measured();
    std::optional<std::string> Judge(std::int64_t group) const;
    std::optional<std::string> JudgeIrregular() const;
    /// True when an IDR frame comes in step in time behind the length of a file.
    bool EndsInTime(std::int64_t group) const;
    std::int64_t BetterThan(std::int64_t group) const;
    std::string InStep() const;
    std::string Files() const;
    std::string Seconds(std::int64_t pictures) const;

    const FrameRate rate_;
    const std::int64_t minutes_;
    const std::int64_t expected_;
    const std::int64_t cadence_;
    const bool reordered_;
    bool told_ = false;
    bool done_ = false;
    std::optional<std::int64_t> lastKeyFrame_;
    std::vector<std::int64_t> groups_;
};

}  // namespace receiver
