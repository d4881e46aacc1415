#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "source/AudioEncoder.h"
#include "source/CodedUnits.h"
#include "source/Libav.h"

namespace receiver {

/// From the packets of a connection's audio to frames that can be recorded. Packets carry times of the
/// source's line, in ticks of 90000.
class AudioPathInterface {
 public:
    virtual ~AudioPathInterface() = default;
    /// Throws `FormatChanged`.
    virtual void Push(const AVPacket& packet, const AudioSink& sink) = 0;
    /// The source is over.
    virtual void Finish(const AudioSink& sink) = 0;
    /// Packets that could not be used.
    virtual std::uint64_t Damaged() const = 0;
};

/// "MP2 48 kHz stereo"
std::string AudioSummary(const AVCodecParameters& parameters);
/// True when the frames of such a stream, of which `first` is one (or null), can be recorded as they are.
bool CanPass(const AVCodecParameters& parameters, const AVPacket* first);

/// Passes AAC LC, 48 kHz, stereo on; bare frames get an ADTS header.
class AudioPass final : public AudioPathInterface {
 public:
    void Push(const AVPacket& packet, const AudioSink& sink) override;
    void Finish(const AudioSink& sink) override;
    std::uint64_t Damaged() const override { return damaged_; }

 private:
    bool IsForeign(const AVPacket& packet);

    /// Frames have ADTS headers, as the first one did.
    std::optional<bool> headers_;
    /// Frames in a row that are none of the format.
    std::uint64_t foreign_ = 0;
    std::uint64_t damaged_ = 0;
};

/// Decodes, resamples and encodes anything else.
class AudioConverter final : public AudioPathInterface {
 public:
    /// Throws `ReceiverError` (`kSourceUnsuitable`) for audio that cannot be decoded.
    explicit AudioConverter(const AVCodecParameters& parameters);

    void Push(const AVPacket& packet, const AudioSink& sink) override;
    void Finish(const AudioSink& sink) override;
    std::uint64_t Damaged() const override { return damaged_; }

 private:
    void Receive(const AudioSink& sink);
    /// True for a frame of another rate or with other channels than those before, which is left out.
    bool IsForeign(const AVFrame& frame);
    void SetUpResampler(const AVFrame& frame);
    /// Null: what the resampler holds.
    void Resample(const AVFrame* frame, std::int64_t time);
    void Enter(std::uint8_t** samples, int count, std::int64_t time);
    void EncodeWhole(const AudioSink& sink);

    libav::Owner<AVCodecContext> decoder_;
    libav::Owner<SwrContext> resampler_;
    /// What `resampler_` was set up for.
    int inputRate_ = 0;
    int inputFormat_ = -1;
    int inputChannels_ = 0;
    std::string format_;
    AudioEncoder encoder_;
    libav::Owner<AVAudioFifo> fifo_;
    libav::Owner<AVFrame> frame_;
    /// Time of the first sample that waits in `fifo_`, at 48000; of the next one that comes, while it is
    /// empty.
    std::int64_t fifoTime_ = 0;
    bool begun_ = false;
    std::uint64_t damaged_ = 0;
    /// Packets in a row that could not be decoded.
    int failures_ = 0;
    /// Frames in a row that are none of the format, and what the last one was.
    std::uint64_t foreign_ = 0;
    std::string foreignFormat_;
};

}  // namespace receiver
