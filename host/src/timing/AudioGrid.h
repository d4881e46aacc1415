#pragma once

#include <cstdint>
#include <deque>
#include <optional>
#include <utility>

namespace receiver {

/// Puts audio frames of 1024 samples one directly behind the other. The recorder counts audio and video units
/// and lays the two against each other by these counts, so a missing or an extra audio frame would move the
/// sound of every later file against its picture. Therefore:
///
/// - a gap in the audio alone is filled with frames of silence, and a frame that overlaps what is there is
/// left
///   out;
/// - where video frames are missing, the audio that belongs to them is left out too, and its time passes, in
///   whole frames. What is left of the gap, less than a frame, is for the recording to balance: whether it
///   has to leave out a frame more depends on where it began.
///
/// Samples at 48000 a second. Not for several threads.
class AudioGrid {
 public:
    static constexpr std::int64_t kFrame = 1024;
    /// The nearest frame to the first picture, which stands at 0, begins half a frame before it at the
    /// earliest.
    static constexpr std::int64_t kEarliest = -kFrame / 2;

    /// Video is missing from `begin` on for `length` samples. `rejoin`: what follows begins another
    /// recording, and audio rejoins there.
    void AddVideoGap(std::int64_t begin, std::int64_t length, bool rejoin = false);

    enum class Action {
        /// The frame stands at `time`.
        kAccept,
        /// A frame of silence stands at `time`; ask again for the same frame.
        kFill,
        /// The frame is left out: its place is taken, or it is from before the beginning.
        kOverlap,
        /// The frame is left out: it belongs to video that is missing.
        kVideoMissing,
    };
    struct Place {
        Action action = Action::kAccept;
        std::int64_t time = 0;
    };
    /// The place of the next frame, which the source stamps with `time`. The first frame stands where it is,
    /// and silence leads up to it from the frame on that is nearest to 0.
    Place Next(std::int64_t time);

    /// The source begins anew, and another recording with it: its next frame stands where it is, as the first
    /// one did, and the others in line with it.
    void Rejoin() {
        rejoining_ = true;
        origin_.reset();
    }

    /// Where the next frame would stand, the audio of missing video passed over.
    std::int64_t End();
    /// The length of the gaps in the video between the frame that was entered last and the one before it.
    /// Once.
    std::int64_t TakePassed() {
        surplus_ = 0;
        return std::exchange(passed_, 0);
    }
    /// Enters a frame of silence at `End` that no frame of the source asked for, and gives its time.
    std::int64_t Append();

 private:
    struct Gap {
        std::int64_t begin = 0;
        std::int64_t length = 0;
        bool rejoin = false;
    };

    /// The earliest time at which the next frame can stand.
    std::int64_t Earliest() const;
    void Join(std::int64_t time);

    std::deque<Gap> gaps_;
    /// Where the first picture behind the last gap stands, and the last frame that was entered.
    std::optional<std::int64_t> origin_;
    std::int64_t last_ = -2 * kFrame;
    /// Gaps since the last frame, and what of them is less than a frame.
    std::int64_t passed_ = 0;
    std::int64_t surplus_ = 0;
    std::int64_t next_ = 0;
    /// End of the time that was passed over last.
    std::int64_t passedUntil_ = 0;
    bool begun_ = false;
    bool rejoining_ = false;
};

}  // namespace receiver
