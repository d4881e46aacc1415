#pragma once

// Pictures in decoding order, made by hand, with all that belongs to them.

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <memory>
#include <utility>
#include <vector>

#include "support/StreamUnits.h"

namespace reordered_stream {

/// The pictures of a group behind the one before it, in decoding order, each by how many pictures it is shown
/// later than the last picture of that one.
using Pattern = std::vector<std::uint64_t>;

inline const Pattern kInOrder = {1};
inline const Pattern kOneB = {2, 1};
inline const Pattern kTwoB = {3, 1, 2};
inline const Pattern kPyramid = {4, 2, 1, 3};
/// Each waits for all others of its group: 16 are shown later than decoded.
inline const Pattern kExtreme = {17, 16, 15, 14, 13, 12, 11, 10, 9, 8, 7, 6, 5, 4, 3, 2, 1};

struct Picture {
    std::uint64_t shown;  // pictures shown before it
    bool isIdr;

    bool operator==(const Picture&) const = default;
};

/// By how many pictures the first one has to be shown later than it is decoded.
inline std::uint64_t DelayOf(const Pattern& pattern) {
    std::uint64_t delay = 0;
    for (std::size_t i = 0; i < pattern.size(); ++i) {
        delay = std::max<std::uint64_t>(delay, i + 1 > pattern[i] ? i + 1 - pattern[i] : 0);
    }
    return delay;
}

/// `count` pictures with an IDR frame each `gop`; a group that the next IDR frame leaves no room for is shown
/// as it is decoded.
inline std::vector<Picture> MakePictures(const Pattern& pattern, std::uint64_t gop, std::uint64_t count) {
    std::vector<Picture> pictures;
    while (pictures.size() < count) {
        const std::uint64_t first = pictures.size();
        const std::uint64_t end = std::min(first + gop, count);
        pictures.push_back({first, true});
        while (pictures.size() < end) {
            const std::uint64_t last = pictures.size() - 1;
            const bool fits = pictures.size() + pattern.size() <= end;
            for (const std::uint64_t step : fits ? pattern : kInOrder) {
                pictures.push_back({last + step, false});
            }
        }
    }
    return pictures;
}

/// The unit that is decoded as the `n`th and shown `delay` pictures later than its place says.
inline std::shared_ptr<StreamData> MakeUnit(const stream_units::StreamClock& clock, std::uint64_t n,
                                            const Picture& picture, std::uint64_t delay) {
    auto unit = clock.Video(n, picture.isIdr ? stream_units::kIdr : stream_units::kPicture);
    unit->presentation_timestamp = clock.VideoRtp(picture.shown + delay);
    return unit;
}

}  // namespace reordered_stream
