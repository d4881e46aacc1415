#pragma once

#include "source/CodedUnits.h"
#include "source/Libav.h"
#include "source/SourceInterface.h"

namespace receiver {

inline constexpr int kAudioRate = 48000;
inline constexpr int kAudioChannels = 2;

/// `frame` behind an ADTS header for AAC LC, 48 kHz, stereo (ISO/IEC 14496-3 1.A.2), without CRC.
std::shared_ptr<unsigned char> WithAdtsHeader(const unsigned char* frame, std::size_t size);
inline constexpr std::size_t kAdtsHeader = 7;

/// Encodes AAC LC, 48 kHz, stereo. Not for several threads.
class AudioEncoder {
 public:
    AudioEncoder();

    /// Encodes 1024 samples in `AV_SAMPLE_FMT_FLTP`, whose pts is the time of the first one in samples. The
    /// first coded frame that comes out stands a frame before the first one that went in. Null drains the
    /// encoder.
    void Encode(AVFrame* samples, const AudioSink& sink);

    /// An empty frame for `Encode`, with silence in it.
    static libav::Owner<AVFrame> NewSamples();

 private:
    libav::Owner<AVCodecContext> codec_;
    libav::Owner<AVPacket> packet_;
};

/// One coded frame of silence, which may follow any other frame. Its time is 0.
CodedAudio SilentFrame();

}  // namespace receiver
