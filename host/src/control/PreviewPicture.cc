#include "control/PreviewPicture.h"

#include <algorithm>
#include <cmath>
#include <memory>

#include "common/ReceiverError.h"
#include "source/Libav.h"

extern "C" {
#include <libavutil/pixdesc.h>
#include <libswscale/swscale.h>
}

namespace receiver {
namespace {

using libav::Check;

constexpr double kSilence = -120;
/// Nobody's picture is larger; what claims to be would take the memory of the recording.
constexpr std::int64_t kMostPixels = std::int64_t{8192} * 4352;
/// The encoder's scale from 1 (best) to 31.
constexpr int kJpegQuality = 4;

struct FreeScaler {
    void operator()(SwsContext* context) const { sws_freeContext(context); }
};

libav::Owner<AVCodecContext> OpenDecoder(AVCodecID id) {
    const AVCodec* const codec = avcodec_find_decoder(id);
    if (codec == nullptr) {
        throw ReceiverError(ExitCode::kInternal, "there is no decoder for a preview");
    }
    libav::Owner<AVCodecContext> decoder = libav::NewCodec(codec);
    decoder->thread_count = 1;
    decoder->max_pixels = kMostPixels;
    Check(avcodec_open2(decoder.get(), codec, nullptr), "open a decoder for a preview");
    return decoder;
}

/// A packet with a copy of the bytes and the padding that decoders read over.
libav::Owner<AVPacket> PacketOf(const unsigned char* bytes, std::size_t size) {
    libav::Owner<AVPacket> packet = libav::NewPacket();
    Check(av_new_packet(packet.get(), static_cast<int>(size)), "copy a unit");
    std::copy_n(bytes, size, packet->data);
    return packet;
}

libav::Owner<AVFrame> Decode(const unsigned char* unit, std::size_t size) {
    const auto decoder = OpenDecoder(AV_CODEC_ID_H264);
    libav::Owner<AVFrame> frame = libav::NewFrame();
    Check(avcodec_send_packet(decoder.get(), PacketOf(unit, size).get()), "decode the picture");
    // The end makes it give out the picture that it may hold back for reordering.
    Check(avcodec_send_packet(decoder.get(), nullptr), "decode the picture");
    Check(avcodec_receive_frame(decoder.get(), frame.get()), "decode the picture");
    return frame;
}

/// Of pixels that may be no squares: as high as it is shown. Even, as chroma wants it.
int HeightFor(const AVFrame& frame, int width) {
    const AVRational aspect = frame.sample_aspect_ratio;
    const double shape = aspect.num > 0 && aspect.den > 0 ? av_q2d(aspect) : 1.0;
    const double height = static_cast<double>(width) * frame.height / (frame.width * shape);
    return static_cast<int>(std::lround(std::clamp(height, 2.0, 4.0 * width) / 2)) * 2;
}

libav::Owner<AVFrame> Scale(const AVFrame& frame, int width) {
    libav::Owner<AVFrame> scaled = libav::NewFrame();
    scaled->width = width;
    scaled->height = HeightFor(frame, width);
    scaled->format = AV_PIX_FMT_YUVJ420P;
    Check(av_frame_get_buffer(scaled.get(), 0), "make room for the preview");
    const std::unique_ptr<SwsContext, FreeScaler> scaler(
        sws_getContext(frame.width, frame.height, static_cast<AVPixelFormat>(frame.format), scaled->width,
                       scaled->height, AV_PIX_FMT_YUVJ420P, SWS_AREA, nullptr, nullptr, nullptr));
    if (scaler == nullptr || sws_scale(scaler.get(), frame.data, frame.linesize, 0, frame.height,
                                       scaled->data, scaled->linesize) != scaled->height) {
        throw ReceiverError(ExitCode::kInternal, "the picture can't be scaled");
    }
    return scaled;
}

/// The highest sample of each channel so far.
void Raise(std::vector<double>& peaks, const AVFrame& frame) {
    if (frame.format != AV_SAMPLE_FMT_FLTP) {
        return;
    }
    peaks.resize(static_cast<std::size_t>(frame.ch_layout.nb_channels), 0);
    for (std::size_t channel = 0; channel < peaks.size(); ++channel) {
        const auto* const samples = reinterpret_cast<const float*>(frame.extended_data[channel]);
        for (int i = 0; i < frame.nb_samples; ++i) {
            peaks[channel] = std::max(peaks[channel], std::abs(static_cast<double>(samples[i])));
        }
    }
}

}  // namespace

PreviewPicture MakePreviewPicture(const unsigned char* unit, std::size_t size, int width) {
    const auto scaled = Scale(*Decode(unit, size), width);
    const AVCodec* const codec = avcodec_find_encoder(AV_CODEC_ID_MJPEG);
    const auto encoder = libav::NewCodec(codec);
    encoder->width = scaled->width;
    encoder->height = scaled->height;
    encoder->pix_fmt = AV_PIX_FMT_YUVJ420P;
    encoder->time_base = {1, 1};
    encoder->thread_count = 1;
    encoder->flags |= AV_CODEC_FLAG_QSCALE;
    encoder->global_quality = scaled->quality = FF_QP2LAMBDA * kJpegQuality;
    Check(avcodec_open2(encoder.get(), codec, nullptr), "open the encoder of the preview");
    const auto packet = libav::NewPacket();
    Check(avcodec_send_frame(encoder.get(), scaled.get()), "encode the preview");
    Check(avcodec_receive_packet(encoder.get(), packet.get()), "encode the preview");
    return {scaled->width, scaled->height, {packet->data, packet->data + packet->size}};
}

std::vector<double> PeaksOf(const std::vector<Preview::Material::AudioFrame>& frames) {
    const auto decoder = OpenDecoder(AV_CODEC_ID_AAC);
    const auto frame = libav::NewFrame();
    std::vector<double> peaks;
    // A frame lacks what a missing one before it would have added, and shows peaks that are not there.
    bool lacksFrame = true;
    for (const Preview::Material::AudioFrame& coded : frames) {
        const bool decoded =
            avcodec_send_packet(decoder.get(), PacketOf(coded.data.get(), coded.size).get()) >= 0 &&
            avcodec_receive_frame(decoder.get(), frame.get()) >= 0;
        if (decoded && !lacksFrame) {
            Raise(peaks, *frame);
        }
        lacksFrame = !decoded;
    }
    for (double& peak : peaks) {
        peak = peak > 0 ? std::max(kSilence, 20 * std::log10(peak)) : kSilence;
    }
    return peaks;
}

std::string Base64(const std::vector<std::uint8_t>& bytes) {
    constexpr const char* kDigits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
    std::string text;
    text.reserve((bytes.size() + 2) / 3 * 4);
    for (std::size_t i = 0; i < bytes.size(); i += 3) {
        const std::size_t count = std::min<std::size_t>(3, bytes.size() - i);
        std::uint32_t group = 0;
        for (std::size_t k = 0; k < 3; ++k) {
            group = group << 8 | (k < count ? bytes[i + k] : 0u);
        }
        for (std::size_t k = 0; k < 4; ++k) {
            text += k <= count ? kDigits[group >> (18 - 6 * k) & 63] : '=';
        }
    }
    return text;
}

}  // namespace receiver
