#pragma once

#include <cstdint>

#include "common/FrameRate.h"
#include "source/CodedUnits.h"
#include "source/Libav.h"

namespace receiver {

/// How pictures are encoded that are made here or converted.
struct VideoEncoding {
    FrameRate frameRate;
    /// Even numbers.
    std::uint32_t width = 0;
    std::uint32_t height = 0;
    /// Kilobits a second.
    std::uint32_t bitrate = 0;
    /// Frames from one IDR frame to the next.
    std::uint32_t pictureGroup = 0;
};

/// Encodes H.264 for the recorder: without reordering, each picture group closed and begun by an IDR frame
/// that brings both parameter sets, one coded picture out for each picture in. Fast rather than small. Not
/// for several threads.
class VideoEncoder {
 public:
    /// Throws `ReceiverError`: `kSourceUnsuitable` for a size that cannot be encoded.
    explicit VideoEncoder(const VideoEncoding& encoding);

    /// Encodes a picture in `AV_PIX_FMT_YUV420P`. Its pts is a frame number, and the coded picture's time the
    /// time of that frame. Null drains the encoder.
    void Encode(AVFrame* picture, const PictureSink& sink);

 private:
    FrameRate rate_;
    libav::Owner<AVCodecContext> codec_;
    libav::Owner<AVPacket> packet_;
};

}  // namespace receiver
