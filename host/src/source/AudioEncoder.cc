#include "source/AudioEncoder.h"

#include <algorithm>
#include <cstring>

#include "common/ReceiverError.h"

extern "C" {
#include <libavutil/channel_layout.h>
#include <libavutil/samplefmt.h>
}

namespace receiver {
namespace {

constexpr int kBitrate = 192000;

}  // namespace

std::shared_ptr<unsigned char> WithAdtsHeader(const unsigned char* frame, std::size_t size) {
    const std::size_t length = size + kAdtsHeader;
    std::shared_ptr<unsigned char> data(new unsigned char[length], std::default_delete<unsigned char[]>());
    unsigned char* const out = data.get();
    out[0] = 0xFF;  // syncword, 12 bits
    out[1] = 0xF1;  // syncword, ID 0 (MPEG-4), layer 0, protection_absent 1
    out[2] =
        0x4C;  // profile 1 (LC), sampling_frequency_index 3 (48000), private_bit 0, channel_configuration 2
    out[3] = static_cast<unsigned char>(0x80 | length >> 11);          // channel_configuration, frame_length
    out[4] = static_cast<unsigned char>(length >> 3 & 0xFF);           // frame_length
    out[5] = static_cast<unsigned char>((length & 0x07) << 5 | 0x1F);  // frame_length, buffer_fullness 0x7FF
    out[6] = 0xFC;                                                     // buffer_fullness, 1 block
    std::memcpy(out + kAdtsHeader, frame, size);
    return data;
}

AudioEncoder::AudioEncoder() : packet_(libav::NewPacket()) {
    const AVCodec* const encoder = avcodec_find_encoder(AV_CODEC_ID_AAC);
    if (encoder == nullptr) {
        throw ReceiverError(ExitCode::kInternal, "FFmpeg's libraries on this machine have no AAC encoder");
    }
    codec_ = libav::NewCodec(encoder);
    codec_->sample_rate = kAudioRate;
    codec_->sample_fmt = AV_SAMPLE_FMT_FLTP;
    codec_->ch_layout = AV_CHANNEL_LAYOUT_STEREO;
    codec_->time_base = {1, kAudioRate};
    codec_->bit_rate = kBitrate;
    codec_->profile = FF_PROFILE_AAC_LOW;
    libav::Check(avcodec_open2(codec_.get(), encoder, nullptr), "open the AAC encoder");
}

libav::Owner<AVFrame> AudioEncoder::NewSamples() {
    libav::Owner<AVFrame> samples = libav::NewFrame();
    samples->format = AV_SAMPLE_FMT_FLTP;
    samples->nb_samples = kAudioFrame;
    samples->sample_rate = kAudioRate;
    samples->ch_layout = AV_CHANNEL_LAYOUT_STEREO;
    libav::Check(av_frame_get_buffer(samples.get(), 0), "make room for audio samples");
    libav::Check(
        av_samples_set_silence(samples->extended_data, 0, kAudioFrame, kAudioChannels, AV_SAMPLE_FMT_FLTP),
        "make silence");
    return samples;
}

void AudioEncoder::Encode(AVFrame* samples, const AudioSink& sink) {
    libav::Check(avcodec_send_frame(codec_.get(), samples), "encode audio");
    for (;;) {
        const int result = avcodec_receive_packet(codec_.get(), packet_.get());
        if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) {
            return;
        }
        libav::Check(result, "encode audio");
        const auto size = static_cast<std::size_t>(packet_->size);
        const CodedAudio coded{WithAdtsHeader(packet_->data, size), size + kAdtsHeader, packet_->pts};
        av_packet_unref(packet_.get());
        sink(coded);
    }
}

CodedAudio SilentFrame() {
    AudioEncoder encoder;
    CodedAudio last;
    // The first frames differ, until the encoder's window and rate control have settled.
    for (int frame = 0; frame < 4; ++frame) {
        const libav::Owner<AVFrame> samples = AudioEncoder::NewSamples();
        samples->pts = std::int64_t{kAudioFrame} * frame;
        encoder.Encode(samples.get(), [&last](const CodedAudio& coded) { last = coded; });
    }
    last.time = 0;
    return last;
}

}  // namespace receiver
