#include "media/ContactSheet.h"

#include <algorithm>
#include <memory>
#include <new>

#include "media/Libav.h"

extern "C" {
#include <libswscale/swscale.h>
}

namespace clipfile {

namespace {

constexpr int kBytesPerPixel = 3;

struct FreeScaler {
    void operator()(SwsContext* context) const { sws_freeContext(context); }
};

/// Scales a frame into `target`, which has room for the cell in a row of `stride` bytes.
bool Scale(const AVFrame& frame, const ContactSheet::Cell& cell, std::uint8_t* target, int stride) {
    const std::unique_ptr<SwsContext, FreeScaler> scaler(
        sws_getContext(frame.width, frame.height, static_cast<AVPixelFormat>(frame.format), cell.width,
                       cell.height, AV_PIX_FMT_RGB24, SWS_AREA, nullptr, nullptr, nullptr));
    std::uint8_t* const planes[] = {target, nullptr, nullptr, nullptr};
    const int strides[] = {stride, 0, 0, 0};
    return scaler != nullptr && sws_scale(scaler.get(), frame.data, frame.linesize, 0, frame.height, planes,
                                          strides) == cell.height;
}

}  // namespace

ContactSheet::ContactSheet(int columns, int rows, Cell cell)
    : columns_(columns),
      rows_(rows),
      cell_(cell),
      // Scalers write some bytes beyond a row's end.
      pixels_(static_cast<std::size_t>(columns) * rows * cell.width * cell.height * kBytesPerPixel +
              AV_INPUT_BUFFER_PADDING_SIZE) {}

bool ContactSheet::Add(const ParameterSets& sets, Bytes picture) {
    if (count_ == columns_ * rows_) {
        return false;
    }
    const Frame frame = DecodePicture(sets, picture);
    const int stride = columns_ * cell_.width * kBytesPerPixel;
    // Scaled apart, for what is written beyond a row would be the next picture's.
    const int cellStride = (cell_.width * kBytesPerPixel + 63) / 64 * 64;
    std::vector<std::uint8_t> scaled(static_cast<std::size_t>(cellStride) * (cell_.height + 1));
    if (frame == nullptr || !Scale(*frame, cell_, scaled.data(), cellStride)) {
        return false;
    }
    std::uint8_t* row = pixels_.data() +
                        static_cast<std::ptrdiff_t>(count_ / columns_) * cell_.height * stride +
                        static_cast<std::ptrdiff_t>(count_ % columns_) * cell_.width * kBytesPerPixel;
    for (int y = 0; y < cell_.height; ++y, row += stride) {
        std::copy_n(&scaled[static_cast<std::size_t>(y) * cellStride], cell_.width * kBytesPerPixel, row);
    }
    ++count_;
    return true;
}

std::vector<unsigned char> ContactSheet::Png() const {
    const AVCodec* const codec = avcodec_find_encoder(AV_CODEC_ID_PNG);
    const Context context(avcodec_alloc_context3(codec));
    const Frame frame(av_frame_alloc());
    const Packet packet(av_packet_alloc());
    if (codec == nullptr || context == nullptr || frame == nullptr || packet == nullptr) {
        throw std::bad_alloc();
    }
    frame->width = context->width = columns_ * cell_.width;
    frame->height = context->height = rows_ * cell_.height;
    frame->format = context->pix_fmt = AV_PIX_FMT_RGB24;
    context->time_base = {1, 1};
    if (avcodec_open2(context.get(), codec, nullptr) < 0 || av_frame_get_buffer(frame.get(), 0) < 0) {
        throw std::bad_alloc();
    }
    const std::size_t stride = static_cast<std::size_t>(frame->width) * kBytesPerPixel;
    for (int y = 0; y < frame->height; ++y) {
        std::copy_n(&pixels_[static_cast<std::size_t>(y) * stride], stride,
                    frame->data[0] + static_cast<std::ptrdiff_t>(y) * frame->linesize[0]);
    }
    if (avcodec_send_frame(context.get(), frame.get()) < 0 ||
        avcodec_receive_packet(context.get(), packet.get()) < 0) {
        throw std::bad_alloc();
    }
    return {packet->data, packet->data + packet->size};
}

}  // namespace clipfile
