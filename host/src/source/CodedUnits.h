#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <optional>
#include <string>

#include "common/Timecode.h"

namespace receiver {

/// As many pictures may be decoded in front of one that is shown before all of them: a decoder has room for
/// no more (ITU-T H.264 A.3.1).
inline constexpr std::uint32_t kMostReorderFrames = 16;

/// A coded picture on its way to a unit: an access unit as Annex B byte stream.
struct CodedPicture {
    std::shared_ptr<unsigned char> data;
    std::size_t size = 0;
    /// When it is its turn: the n-th picture that comes has the time of the n-th one that is shown. Ticks of
    /// 90000 a second, on the line of the source.
    std::int64_t time = 0;
    /// An IDR frame.
    bool keyFrame = false;
    /// What the picture itself tells of its address.
    std::optional<Timecode> timecode;
    /// How much later than at `time` it is shown; below 0, earlier. 0 where pictures come as they are shown.
    std::int64_t later = 0;
};

/// A coded audio frame: AAC LC, 48 kHz, stereo, 1024 samples, with its ADTS header.
struct CodedAudio {
    std::shared_ptr<unsigned char> data;
    std::size_t size = 0;
    /// Ticks of 48000 a second, on the line of the source.
    std::int64_t time = 0;
    /// At least half of it is silence that stands in for what did not come.
    bool filled = false;
};

using PictureSink = std::function<void(const CodedPicture&)>;
using AudioSink = std::function<void(const CodedAudio&)>;
using NoticeSink = std::function<void(const std::string&)>;

}  // namespace receiver
