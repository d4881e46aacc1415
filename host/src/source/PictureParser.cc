#include "source/PictureParser.h"

#include "common/ReceiverError.h"

namespace receiver {

PictureParser::PictureParser(const AVCodecParameters& parameters)
    : codec_(libav::NewCodec(avcodec_find_decoder(parameters.codec_id))),
      parser_(av_parser_init(parameters.codec_id)) {
    if (!parser_) {
        throw ReceiverError(ExitCode::kInternal, "FFmpeg's libraries on this machine have no parser for " +
                                                     std::string(avcodec_get_name(parameters.codec_id)));
    }
    libav::Check(avcodec_parameters_to_context(codec_.get(), &parameters),
                 "read the parameters of the video");
    parser_->flags |= PARSER_FLAG_COMPLETE_FRAMES;
    codec_->framerate = {0, 1};
}

PictureParser::Picture PictureParser::Parse(std::span<const unsigned char> picture) {
    std::uint8_t* out = nullptr;
    int size = 0;
    av_parser_parse2(parser_.get(), codec_.get(), &out, &size, picture.data(),
                     static_cast<int>(picture.size()), AV_NOPTS_VALUE, AV_NOPTS_VALUE, -1);
    Picture result;
    if (parser_->width > 0 && parser_->height > 0) {
        result.width = static_cast<std::uint32_t>(parser_->width);
        result.height = static_cast<std::uint32_t>(parser_->height);
    }
    result.field = parser_->picture_structure == AV_PICTURE_STRUCTURE_TOP_FIELD ||
                   parser_->picture_structure == AV_PICTURE_STRUCTURE_BOTTOM_FIELD;
    result.interlaced =
        parser_->field_order != AV_FIELD_UNKNOWN && parser_->field_order != AV_FIELD_PROGRESSIVE;
    return result;
}

}  // namespace receiver
