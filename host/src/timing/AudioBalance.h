#pragma once

#include <cstdint>
#include <optional>

namespace receiver {

/// Keeps the sound of a recording with its pictures, where both are counted and not placed by their times: it
/// begins with the frame of audio nearest to its first picture, so up to half a frame off, and each gap in
/// the pictures lasts some whole frames of audio and a part of one. Leaves a frame out at a gap where sound
/// would stand more than half a frame behind its pictures. Times and lengths in samples of 48000 a second.
/// Not for several threads.
class AudioBalance {
 public:
    /// A recording begins with the picture at `picture`. `last` is the last frame of audio in front of it.
    void Begin(std::int64_t picture, std::optional<std::int64_t> last);
    void End() { picture_.reset(); }

    /// False when the frame at `time` has to be left out. Between the one before and this one pictures are
    /// missing for `passed` samples.
    bool Takes(std::int64_t time, std::int64_t passed);

 private:
    /// The first picture of the recording.
    std::optional<std::int64_t> picture_;
    /// How far sound stands behind its pictures, once the first frame is known.
    std::optional<std::int64_t> behind_;
    /// A gap has left more over than has been left out since.
    bool behindGap_ = false;
    /// Where the frame behind the last one would stand.
    std::int64_t next_ = 0;
};

}  // namespace receiver
