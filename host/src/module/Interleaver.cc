#include "module/Interleaver.h"

#include <algorithm>
#include <utility>

namespace receiver {
namespace {

/// Both clocks divide it.
constexpr std::int64_t kCommonClock = 720000;

constexpr std::size_t kKlvIndex = 0;
constexpr std::size_t kVideoIndex = 1;
constexpr std::size_t kAudioIndex = 2;

std::size_t IndexOf(Medium medium) {
    switch (medium) {
        case Medium::kKlv:
            return kKlvIndex;
        case Medium::kVideo:
            return kVideoIndex;
        case Medium::kAudio:
            return kAudioIndex;
    }
    return kVideoIndex;
}

std::int64_t CommonTime(const SourceUnit& unit) {
    return unit.time * (kCommonClock / (unit.medium == Medium::kAudio ? kAudioClock : kVideoClock));
}

}  // namespace

void Interleaver::Put(SourceUnit unit) {
    const std::size_t index = IndexOf(unit.medium);
    latest_[index] = std::max(latest_[index], CommonTime(unit));
    waiting_[index].push_back(std::move(unit));
}

std::deque<SourceUnit>* Interleaver::Next() {
    std::deque<SourceUnit>* first = nullptr;
    for (std::deque<SourceUnit>& units : waiting_) {
        if (!units.empty() && (first == nullptr || CommonTime(units.front()) < CommonTime(first->front()))) {
            first = &units;
        }
    }
    return first;
}

SourceUnit Interleaver::PopFront(std::deque<SourceUnit>& units) {
    SourceUnit unit = std::move(units.front());
    units.pop_front();
    return unit;
}

std::optional<SourceUnit> Interleaver::Take() {
    std::deque<SourceUnit>* const first = Next();
    if (first == nullptr) {
        return std::nullopt;
    }
    const std::int64_t time = CommonTime(first->front());
    const std::int64_t newest = std::max(latest_[kVideoIndex], latest_[kAudioIndex]);
    const bool complete = latest_[kVideoIndex] >= time && latest_[kAudioIndex] >= time;
    if (!complete && newest - time <= kPatienceSeconds * kCommonClock) {
        return std::nullopt;
    }
    return PopFront(*first);
}

std::optional<SourceUnit> Interleaver::TakeRest() {
    std::deque<SourceUnit>* const first = Next();
    return first != nullptr ? std::optional<SourceUnit>(PopFront(*first)) : std::nullopt;
}

}  // namespace receiver
