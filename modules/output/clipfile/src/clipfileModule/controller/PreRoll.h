#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <deque>
#include <memory>
#include <optional>
#include <vector>

#include "StreamData.h"
#include "common/OutputSettings.h"

namespace clipfileModule {

/// The three media, in the order of the controller's queues.
enum class Medium : std::size_t { kVideo, kAudio, kMeta };

/// Keeps the units of the stream that went by lately, for recordings that start a little in the past: the
/// queues of the three media are emptied by a thread each, so when the metadata thread meets a record
/// command, the picture of that instant and the audio around it may have gone by already.
///
/// How deep: behind the command's unit, which the metadata thread has in hand, at most 50 more wait in its
/// queue, one a frame. Up to 51 frames of the other media have been pushed in that time and may have gone by:
/// at 23.98 frames a second 2127 ms, or 100 audio frames of 1024 samples at 48 kHz. What is left of the
/// depths, half a second, is for hosts that push a medium ahead of the others.
///
/// One thread at a time.
class PreRoll {
 public:
    struct Entry {
        Medium medium;
        std::shared_ptr<StreamData> unit;
    };

    /// Units that are kept of video, audio and metadata.
    static constexpr std::array<std::size_t, 3> kDepths = {64, 128, 64};
    /// Half an audio frame in milliseconds, rounded up: audio of a record may begin so long before it.
    static constexpr std::uint64_t kAudioLead = 11;

    /// How video comes. Before the first unit.
    void SetPictureOrder(PictureOrder order) { pictureOrder_ = order; }
    /// Takes note that the stream of a medium has come to `timestamp`, in milliseconds. A leap of its clock
    /// drops what is kept, of all media, and keeps their units out until they have leapt as well: what was
    /// stamped by another clock is never replayed.
    void Follow(Medium medium, std::uint64_t timestamp);
    /// The same for a unit that is handed to the recordings, which is kept.
    void Add(Medium medium, const std::shared_ptr<StreamData>& unit);
    /// The same for units that were dropped, up to `timestamp`, and went to nobody.
    void Skip(Medium medium, std::uint64_t timestamp);
    /// Drops what is kept. The gap that follows is no leap.
    void Clear();

    /// The units that are presented from `timestamp` on, and the audio from `kAudioLead` before it on, as
    /// they are to be replayed: each medium in its own order, the media in step, at the same instant
    /// metadata, audio, video.
    std::vector<Entry> From(std::uint64_t timestamp) const;
    /// The latest instant of all media so far, in milliseconds; nothing before the first unit.
    std::optional<std::uint64_t> Newest() const;

 private:
    struct Track {
        std::deque<std::shared_ptr<StreamData>> units;
        std::optional<std::uint64_t> newest;
        bool gapExpected = false;
        /// Leaps of other media that this one has still to make, and how many units may come before.
        std::size_t leapsOwed = 0;
        std::size_t patience = 0;

        bool IsLeap(std::uint64_t timestamp) const;
    };

    void takeLeap(Track& leapt);

    PictureOrder pictureOrder_ = PictureOrder::kPresentation;
    std::array<Track, 3> tracks_;
};

}  // namespace clipfileModule
