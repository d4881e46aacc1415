#include "media/Decoders.h"

#include <algorithm>
#include <cstring>
#include <new>

#include "media/NalUnits.h"

extern "C" {
#include <libavcodec/avcodec.h>
}

namespace clipfile {

// Not in the unnamed namespace: `AudioFrameFinder::Decoder` holds them.
struct FreeContext {
    void operator()(AVCodecContext* context) const { avcodec_free_context(&context); }
};
struct FreePacket {
    void operator()(AVPacket* packet) const { av_packet_free(&packet); }
};
struct FreeFrame {
    void operator()(AVFrame* frame) const { av_frame_free(&frame); }
};
using Context = std::unique_ptr<AVCodecContext, FreeContext>;
using Packet = std::unique_ptr<AVPacket, FreePacket>;
using Frame = std::unique_ptr<AVFrame, FreeFrame>;

namespace {

/// A decoder that calls every fault a failure.
Context OpenDecoder(AVCodecID id, Bytes extradata) {
    // What does not decode is an answer here, nothing to report.
    av_log_set_level(AV_LOG_QUIET);
    const AVCodec* const codec = avcodec_find_decoder(id);
    Context context(avcodec_alloc_context3(codec));
    if (codec == nullptr || context == nullptr) {
        throw std::bad_alloc();
    }
    context->extradata =
        static_cast<std::uint8_t*>(av_mallocz(extradata.size() + AV_INPUT_BUFFER_PADDING_SIZE));
    if (context->extradata == nullptr) {
        throw std::bad_alloc();
    }
    std::copy(extradata.begin(), extradata.end(), context->extradata);
    context->extradata_size = static_cast<int>(extradata.size());
    context->err_recognition = AV_EF_EXPLODE | AV_EF_BITSTREAM | AV_EF_BUFFER;
    context->thread_count = 1;
    if (avcodec_open2(context.get(), codec, nullptr) < 0) {
        return nullptr;
    }
    return context;
}

void Fill(AVPacket& packet, Bytes bytes) {
    av_packet_unref(&packet);
    if (av_new_packet(&packet, static_cast<int>(bytes.size())) < 0) {
        throw std::bad_alloc();
    }
    std::copy(bytes.begin(), bytes.end(), packet.data);
}

/// Bytes that were left in front of the decoder when it began with the frame.
std::size_t LeftBefore(const AVFrame& frame) {
    return static_cast<std::size_t>(frame.pkt_size);
}

}  // namespace

struct AudioFrameFinder::Decoder {
    /// AudioSpecificConfig (ISO/IEC 14496-3 1.6.2.1): AAC LC, 48 kHz, stereo.
    static constexpr unsigned char kConfiguration[] = {0x11, 0x90};

    Context context = OpenDecoder(AV_CODEC_ID_AAC, kConfiguration);
    Packet packet{av_packet_alloc()};
    Frame frame{av_frame_alloc()};

    /// Begins with the bytes. Frames then come one by one.
    void Send(Bytes bytes) {
        avcodec_flush_buffers(context.get());
        Fill(*packet, bytes);
        avcodec_send_packet(context.get(), packet.get());
    }
    bool Receive() { return avcodec_receive_frame(context.get(), frame.get()) == 0; }
};

AudioFrameFinder::AudioFrameFinder() : decoder_(std::make_unique<Decoder>()) {}

AudioFrameFinder::~AudioFrameFinder() = default;

std::vector<std::size_t> AudioFrameFinder::Find(Bytes bytes) {
    std::vector<std::size_t> sizes;
    if (bytes.empty()) {
        return sizes;
    }
    // The decoder takes a packet of several frames, and tells with each how much of it was left.
    decoder_->Send(bytes);
    std::vector<std::size_t> starts;
    while (decoder_->Receive()) {
        starts.push_back(bytes.size() - LeftBefore(*decoder_->frame));
    }
    for (std::size_t i = 0; i < starts.size(); ++i) {
        const bool isLast = i + 1 == starts.size();
        sizes.push_back(isLast ? FindEnd(bytes.subspan(starts[i])) : starts[i + 1] - starts[i]);
    }
    return sizes;
}

std::size_t AudioFrameFinder::FindEnd(Bytes bytes) {
    // A frame of which the end is missing does not decode; a longer packet changes nothing.
    constexpr std::size_t kLongest = 6144 * 2 / 8;  // bits a channel (ISO/IEC 14496-3 4.5.3.2)
    std::size_t tooShort = 0;
    std::size_t enough = std::min(bytes.size(), 2 * kLongest);
    while (enough - tooShort > 1) {
        const std::size_t middle = tooShort + (enough - tooShort) / 2;
        decoder_->Send(bytes.first(middle));
        (decoder_->Receive() ? enough : tooShort) = middle;
    }
    return enough;
}

bool DecodesWith(const ParameterSets& sets, Bytes picture, int width, int height) {
    static constexpr unsigned char kStartCode[] = {0, 0, 0, 1};
    std::vector<unsigned char> extradata;
    for (const auto* const set : {&sets.sps, &sets.pps}) {
        extradata.insert(extradata.end(), std::begin(kStartCode), std::end(kStartCode));
        extradata.insert(extradata.end(), set->begin(), set->end());
    }
    const Context context = OpenDecoder(AV_CODEC_ID_H264, extradata);
    const Packet packet(av_packet_alloc());
    const Frame frame(av_frame_alloc());
    if (context == nullptr) {
        return false;
    }
    Fill(*packet, ToByteStream(picture));
    if (avcodec_send_packet(context.get(), packet.get()) < 0 ||
        avcodec_send_packet(context.get(), nullptr) < 0 ||
        avcodec_receive_frame(context.get(), frame.get()) < 0) {
        return false;
    }
    return frame->decode_error_flags == 0 && (frame->flags & AV_FRAME_FLAG_CORRUPT) == 0 &&
           frame->width == width && frame->height == height;
}

}  // namespace clipfile
