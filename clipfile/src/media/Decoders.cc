#include "media/Decoders.h"

#include <algorithm>

#include "media/Libav.h"

namespace clipfile {

namespace {

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

bool AllowReordering(const ParameterSets& sets, Bytes picture) {
    const Context context = DecoderWith(sets, picture);
    return context != nullptr && context->has_b_frames > 0;
}

bool DecodesWith(const ParameterSets& sets, Bytes picture, int width, int height) {
    const Frame frame = DecodePicture(sets, picture);
    return frame != nullptr && frame->decode_error_flags == 0 &&
           (frame->flags & AV_FRAME_FLAG_CORRUPT) == 0 && frame->width == width && frame->height == height;
}

}  // namespace clipfile
