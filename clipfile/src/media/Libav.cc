#include "media/Libav.h"

#include <algorithm>
#include <new>
#include <vector>

#include "media/NalUnits.h"

namespace clipfile {

namespace {

/// Larger pictures are none of a recording, and take gigabytes to decode.
constexpr std::int64_t kMaxPixels = std::int64_t{8192} * 8192;

}  // namespace

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
    context->max_pixels = kMaxPixels;
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

Context DecoderWith(const ParameterSets& sets, Bytes picture) {
    static constexpr unsigned char kStartCode[] = {0, 0, 0, 1};
    std::vector<unsigned char> extradata;
    for (const auto* const set : {&sets.sps, &sets.pps}) {
        extradata.insert(extradata.end(), std::begin(kStartCode), std::end(kStartCode));
        extradata.insert(extradata.end(), set->begin(), set->end());
    }
    Context context = OpenDecoder(AV_CODEC_ID_H264, extradata);
    const Packet packet(av_packet_alloc());
    if (context == nullptr) {
        return nullptr;
    }
    Fill(*packet, ToByteStream(picture));
    if (avcodec_send_packet(context.get(), packet.get()) < 0 ||
        avcodec_send_packet(context.get(), nullptr) < 0) {
        return nullptr;
    }
    return context;
}

Frame DecodePicture(const ParameterSets& sets, Bytes picture) {
    const Context context = DecoderWith(sets, picture);
    Frame frame(av_frame_alloc());
    if (context == nullptr || avcodec_receive_frame(context.get(), frame.get()) < 0) {
        return nullptr;
    }
    return frame;
}

}  // namespace clipfile
