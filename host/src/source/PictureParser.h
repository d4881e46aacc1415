#pragma once

#include <cstdint>
#include <span>

#include "source/Libav.h"

namespace receiver {

/// Reads what the headers of coded pictures tell, with libavcodec's parser.
class PictureParser {
 public:
    /// Throws `ReceiverError` (`kInternal`).
    explicit PictureParser(const AVCodecParameters& parameters);

    struct Picture {
        /// 0 while no parameter set has come.
        std::uint32_t width = 0;
        std::uint32_t height = 0;
        /// A single field of an interlaced frame.
        bool field = false;
        bool interlaced = false;
    };
    /// `picture` is a whole one, as the container of the stream holds it.
    Picture Parse(std::span<const unsigned char> picture);
    /// Frames a second as the pictures tell; 0/1 while they do not.
    AVRational FrameRate() const { return codec_->framerate; }
    /// Of the last one, as libavcodec numbers profiles.
    int Profile() const { return codec_->profile; }

 private:
    libav::Owner<AVCodecContext> codec_;
    libav::Owner<AVCodecParserContext> parser_;
};

}  // namespace receiver
