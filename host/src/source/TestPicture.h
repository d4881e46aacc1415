#pragma once

#include "source/AudioEncoder.h"
#include "source/FilterGraph.h"
#include "source/ProducerInterface.h"
#include "source/VideoEncoder.h"

namespace receiver {

/// The source "test:": a moving picture with running time and frame number, and a tone with a beep each
/// second.
class TestPicture final : public ProducerInterface {
 public:
    /// Throws `ReceiverError` for a size that cannot be encoded.
    explicit TestPicture(const SourceOptions& options);

    const SourceDescription& Description() const override { return description_; }
    bool Produce(Batch& batch) override;
    SourceCounts Counts() const override { return {}; }

 private:
    VideoEncoding encoding_;
    SourceDescription description_;
    VideoEncoder videoEncoder_;
    AudioEncoder audioEncoder_;
    FilterGraph pictures_;
    FilterGraph tones_;
    libav::Owner<AVFrame> frame_;
    /// Pictures and audio samples that were made so far.
    std::int64_t pictureCount_ = 0;
    std::int64_t sampleCount_ = 0;
};

}  // namespace receiver
