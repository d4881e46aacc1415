#include "source/TimecodeReader.h"

#include <array>
#include <cstring>

extern "C" {
#include <libavutil/timecode.h>
}

#include "common/ReceiverError.h"

namespace receiver {
namespace {

/// IDR frames that are looked at before a source counts as one without timecode.
constexpr int kPatience = 10;

}  // namespace

std::optional<Timecode> TimecodeOf(const AVFrame& frame, AVRational rate) {
    const AVFrameSideData* const side = av_frame_get_side_data(&frame, AV_FRAME_DATA_S12M_TIMECODE);
    // The number of words, then the words.
    if (side == nullptr || side->size < 2 * sizeof(std::uint32_t)) {
        return std::nullopt;
    }
    std::array<std::uint32_t, 2> words{};
    std::memcpy(words.data(), side->data, sizeof(words));
    if (words[0] == 0) {
        return std::nullopt;
    }
    std::array<char, AV_TIMECODE_STR_SIZE> text{};
    av_timecode_make_smpte_tc_string2(text.data(), rate, words[1], 0, 0);
    return ParseTimecode(text.data());
}

TimecodeReader::TimecodeReader(const AVCodecParameters& parameters)
    : packet_(libav::NewPacket()), frame_(libav::NewFrame()) {
    const AVCodec* const decoder = avcodec_find_decoder(parameters.codec_id);
    codec_ = libav::NewCodec(decoder);
    libav::Check(avcodec_parameters_to_context(codec_.get(), &parameters),
                 "read the parameters of the video");
    codec_->thread_count = 1;
    // Only what stands in front of the picture is of interest.
    codec_->skip_loop_filter = AVDISCARD_ALL;
    codec_->skip_idct = AVDISCARD_ALL;
    libav::Check(avcodec_open2(codec_.get(), decoder, nullptr), "open a decoder for the timecode");
}

std::optional<Timecode> TimecodeReader::Read(std::span<const unsigned char> picture) {
    if (without_ >= kPatience) {
        return std::nullopt;
    }
    libav::Check(av_new_packet(packet_.get(), static_cast<int>(picture.size())), "hold a picture");
    std::memcpy(packet_->data, picture.data(), picture.size());
    std::optional<Timecode> timecode;
    // Draining brings the one picture out at once.
    if (avcodec_send_packet(codec_.get(), packet_.get()) >= 0 &&
        avcodec_send_packet(codec_.get(), nullptr) >= 0 &&
        avcodec_receive_frame(codec_.get(), frame_.get()) >= 0) {
        timecode = TimecodeOf(*frame_, codec_->framerate);
    }
    avcodec_flush_buffers(codec_.get());
    av_packet_unref(packet_.get());
    av_frame_unref(frame_.get());
    without_ = timecode ? -1000000 : without_ + 1;
    return timecode;
}

}  // namespace receiver
