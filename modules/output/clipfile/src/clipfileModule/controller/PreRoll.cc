#include "controller/PreRoll.h"

#include <algorithm>

#include "common/PresentationTime.h"

namespace clipfileModule {

namespace {

/// Coded order may lie 16 frames behind presentation order (ITU-T H.264 A.3.1), which is 667 ms at 23.98
/// frames a second.
constexpr std::uint64_t kReordering = 700;
/// A loss of this length is taken for a leap, which costs no more than the pre-roll.
constexpr std::uint64_t kLongestGap = 1000;

/// Ranks of video, audio and metadata at the same instant.
constexpr std::array<int, 3> kRanks = {2, 1, 0};

}  // namespace

bool PreRoll::Track::IsLeap(std::uint64_t timestamp) const {
    if (!newest) {
        return false;
    }
    return timestamp + kReordering < *newest || (!gapExpected && timestamp > *newest + kLongestGap);
}

void PreRoll::Follow(Medium medium, std::uint64_t timestamp) {
    Track& track = tracks_[static_cast<std::size_t>(medium)];
    if (track.IsLeap(timestamp)) {
        takeLeap(track);
        track.newest = timestamp;
    } else {
        if (track.leapsOwed > 0 && --track.patience == 0) {
            // It would have come by now: the other medium had a gap of its own.
            track.leapsOwed = 0;
        }
        track.newest = std::max(track.newest.value_or(0), timestamp);
    }
    track.gapExpected = false;
}

void PreRoll::takeLeap(Track& leapt) {
    leapt.units.clear();
    if (leapt.leapsOwed > 0) {
        --leapt.leapsOwed;
        return;
    }
    for (std::size_t i = 0; i < tracks_.size(); ++i) {
        Track& other = tracks_[i];
        if (&other != &leapt) {
            other.units.clear();
            ++other.leapsOwed;
            other.patience = kDepths[i];
        }
    }
}

void PreRoll::Add(Medium medium, const std::shared_ptr<StreamData>& unit) {
    Follow(medium, unit->timestamp);
    const auto index = static_cast<std::size_t>(medium);
    Track& track = tracks_[index];
    if (track.leapsOwed > 0) {
        return;
    }
    track.units.push_back(unit);
    if (track.units.size() > kDepths[index]) {
        track.units.pop_front();
    }
}

void PreRoll::Skip(Medium medium, std::uint64_t timestamp) {
    Track& track = tracks_[static_cast<std::size_t>(medium)];
    track.newest = std::max(track.newest.value_or(0), timestamp);
}

void PreRoll::Clear() {
    for (Track& track : tracks_) {
        track.units.clear();
        track.gapExpected = true;
    }
}

std::vector<PreRoll::Entry> PreRoll::From(std::uint64_t timestamp) const {
    std::vector<Entry> entries;
    std::array<std::size_t, 3> next = {};
    bool hasPicture = false;
    const auto belongs = [&](Medium medium, const StreamData& unit) {
        if (medium == Medium::kVideo) {
            // In decoding order what follows may be shown earlier, and is needed all the same.
            return (hasPicture && pictureOrder_ == PictureOrder::kDecoding) ||
                   PresentationMilliSec(unit, pictureOrder_) >= timestamp;
        }
        const std::uint64_t lead = medium == Medium::kAudio ? kAudioLead : 0;
        return unit.timestamp + lead >= timestamp;
    };
    while (true) {
        std::optional<std::size_t> first;
        for (std::size_t i = 0; i < tracks_.size(); ++i) {
            const auto& units = tracks_[i].units;
            while (next[i] < units.size() && !belongs(static_cast<Medium>(i), *units[next[i]])) {
                ++next[i];
            }
            if (next[i] == units.size()) {
                continue;
            }
            if (!first) {
                first = i;
                continue;
            }
            const std::uint64_t mine = units[next[i]]->timestamp;
            const std::uint64_t earliest = tracks_[*first].units[next[*first]]->timestamp;
            if (mine < earliest || (mine == earliest && kRanks[i] < kRanks[*first])) {
                first = i;
            }
        }
        if (!first) {
            return entries;
        }
        entries.push_back({static_cast<Medium>(*first), tracks_[*first].units[next[*first]++]});
        hasPicture = hasPicture || entries.back().medium == Medium::kVideo;
    }
}

std::optional<std::uint64_t> PreRoll::Newest() const {
    std::optional<std::uint64_t> newest;
    for (const Track& track : tracks_) {
        if (track.newest && track.leapsOwed == 0) {
            newest = std::max(newest.value_or(0), *track.newest);
        }
    }
    return newest;
}

}  // namespace clipfileModule
