#include "source/VideoPass.h"

#include <algorithm>
#include <cstring>

#include "common/ReceiverError.h"
#include "source/FormatWatch.h"

namespace receiver {
namespace {

std::span<const unsigned char> BytesOf(const AVPacket& packet) {
    return {packet.data, static_cast<std::size_t>(packet.size)};
}

/// A movie file tells the size of a parameter set in 16 bits (ISO/IEC 14496-15 5.3.3.1).
constexpr std::size_t kLargestParameterSet = 65535;

/// Throws `ReceiverError` (`kSourceUnsuitable`).
void CheckParameterSets(const std::vector<NalUnit>& units) {
    for (const NalUnit& unit : units) {
        const bool isSet = unit.type == kNalSequenceParameterSet || unit.type == kNalPictureParameterSet;
        if (isSet && unit.bytes.size() > kLargestParameterSet) {
            throw ReceiverError(ExitCode::kSourceUnsuitable,
                                "the video has a parameter set of " + std::to_string(unit.bytes.size()) +
                                    " bytes, and a file holds none above 65535: set the encoder to parameter "
                                    "sets without padding");
        }
    }
}

}  // namespace

VideoPass::VideoPass(const AVCodecParameters& parameters)
    : packet_(libav::NewPacket()),
      width_(static_cast<std::uint32_t>(parameters.width)),
      height_(static_cast<std::uint32_t>(parameters.height)) {
    AVBSFContext* filter = nullptr;
    libav::Check(av_bsf_alloc(av_bsf_get_by_name("h264_mp4toannexb"), &filter),
                 "convert the video's packets");
    filter_.reset(filter);
    libav::Check(avcodec_parameters_copy(filter_->par_in, &parameters), "read the parameters of the video");
    libav::Check(av_bsf_init(filter_.get()), "read the parameter sets of the video");
    const AVCodecParameters& stream = *filter_->par_out;
    if (stream.extradata != nullptr) {
        const auto units = NalUnits({stream.extradata, static_cast<std::size_t>(stream.extradata_size)});
        CheckParameterSets(units);
        sets_.Learn(units);
        timing_.Look(units);
    }
    parser_ = std::make_unique<PictureParser>(stream);
    timecodes_ = std::make_unique<TimecodeReader>(stream);
}

AVPacket& VideoPass::Filter(const AVPacket& packet) {
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

bool VideoPass::IsStart(const AVPacket& packet) {
    // The filter has no memory that a second run would disturb.
    const AVPacket& stream = Filter(packet);
    return Contains(NalUnits(BytesOf(stream)), kNalIdr);
}

void VideoPass::CheckFormat(const AVPacket& stream) {
    const PictureParser::Picture picture = parser_->Parse(BytesOf(stream));
    if (picture.width != 0 && (picture.width != width_ || picture.height != height_)) {
        throw FormatChanged("the picture changed from " + std::to_string(width_) + "x" +
                            std::to_string(height_) + " to " + std::to_string(picture.width) + "x" +
                            std::to_string(picture.height));
    }
    const AVRational rate = parser_->FrameRate();
    if (rate_ && rate_->num > 0 && rate.num > 0 && av_cmp_q(*rate_, rate) != 0) {
        // Whether it counts frames or fields, nobody knows.
        throw FormatChanged(kRateChanged);
    }
    rate_ = rate;
}

void VideoPass::CheckParameters(const AVPacket& packet) const {
    std::size_t size = 0;
    const std::uint8_t* const told = av_packet_get_side_data(&packet, AV_PKT_DATA_NEW_EXTRADATA, &size);
    const AVCodecParameters& known = *filter_->par_in;
    if (told != nullptr && !std::equal(told, told + size, known.extradata,
                                       known.extradata + std::max(0, known.extradata_size))) {
        throw FormatChanged("the parameter sets of the video changed");
    }
}

void VideoPass::Push(const AVPacket& packet, const PictureSink& sink) {
    CheckParameters(packet);
    const AVPacket& stream = Filter(packet);
    if (stream.size == 0) {
        ++damaged_;
        return;
    }
    const auto bytes = BytesOf(stream);
    const auto units = NalUnits(bytes);
    CodedPicture picture;
    picture.time = packet.pts;
    picture.keyFrame = Contains(units, kNalIdr);
    CheckParameterSets(units);
    sets_.Learn(units);
    timing_.Look(units);
    if (picture.keyFrame) {
        CheckFormat(stream);
    }
    if (const auto completed = sets_.Complete(bytes, units)) {
        picture.size = completed->size();
        picture.data = {new unsigned char[picture.size], std::default_delete<unsigned char[]>()};
        std::memcpy(picture.data.get(), completed->data(), picture.size);
    } else {
        picture.data = libav::Share(stream);
        picture.size = bytes.size();
    }
    if (picture.keyFrame) {
        picture.timecode = timecodes_->Read({picture.data.get(), picture.size});
        if (picture.timecode) {
            picture.timecode->dropFrame = timing_.DropFrame();
        }
    }
    sink(picture);
}

void VideoPass::Finish(const PictureSink& /*sink*/) {}

}  // namespace receiver
