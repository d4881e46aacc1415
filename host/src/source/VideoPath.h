#pragma once

#include <cstdint>

#include "source/CodedUnits.h"
#include "source/Libav.h"

namespace receiver {

/// From the packets of a connection's video to coded pictures. Packets carry times of the source's line, in
/// ticks of 90000: when they are shown, and where pictures come in another order, as decoding time, where
/// they stand in that.
class VideoPathInterface {
 public:
    virtual ~VideoPathInterface() = default;
    /// True for a picture that decoding can begin with.
    virtual bool IsStart(const AVPacket& packet) = 0;
    /// Throws `FormatChanged`.
    virtual void Push(const AVPacket& packet, const PictureSink& sink) = 0;
    /// The source is over.
    virtual void Finish(const PictureSink& sink) = 0;
    /// Packets that could not be used.
    virtual std::uint64_t Damaged() const = 0;
};

}  // namespace receiver
