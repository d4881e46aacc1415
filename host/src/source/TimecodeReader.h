#pragma once

#include <optional>
#include <span>

#include "common/Timecode.h"
#include "source/Libav.h"

namespace receiver {

/// The address that a decoded picture carries (picture timing SEI of H.264, as SMPTE ST 12-1 words), if any.
std::optional<Timecode> TimecodeOf(const AVFrame& frame, AVRational rate);

/// Reads the addresses of IDR frames, by decoding these frames alone. Gives up when the first ones have none,
/// so that sources without timecode do not pay for it.
class TimecodeReader {
 public:
    explicit TimecodeReader(const AVCodecParameters& parameters);

    /// `picture` is the byte stream of an IDR frame with its parameter sets.
    std::optional<Timecode> Read(std::span<const unsigned char> picture);

 private:
    libav::Owner<AVCodecContext> codec_;
    libav::Owner<AVPacket> packet_;
    libav::Owner<AVFrame> frame_;
    int without_ = 0;
};

}  // namespace receiver
