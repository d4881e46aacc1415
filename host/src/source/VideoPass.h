#pragma once

#include <memory>

#include "source/ByteStreamFilter.h"
#include "source/PictureParser.h"
#include "source/PictureTiming.h"
#include "source/TimecodeReader.h"
#include "source/VideoPath.h"

namespace receiver {

/// Passes H.264 on untouched: as byte stream, with both parameter sets in front of each IDR frame. What
/// already is so is not changed by a byte, and not copied.
class VideoPass final : public VideoPathInterface {
 public:
    /// Throws `ReceiverError` (`kSourceUnsuitable`) for parameter sets that no file can hold, as `Push` does.
    explicit VideoPass(const AVCodecParameters& parameters);

    bool IsStart(const AVPacket& packet) override;
    void Push(const AVPacket& packet, const PictureSink& sink) override;
    void Finish(const PictureSink& sink) override;
    std::uint64_t Damaged() const override { return damaged_; }
    /// Pictures come reordered, over as many as `ReorderDepth` tells: parameter sets that tell another order
    /// are told from now on.
    void SetReordering(std::uint32_t depth) { depth_ = depth; }
    /// As `PictureTiming` tells.
    std::optional<std::uint32_t> ReorderFrames() const { return timing_.ReorderFrames(); }

 private:
    /// Throws `FormatChanged`.
    void CheckFormat(const AVPacket& stream);
    /// Throws `FormatChanged`.
    void CheckReordering();
    /// Parameter sets out of band that are not those of the beginning. Throws `FormatChanged`.
    void CheckParameters(const AVPacket& packet) const;

    ByteStreamFilter filter_;
    ParameterSets sets_;
    std::unique_ptr<PictureParser> parser_;
    std::unique_ptr<TimecodeReader> timecodes_;
    PictureTiming timing_;
    std::uint32_t width_ = 0;
    std::uint32_t height_ = 0;
    /// As the first IDR frame tells; 0/1 when it does not.
    std::optional<AVRational> rate_;
    std::uint32_t depth_ = 0;
    /// As the last parameter sets told.
    std::optional<std::uint32_t> reorderFrames_;
    std::uint64_t damaged_ = 0;
};

}  // namespace receiver
