#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <optional>

#include "source/CodedUnits.h"
#include "source/Libav.h"
#include "timing/FrameGrid.h"
#include "timing/StepWatch.h"
#include "timing/Timeline.h"

namespace receiver {

/// Puts the packets of a connection on the line of time of the source, whatever the sender's clock does: it
/// may wrap, begin again, or be set. Times are ticks of 90000 a second.
class StreamClock {
 public:
    /// A stream, and how far it has come.
    struct Track {
        const AVStream* stream = nullptr;
        /// The last stamp, unwrapped, in the stream's own time base.
        std::optional<std::int64_t> last = {};
        /// Where the next packet would stand if nothing is missing, and when the last one came.
        std::int64_t expected = 0;
        std::chrono::steady_clock::time_point arrived = {};
        /// The last stamps, unwrapped, in ticks.
        std::deque<std::int64_t> recent = {};
        /// The last unit had a stamp that came before.
        bool stands = false;
        /// It is the decoding times that count.
        bool reordered = false;
    };

    /// `audio` may be null. `recorded`: what is read waits for us, so that its clock alone tells the time.
    /// `reordered`: pictures come in another order than they are shown in, and count by their turns, which
    /// stand in the place of decoding times.
    StreamClock(const AVStream& video, const AVStream* audio, bool recorded, bool reordered = false);

    /// The first IDR frame will stand at `begin`. `tell` hears of jumps.
    void Begin(std::int64_t begin, NoticeSink tell);
    bool Anchored() const { return line_.Anchored(); }
    /// That frame has come: it is stamped with `stamp`, and decoded `delay` before it is shown.
    void Anchor(std::int64_t stamp, std::int64_t delay);

    /// The packet's stamp, unwrapped. Nothing when it has none, or one that the stream had a moment ago: a
    /// clock that stands still tells nothing.
    std::optional<std::int64_t> VideoStamp(const AVPacket& packet);
    std::optional<std::int64_t> AudioStamp(const AVPacket& packet);
    /// The same, also a stamp that comes again.
    std::optional<std::int64_t> StampOf(Track& track, const AVPacket& packet);

    /// Where a packet is expected, and how far behind that it stands by its stamp.
    struct Offset {
        std::int64_t expected = 0;
        std::int64_t distance = 0;
    };
    /// Of a packet that is not entered yet. Nothing when it has no stamp, and of audio that has not joined.
    std::optional<Offset> OffsetOf(StepWatch::Medium medium, const AVPacket& packet);
    /// Most of so many ticks have passed since the last packet came: the source did pause.
    bool HasPaused(StepWatch::Medium medium, std::int64_t ticks) const;
    /// The source's clock made a step forward where its next packets are expected.
    void StepForward(std::int64_t ticks);

    /// Where a picture of `usual` ticks stands. It is stamped with `stamp`, if at all, and stamps follow each
    /// other in the order of time unless `reordered`.
    std::int64_t VideoTime(std::optional<std::int64_t> stamp, std::int64_t usual, bool reordered);
    /// The same for pictures that will stand on `grid`: behind a gap that is no whole number of pictures the
    /// line is moved on to its next place, so that the sound moves too.
    std::int64_t VideoTime(std::optional<std::int64_t> stamp, const FrameGrid& grid);
    /// Where an audio frame of `usual` ticks stands. `waited`: it came before the first IDR frame.
    std::int64_t AudioTime(std::optional<std::int64_t> stamp, std::int64_t usual, bool waited);
    /// Where a stamp stands that belongs to a time near `time`. Nothing when it is of no such time.
    std::optional<std::int64_t> TimeNear(std::int64_t stamp, std::int64_t time) const;

 private:
    Track& TrackOf(StepWatch::Medium medium) {
        return medium == StepWatch::Medium::kVideo ? video_ : *audio_;
    }
    std::optional<std::int64_t> NewStampOf(Track& track, const AVPacket& packet, std::size_t kept);
    std::int64_t Elapsed(Track& track, std::int64_t usual) const;
    std::int64_t TimeOf(Track& track, std::int64_t stamp, std::int64_t usual, std::int64_t back);
    void FindStep(Track& track, std::int64_t stamp);
    void TellJump(std::int64_t ticks) const;
    std::int64_t JoinAudio(std::int64_t stamp, std::int64_t usual, bool waited);

    const bool recorded_;
    NoticeSink tell_;
    Track video_;
    std::optional<Track> audio_;
    /// The audio has got to the beginning of the line.
    bool joined_ = false;
    std::int64_t begin_ = 0;
    Timeline line_;
    StepWatch steps_;
    /// The last stamp of any stream, which tells the others how often the counter has wrapped.
    std::optional<std::int64_t> reference_;
};

}  // namespace receiver
