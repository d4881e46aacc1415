#include "source/StreamParameters.h"

#include <algorithm>
#include <new>

#include "source/PictureParser.h"

namespace receiver {
namespace {

void SetExtradata(AVCodecParameters& parameters, const std::uint8_t* data, std::size_t size) {
    auto* const copy = static_cast<std::uint8_t*>(av_mallocz(size + AV_INPUT_BUFFER_PADDING_SIZE));
    if (copy == nullptr) {
        throw std::bad_alloc();
    }
    std::copy(data, data + size, copy);
    av_freep(&parameters.extradata);
    parameters.extradata = copy;
    parameters.extradata_size = static_cast<int>(size);
}

void RenewVideo(AVCodecParameters& parameters, const AVPacket& packet) {
    PictureParser parser(parameters);
    const auto picture = parser.Parse({packet.data, static_cast<std::size_t>(packet.size)});
    if (picture.width != 0) {
        parameters.width = static_cast<int>(picture.width);
        parameters.height = static_cast<int>(picture.height);
        parameters.profile = parser.Profile();
    }
}

bool RenewAudio(AVCodecParameters& parameters, const AVPacket& packet) {
    const AVCodec* const decoder = avcodec_find_decoder(parameters.codec_id);
    if (decoder == nullptr) {
        return false;
    }
    const libav::Owner<AVCodecContext> codec = libav::NewCodec(decoder);
    const libav::Owner<AVFrame> frame = libav::NewFrame();
    libav::Check(avcodec_parameters_to_context(codec.get(), &parameters), "read the parameters of the audio");
    if (avcodec_open2(codec.get(), decoder, nullptr) < 0 || avcodec_send_packet(codec.get(), &packet) < 0 ||
        avcodec_receive_frame(codec.get(), frame.get()) < 0) {
        return false;
    }
    libav::Check(avcodec_parameters_from_context(&parameters, codec.get()),
                 "read the parameters of the audio");
    return true;
}

}  // namespace

bool RenewParameters(AVStream& stream, const AVPacket& packet) {
    AVCodecParameters& parameters = *stream.codecpar;
    std::size_t size = 0;
    const std::uint8_t* const told = av_packet_get_side_data(&packet, AV_PKT_DATA_NEW_EXTRADATA, &size);
    if (told != nullptr) {
        SetExtradata(parameters, told, size);
    }
    if (parameters.codec_type == AVMEDIA_TYPE_AUDIO) {
        return RenewAudio(parameters, packet);
    }
    RenewVideo(parameters, packet);
    return true;
}

}  // namespace receiver
