#include "source/VideoEncoder.h"

#include <string>

#include "common/ReceiverError.h"

namespace receiver {

VideoEncoder::VideoEncoder(const VideoEncoding& encoding)
    : rate_(encoding.frameRate), packet_(libav::NewPacket()) {
    if (encoding.width == 0 || encoding.height == 0 || encoding.width % 2 != 0 || encoding.height % 2 != 0) {
        throw ReceiverError(ExitCode::kSourceUnsuitable,
                            "a picture of " + std::to_string(encoding.width) + "x" +
                                std::to_string(encoding.height) +
                                " cannot be encoded: give a width and a height that are even numbers");
    }
    const AVCodec* const encoder = avcodec_find_encoder_by_name("libx264");
    if (encoder == nullptr) {
        throw ReceiverError(
            ExitCode::kInternal,
            "FFmpeg's libraries on this machine have no libx264 encoder: install the packages "
            "that scripts/bootstrap names");
    }
    codec_ = libav::NewCodec(encoder);
    codec_->width = static_cast<int>(encoding.width);
    codec_->height = static_cast<int>(encoding.height);
    codec_->pix_fmt = AV_PIX_FMT_YUV420P;
    codec_->time_base = {static_cast<int>(rate_.denominator), static_cast<int>(rate_.numerator)};
    codec_->framerate = {static_cast<int>(rate_.numerator), static_cast<int>(rate_.denominator)};
    codec_->gop_size = static_cast<int>(encoding.pictureGroup);
    codec_->keyint_min = codec_->gop_size;
    codec_->max_b_frames = 0;
    codec_->bit_rate = std::int64_t{1000} * encoding.bitrate;
    codec_->rc_max_rate = codec_->bit_rate;
    // Half a second: what a decoder of a live stream is expected to hold.
    codec_->rc_buffer_size = static_cast<int>(codec_->bit_rate / 2);
    libav::Options options;
    options.Set("preset", "superfast");
    options.Set("tune", "zerolatency");
    // Cuts must not move the IDR frames off their cadence.
    options.Set("sc_threshold", "0");
    options.Set("forced-idr", "1");
    options.Set("x264-params", "open-gop=0:repeat-headers=1");
    libav::ForgetErrors();
    const int result = avcodec_open2(codec_.get(), encoder, options.Get());
    if (result < 0) {
        throw ReceiverError(ExitCode::kSourceUnsuitable,
                            "the picture cannot be encoded with " + std::to_string(encoding.width) + "x" +
                                std::to_string(encoding.height) + " and " + std::to_string(encoding.bitrate) +
                                " kb/s: " + libav::ErrorText(result) + " " + libav::LastError());
    }
}

void VideoEncoder::Encode(AVFrame* picture, const PictureSink& sink) {
    libav::Check(avcodec_send_frame(codec_.get(), picture), "encode a picture");
    for (;;) {
        const int result = avcodec_receive_packet(codec_.get(), packet_.get());
        if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) {
            return;
        }
        libav::Check(result, "encode a picture");
        CodedPicture coded;
        coded.data = libav::Share(*packet_);
        coded.size = static_cast<std::size_t>(packet_->size);
        coded.time = av_rescale_q(packet_->pts, codec_->time_base, {1, 90000});
        coded.keyFrame = (packet_->flags & AV_PKT_FLAG_KEY) != 0;
        av_packet_unref(packet_.get());
        sink(coded);
    }
}

}  // namespace receiver
