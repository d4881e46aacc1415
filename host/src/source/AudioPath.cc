#include "source/AudioPath.h"

#include <algorithm>
#include <array>
#include <cstdio>
#include <new>
#include <utility>
#include <vector>

extern "C" {
#include <libavutil/channel_layout.h>
#include <libavutil/samplefmt.h>
}

#include "common/ReceiverError.h"
#include "source/AudioFrames.h"
#include "source/FormatWatch.h"

namespace receiver {
namespace {

bool HasAdtsHeader(const AVPacket& packet) {
    return packet.size > static_cast<int>(kAdtsHeader) && packet.data[0] == 0xFF &&
           (packet.data[1] & 0xF6) == 0xF0;
}

/// An ADTS header for LC, 48 kHz, stereo, with one frame behind it.
bool IsRecordedFormat(const AVPacket& packet) {
    // profile 1, sampling_frequency_index 3; private_bit may be anything; channel_configuration 2.
    return (packet.data[2] & 0xFD) == 0x4C && (packet.data[3] & 0xC0) == 0x80 && (packet.data[6] & 0x03) == 0;
}

/// AudioSpecificConfig (ISO/IEC 14496-3 1.6.2.1) of the same, with frames of 1024 samples.
bool IsRecordedConfig(const std::uint8_t* config, int size) {
    if (size < 2) {
        return false;
    }
    const unsigned int bits = static_cast<unsigned int>(config[0]) << 8 | config[1];
    // audioObjectType 2, samplingFrequencyIndex 3, channelConfiguration 2, frameLengthFlag 0
    return bits >> 11 == 2 && (bits >> 7 & 0x0F) == 3 && (bits >> 3 & 0x0F) == 2 && (bits & 0x04) == 0;
}

constexpr const char* kAudioChanged = "the audio is no longer AAC LC 48 kHz stereo";
/// What aac_frame_length can tell.
constexpr std::size_t kLongestAdtsFrame = 8191;
/// Frames in a row, of another format or undecodable, that are more than damage.
constexpr std::uint64_t kForeign = 3;
constexpr int kUndecodable = 50;

/// Samples that the time of a frame may differ from the count and still be jitter.
constexpr std::int64_t kJitter = 1024;
/// Samples of silence that fill a gap here; a longer one begins anew.
constexpr std::int64_t kLongestFill = std::int64_t{10} * kAudioRate;

/// "48 kHz stereo"
std::string RateAndLayout(int rate, const AVChannelLayout& channels) {
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), "%.6g kHz ", rate / 1000.0);
    std::array<char, 64> layout{};
    av_channel_layout_describe(&channels, layout.data(), layout.size());
    return std::string(text.data()) + layout.data();
}

}  // namespace

std::string AudioSummary(const AVCodecParameters& parameters) {
    const char* const profile = avcodec_profile_name(parameters.codec_id, parameters.profile);
    std::string codec = avcodec_get_name(parameters.codec_id);
    std::transform(codec.begin(), codec.end(), codec.begin(),
                   [](char c) { return c >= 'a' && c <= 'z' ? static_cast<char>(c - 'a' + 'A') : c; });
    return codec + (profile != nullptr ? std::string(" ") + profile : "") + " " +
           RateAndLayout(parameters.sample_rate, parameters.ch_layout);
}

bool CanPass(const AVCodecParameters& parameters, const AVPacket* first) {
    if (parameters.codec_id != AV_CODEC_ID_AAC) {
        return false;
    }
    if (first != nullptr && HasAdtsHeader(*first)) {
        return IsRecordedFormat(*first);
    }
    return IsRecordedConfig(parameters.extradata, parameters.extradata_size);
}

bool AudioPass::IsForeign(const AVPacket& packet) {
    const bool header = HasAdtsHeader(packet);
    headers_ = headers_.value_or(header);
    return header != *headers_ || (header && !IsRecordedFormat(packet));
}

void AudioPass::Push(const AVPacket& packet, const AudioSink& sink) {
    std::size_t told = 0;
    const std::uint8_t* const config = av_packet_get_side_data(&packet, AV_PKT_DATA_NEW_EXTRADATA, &told);
    if (config != nullptr && !IsRecordedConfig(config, static_cast<int>(told))) {
        throw FormatChanged(kAudioChanged);
    }
    if (IsForeign(packet)) {
        if (++foreign_ >= kForeign) {
            throw FormatChanged(kAudioChanged);
        }
        return;
    }
    damaged_ += std::exchange(foreign_, 0);
    const auto size = static_cast<std::size_t>(packet.size);
    const std::int64_t time = av_rescale(packet.pts, kAudioRate, 90000);
    if (*headers_ && !IsWholeAudioFrame(AV_CODEC_ID_AAC, packet)) {
        // Cut short, as the last frame of a stream that breaks off is.
        ++damaged_;
    } else if (size == 0 || size + kAdtsHeader > kLongestAdtsFrame) {
        ++damaged_;
    } else if (*headers_) {
        sink({libav::Share(packet), size, time});
    } else {
        sink({WithAdtsHeader(packet.data, size), size + kAdtsHeader, time});
    }
}

void AudioPass::Finish(const AudioSink& /*sink*/) {}

AudioConverter::AudioConverter(const AVCodecParameters& parameters) : frame_(libav::NewFrame()) {
    const AVCodec* const decoder = avcodec_find_decoder(parameters.codec_id);
    if (decoder == nullptr) {
        throw ReceiverError(
            ExitCode::kSourceUnsuitable,
            "the audio (" + AudioSummary(parameters) + ") cannot be decoded: set the encoder to AAC LC");
    }
    decoder_ = libav::NewCodec(decoder);
    libav::Check(avcodec_parameters_to_context(decoder_.get(), &parameters),
                 "read the parameters of the audio");
    decoder_->thread_count = 1;
    decoder_->pkt_timebase = {1, 90000};
    libav::Check(avcodec_open2(decoder_.get(), decoder, nullptr), "open the decoder of the audio");
    fifo_.reset(av_audio_fifo_alloc(AV_SAMPLE_FMT_FLTP, kAudioChannels, kAudioRate));
    if (!fifo_) {
        throw std::bad_alloc();
    }
}

void AudioConverter::Push(const AVPacket& packet, const AudioSink& sink) {
    std::size_t told = 0;
    const std::uint8_t* const config = av_packet_get_side_data(&packet, AV_PKT_DATA_NEW_EXTRADATA, &told);
    if (config != nullptr && !std::equal(config, config + told, decoder_->extradata,
                                         decoder_->extradata + std::max(0, decoder_->extradata_size))) {
        throw FormatChanged("the parameters of the audio changed");
    }
    if (avcodec_send_packet(decoder_.get(), &packet) < 0) {
        ++damaged_;
        if (++failures_ >= kUndecodable) {
            throw FormatChanged("the audio is no longer the one that it was");
        }
        return;
    }
    failures_ = 0;
    Receive(sink);
    if (foreign_ >= kForeign) {
        throw FormatChanged("the audio changed from " + format_ + " to " + foreignFormat_);
    }
}

void AudioConverter::Receive(const AudioSink& sink) {
    for (;;) {
        const int result = avcodec_receive_frame(decoder_.get(), frame_.get());
        if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) {
            return;
        }
        if (result < 0) {
            ++damaged_;
            return;
        }
        if (frame_->pts != AV_NOPTS_VALUE && !IsForeign(*frame_)) {
            Resample(frame_.get(), av_rescale(frame_->pts, kAudioRate, 90000));
        }
        av_frame_unref(frame_.get());
        EncodeWhole(sink);
    }
}

bool AudioConverter::IsForeign(const AVFrame& frame) {
    const bool foreign =
        resampler_ && (inputRate_ != frame.sample_rate || inputChannels_ != frame.ch_layout.nb_channels);
    if (foreign) {
        ++foreign_;
        foreignFormat_ = RateAndLayout(frame.sample_rate, frame.ch_layout);
    } else {
        damaged_ += std::exchange(foreign_, 0);
    }
    return foreign;
}

void AudioConverter::SetUpResampler(const AVFrame& frame) {
    if (resampler_ && inputFormat_ == frame.format) {
        return;
    }
    AVChannelLayout stereo = AV_CHANNEL_LAYOUT_STEREO;
    AVChannelLayout layout = frame.ch_layout;
    if (layout.order == AV_CHANNEL_ORDER_UNSPEC) {
        av_channel_layout_default(&layout, frame.ch_layout.nb_channels);
    }
    SwrContext* resampler = nullptr;
    libav::Check(
        swr_alloc_set_opts2(&resampler, &stereo, AV_SAMPLE_FMT_FLTP, kAudioRate, &layout,
                            static_cast<AVSampleFormat>(frame.format), frame.sample_rate, 0, nullptr),
        "set up the resampler");
    resampler_.reset(resampler);
    libav::Check(swr_init(resampler_.get()), "set up the resampler");
    inputRate_ = frame.sample_rate;
    inputFormat_ = frame.format;
    inputChannels_ = frame.ch_layout.nb_channels;
    format_ = RateAndLayout(frame.sample_rate, frame.ch_layout);
}

void AudioConverter::Resample(const AVFrame* frame, std::int64_t time) {
    if (frame != nullptr) {
        SetUpResampler(*frame);
    }
    if (!resampler_) {
        return;
    }
    // What the resampler still holds stands before this frame.
    const std::int64_t held = swr_get_delay(resampler_.get(), kAudioRate);
    const int room = libav::Check(
        swr_get_out_samples(resampler_.get(), frame != nullptr ? frame->nb_samples : 0), "resample audio");
    std::vector<float> left(static_cast<std::size_t>(room) + 1);
    std::vector<float> right(static_cast<std::size_t>(room) + 1);
    std::array<std::uint8_t*, 2> planes{reinterpret_cast<std::uint8_t*>(left.data()),
                                        reinterpret_cast<std::uint8_t*>(right.data())};
    const int count =
        swr_convert(resampler_.get(), planes.data(), room,
                    frame != nullptr ? const_cast<const std::uint8_t**>(frame->extended_data) : nullptr,
                    frame != nullptr ? frame->nb_samples : 0);
    libav::Check(count, "resample audio");
    Enter(planes.data(), count, frame != nullptr ? time - held : fifoTime_ + av_audio_fifo_size(fifo_.get()));
}

void AudioConverter::Enter(std::uint8_t** samples, int count, std::int64_t time) {
    if (!begun_) {
        begun_ = true;
        fifoTime_ = time;
    }
    std::int64_t distance = time - (fifoTime_ + av_audio_fifo_size(fifo_.get()));
    if (distance > kLongestFill || distance < -kLongestFill) {
        av_audio_fifo_reset(fifo_.get());
        fifoTime_ = time;
        distance = 0;
    }
    std::array<std::uint8_t*, 2> planes{samples[0], samples[1]};
    if (distance > kJitter) {
        std::vector<float> silence(static_cast<std::size_t>(distance));
        auto* const plane = reinterpret_cast<std::uint8_t*>(silence.data());
        std::array<void*, 2> silent{plane, plane};
        libav::Check(av_audio_fifo_write(fifo_.get(), silent.data(), static_cast<int>(distance)),
                     "hold audio");
    } else if (distance < -kJitter) {
        const int skip = static_cast<int>(std::min<std::int64_t>(-distance, count));
        for (std::uint8_t*& plane : planes) {
            plane += sizeof(float) * static_cast<std::size_t>(skip);
        }
        count -= skip;
    }
    std::array<void*, 2> pointers{planes[0], planes[1]};
    libav::Check(av_audio_fifo_write(fifo_.get(), pointers.data(), count), "hold audio");
}

void AudioConverter::EncodeWhole(const AudioSink& sink) {
    while (av_audio_fifo_size(fifo_.get()) >= kAudioFrame) {
        const libav::Owner<AVFrame> samples = AudioEncoder::NewSamples();
        std::array<void*, 2> planes{samples->data[0], samples->data[1]};
        libav::Check(av_audio_fifo_read(fifo_.get(), planes.data(), kAudioFrame), "hold audio");
        samples->pts = fifoTime_;
        fifoTime_ += kAudioFrame;
        encoder_.Encode(samples.get(), sink);
    }
}

void AudioConverter::Finish(const AudioSink& sink) {
    avcodec_send_packet(decoder_.get(), nullptr);
    Receive(sink);
    Resample(nullptr, 0);
    // The last frame is filled up with silence.
    const int rest = av_audio_fifo_size(fifo_.get()) % kAudioFrame;
    if (rest > 0) {
        const libav::Owner<AVFrame> silence = AudioEncoder::NewSamples();
        std::array<void*, 2> planes{silence->data[0], silence->data[1]};
        libav::Check(av_audio_fifo_write(fifo_.get(), planes.data(), kAudioFrame - rest), "hold audio");
    }
    EncodeWhole(sink);
    encoder_.Encode(nullptr, sink);
}

}  // namespace receiver
