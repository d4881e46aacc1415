#include "source/ByteStreamFilter.h"

namespace receiver {

ByteStreamFilter::ByteStreamFilter(const AVCodecParameters& parameters) : packet_(libav::NewPacket()) {
    AVBSFContext* filter = nullptr;
    libav::Check(av_bsf_alloc(av_bsf_get_by_name("h264_mp4toannexb"), &filter),
                 "convert the video's packets");
    filter_.reset(filter);
    libav::Check(avcodec_parameters_copy(filter_->par_in, &parameters), "read the parameters of the video");
    libav::Check(av_bsf_init(filter_.get()), "read the parameter sets of the video");
}

AVPacket& ByteStreamFilter::Filter(const AVPacket& packet) {
    av_packet_unref(packet_.get());
    libav::Check(av_packet_ref(packet_.get(), &packet), "hold a packet");
    // One packet in, one out.
    if (av_bsf_send_packet(filter_.get(), packet_.get()) < 0 ||
        av_bsf_receive_packet(filter_.get(), packet_.get()) < 0) {
        av_packet_unref(packet_.get());
        av_bsf_flush(filter_.get());
    }
    return *packet_;
}

std::vector<NalUnit> ByteStreamFilter::OutOfBand() const {
    const AVCodecParameters& stream = Stream();
    if (stream.extradata == nullptr) {
        return {};
    }
    return NalUnits({stream.extradata, static_cast<std::size_t>(stream.extradata_size)});
}

std::span<const unsigned char> BytesOf(const AVPacket& packet) {
    return {packet.data, static_cast<std::size_t>(packet.size)};
}

}  // namespace receiver
