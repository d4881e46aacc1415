#include "source/VideoConverter.h"

#include <string>

extern "C" {
#include <libavutil/pixdesc.h>
}

#include "common/ReceiverError.h"
#include "source/TimecodeReader.h"

namespace receiver {
namespace {

/// Null where nothing can be read of the pictures' timing: the decoder makes of them what it can.
std::unique_ptr<ByteStreamFilter> FilterFor(const AVCodecParameters& parameters) {
    if (parameters.codec_id != AV_CODEC_ID_H264) {
        return nullptr;
    }
    try {
        return std::make_unique<ByteStreamFilter>(parameters);
    } catch (const ReceiverError&) {
        return nullptr;
    }
}

}  // namespace

VideoConverter::VideoConverter(const AVCodecParameters& parameters, const VideoEncoding& encoding,
                               AVRational sourceRate, bool buildsUp)
    : encoding_(encoding),
      sourceRate_(sourceRate),
      period_(sourceRate.num > 0 ? av_rescale(90000, sourceRate.den, sourceRate.num) : 0),
      encoder_(encoding),
      stream_(FilterFor(parameters)),
      frame_(libav::NewFrame()) {
    const AVCodec* const decoder = avcodec_find_decoder(parameters.codec_id);
    if (decoder == nullptr) {
        throw ReceiverError(ExitCode::kSourceUnsuitable,
                            "the video (" + std::string(avcodec_get_name(parameters.codec_id)) +
                                ") cannot be decoded: set the encoder to H.264 without B frames");
    }
    if (stream_) {
        timing_.Look(stream_->OutOfBand());
    }
    decoder_ = libav::NewCodec(decoder);
    libav::Check(avcodec_parameters_to_context(decoder_.get(), &parameters),
                 "read the parameters of the video");
    decoder_->pkt_timebase = {1, 90000};
    // Threads that take whole frames would hold several of them back, and encoding, which has its own, costs
    // more.
    decoder_->thread_count = 1;
    if (buildsUp) {
        decoder_->flags |= AV_CODEC_FLAG_OUTPUT_CORRUPT;
    }
    libav::Check(avcodec_open2(decoder_.get(), decoder, nullptr), "open the decoder of the video");
}

void VideoConverter::Push(const AVPacket& packet, const PictureSink& sink) {
    if (stream_) {
        timing_.Look(NalUnits(BytesOf(stream_->Filter(packet))));
    }
    if (avcodec_send_packet(decoder_.get(), &packet) < 0) {
        ++damaged_;
        return;
    }
    Receive(sink);
}

void VideoConverter::Receive(const PictureSink& sink) {
    for (;;) {
        const int result = avcodec_receive_frame(decoder_.get(), frame_.get());
        if (result == AVERROR(EAGAIN) || result == AVERROR_EOF) {
            return;
        }
        if (result < 0) {
            ++damaged_;
            return;
        }
        // Pictures that stand before the first one in time refer to what nobody has seen.
        if (frame_->best_effort_timestamp != AV_NOPTS_VALUE && frame_->best_effort_timestamp >= 0) {
            SetUpFilter(*frame_, sink);
            frame_->pts = frame_->best_effort_timestamp;
            end_ = frame_->pts + period_;
            filter_->Feed("buffer@in", *frame_);
            Encode(sink);
        }
        av_frame_unref(frame_.get());
    }
}

void VideoConverter::SetUpFilter(const AVFrame& frame, const PictureSink& sink) {
    if (filter_ && filterWidth_ == frame.width && filterHeight_ == frame.height &&
        filterFormat_ == frame.format) {
        return;
    }
    if (filter_) {
        filter_->End("buffer@in", end_);
        Encode(sink);
    }
    filterWidth_ = frame.width;
    filterHeight_ = frame.height;
    filterFormat_ = frame.format;
    const auto text = [](auto number) { return std::to_string(number); };
    const AVRational aspect =
        frame.sample_aspect_ratio.num > 0 ? frame.sample_aspect_ratio : AVRational{1, 1};
    const std::string chain =
        "buffer@in=video_size=" + text(frame.width) + "x" + text(frame.height) +
        ":pix_fmt=" + text(frame.format) + ":time_base=1/90000:pixel_aspect=" + text(aspect.num) + "/" +
        text(aspect.den) +
        // Frames that are marked as interlaced only.
        ",bwdif=mode=send_frame:deint=interlaced,fps=" + text(encoding_.frameRate.numerator) + "/" +
        text(encoding_.frameRate.denominator) + ":eof_action=pass,scale=" + text(encoding_.width) + ":" +
        text(encoding_.height) + ",setsar=1,format=yuv420p";
    filter_ = std::make_unique<FilterGraph>(chain, true);
}

void VideoConverter::Encode(const PictureSink& sink) {
    const libav::Owner<AVFrame> picture = libav::NewFrame();
    const bool sameRate = av_cmp_q(sourceRate_, {static_cast<int>(encoding_.frameRate.numerator),
                                                 static_cast<int>(encoding_.frameRate.denominator)}) == 0;
    while (filter_->Pull(*picture)) {
        // Two chains of filters may overlap by a frame where the picture's size changed.
        if (picture->pts > lastFrame_) {
            lastFrame_ = picture->pts;
            std::optional<Timecode> timecode =
                sameRate ? TimecodeOf(*picture, sourceRate_) : std::optional<Timecode>();
            if (timecode) {
                timecode->dropFrame |= timing_.DropFrame();
            }
            picture->pict_type = AV_PICTURE_TYPE_NONE;
            encoder_.Encode(picture.get(), [&](const CodedPicture& coded) {
                CodedPicture withTimecode = coded;
                withTimecode.timecode = timecode;
                sink(withTimecode);
            });
        }
        av_frame_unref(picture.get());
    }
}

void VideoConverter::Finish(const PictureSink& sink) {
    avcodec_send_packet(decoder_.get(), nullptr);
    Receive(sink);
    if (filter_) {
        filter_->End("buffer@in", end_);
        Encode(sink);
    }
    encoder_.Encode(nullptr, sink);
}

}  // namespace receiver
