#include "source/VideoPass.h"

#include <algorithm>
#include <cstring>
#include <utility>

#include "common/ReceiverError.h"
#include "source/FormatWatch.h"

namespace receiver {
namespace {

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
    : filter_(parameters),
      width_(static_cast<std::uint32_t>(parameters.width)),
      height_(static_cast<std::uint32_t>(parameters.height)) {
    const auto units = filter_.OutOfBand();
    CheckParameterSets(units);
    sets_.Learn(units);
    timing_.Look(units);
    reorderFrames_ = timing_.ReorderFrames();
    parser_ = std::make_unique<PictureParser>(filter_.Stream());
    timecodes_ = std::make_unique<TimecodeReader>(filter_.Stream());
}

bool VideoPass::IsStart(const AVPacket& packet) {
    return Contains(NalUnits(BytesOf(filter_.Filter(packet))), kNalIdr);
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

void VideoPass::CheckReordering() {
    const auto told = timing_.ReorderFrames();
    const auto before = std::exchange(reorderFrames_, told);
    if (depth_ == 0 || !told || !before || *told == *before) {
        return;
    }
    if (*told == 0) {
        throw FormatChanged(kReorderedNoMore);
    }
    if (*told > depth_) {
        throw FormatChanged(kReorderedOtherwise);
    }
}

void VideoPass::CheckParameters(const AVPacket& packet) const {
    std::size_t size = 0;
    const std::uint8_t* const told = av_packet_get_side_data(&packet, AV_PKT_DATA_NEW_EXTRADATA, &size);
    const AVCodecParameters& known = filter_.Source();
    if (told != nullptr && !std::equal(told, told + size, known.extradata,
                                       known.extradata + std::max(0, known.extradata_size))) {
        throw FormatChanged("the parameter sets of the video changed");
    }
}

void VideoPass::Push(const AVPacket& packet, const PictureSink& sink) {
    CheckParameters(packet);
    const AVPacket& stream = filter_.Filter(packet);
    if (stream.size == 0) {
        ++damaged_;
        return;
    }
    const auto bytes = BytesOf(stream);
    // Nothing behind the first slice matters here. Where an IDR frame begins behind a rest of another
    // picture, which a loss may leave, the packet is marked.
    const bool marked = (packet.flags & AV_PKT_FLAG_KEY) != 0;
    const auto units = marked ? NalUnits(bytes) : LeadingNalUnits(bytes);
    CodedPicture picture;
    picture.time = packet.dts != AV_NOPTS_VALUE ? packet.dts : packet.pts;
    picture.later = packet.pts - picture.time;
    picture.keyFrame = Contains(units, kNalIdr);
    CheckParameterSets(units);
    sets_.Learn(units);
    timing_.Look(units);
    if (picture.keyFrame) {
        CheckFormat(stream);
        CheckReordering();
    }
    if (const auto completed = sets_.Complete(bytes, units)) {
        picture.size = completed->size();
        picture.data = {new unsigned char[picture.size], std::default_delete<unsigned char[]>()};
        std::memcpy(picture.data.get(), completed->data(), picture.size);
    } else {
        picture.data = libav::Share(stream);
        picture.size = bytes.size();
    }
    // Timecode stands in a message (ITU-T H.264 D.1.3); without one nothing needs to be decoded.
    if (picture.keyFrame && Contains(units, kNalMessages)) {
        picture.timecode = timecodes_->Read({picture.data.get(), picture.size});
        if (picture.timecode) {
            picture.timecode->dropFrame = timing_.DropFrame();
        }
    }
    sink(picture);
}

void VideoPass::Finish(const PictureSink& /*sink*/) {}

}  // namespace receiver
