#pragma once

#include <memory>

#include "source/ByteStreamFilter.h"
#include "source/FilterGraph.h"
#include "source/PictureTiming.h"
#include "source/VideoEncoder.h"
#include "source/VideoPath.h"

namespace receiver {

/// Decodes video of any kind and encodes it as the recorder wants it, in another size and at another rate if
/// that is asked for.
class VideoConverter final : public VideoPathInterface {
 public:
    /// `sourceRate` is the source's rate; its timecode is taken over when the rate stays. Throws
    /// `ReceiverError`
    /// (`kSourceUnsuitable`) for video that cannot be decoded. `buildsUp`: pictures are refreshed bit by bit,
    /// and the first ones are taken although they are not whole yet.
    VideoConverter(const AVCodecParameters& parameters, const VideoEncoding& encoding, AVRational sourceRate,
                   bool buildsUp = false);

    bool IsStart(const AVPacket& packet) override { return (packet.flags & AV_PKT_FLAG_KEY) != 0; }
    void Push(const AVPacket& packet, const PictureSink& sink) override;
    void Finish(const PictureSink& sink) override;
    std::uint64_t Damaged() const override { return damaged_; }

 private:
    void Receive(const PictureSink& sink);
    void SetUpFilter(const AVFrame& frame, const PictureSink& sink);
    void Encode(const PictureSink& sink);

    const VideoEncoding encoding_;
    const AVRational sourceRate_;
    /// A picture's length, in ticks of 90000.
    const std::int64_t period_;
    libav::Owner<AVCodecContext> decoder_;
    VideoEncoder encoder_;
    std::unique_ptr<FilterGraph> filter_;
    /// What `filter_` was set up for.
    int filterWidth_ = 0;
    int filterHeight_ = 0;
    int filterFormat_ = -1;
    /// Of H.264.
    std::unique_ptr<ByteStreamFilter> stream_;
    PictureTiming timing_;
    libav::Owner<AVFrame> frame_;
    std::int64_t lastFrame_ = -1;
    /// Where the last picture that was decoded is over.
    std::int64_t end_ = 0;
    std::uint64_t damaged_ = 0;
};

}  // namespace receiver
