#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <stdexcept>

#include "common/FrameRate.h"
#include "source/Libav.h"

namespace receiver {

/// A source goes on as something else than it was found to be. `what()` is half a sentence: "the picture
/// changed from 1280x720 to 1920x1080".
class FormatChanged : public std::runtime_error {
 public:
    using std::runtime_error::runtime_error;
};

inline constexpr const char* kRateChanged = "the frame rate of the video changed";
inline constexpr const char* kReorderedNoMore = "the video no longer sends its pictures reordered (B frames)";
inline constexpr const char* kReorderedOtherwise =
    "the order changed in which the video sends its pictures (B frames)";

/// Watches the video of a connection for what neither its container nor its decoder tells: another codec,
/// another frame rate, pictures that begin or end to be sent in another order than they are shown in.
class FormatWatch {
 public:
    /// `rate` is the present one. `untouched`: the pictures are recorded as they come, so that rate and order
    /// matter. `reordered`: they do not come in the order in which they are shown.
    FormatWatch(AVCodecID codec, const FrameRate& rate, bool untouched, bool reordered = false);

    /// A picture with its stamp, in ticks of 90000, and with how much later it is shown than decoded, where
    /// these are known. The stamp tells when it is shown, of reordered pictures when it is its turn. Throws
    /// `FormatChanged`.
    void Look(std::span<const unsigned char> picture, std::optional<std::int64_t> stamp,
              std::optional<std::int64_t> delay);
    /// A picture of those that come reordered, shown so much later than decoded, where the source tells.
    /// `late`: more pictures than were thought were decoded in front of it. Throws `FormatChanged`.
    void LookAtReordering(std::optional<std::int64_t> delay, bool late);

 private:
    void LookAtDelay(std::int64_t delay);
    void LookAtOrder(std::int64_t step);
    void LookAtRate(std::int64_t step);

    const AVCodecID codec_;
    const bool untouched_;
    const bool reordered_;
    /// Ticks of a picture.
    const std::int64_t period_;
    std::optional<std::int64_t> stamp_;
    /// The last one that was as usual, and how many pictures in a row were not.
    std::optional<std::int64_t> delay_;
    int delayed_ = 0;
    /// Reordered pictures in a row that were shown when they were decoded.
    int straight_ = 0;
    /// Since the last one that was late.
    std::optional<int> sinceLate_;
    /// Pictures since the last one that was stamped in front of another, and how many such came close
    /// together.
    int forward_ = 0;
    int backward_ = 0;
    /// How many distances in a row were the same and not the rate's.
    std::int64_t step_ = 0;
    int steps_ = 0;
};

}  // namespace receiver
