#pragma once

// The objects of libavcodec that this folder works with, each with its end.

#include <memory>

#include "media/ParameterSets.h"
#include "reader/InputFile.h"

extern "C" {
#include <libavcodec/avcodec.h>
}

namespace clipfile {

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

/// A decoder that calls every fault a failure. Null for `extradata` that it does not take. Throws
/// `std::bad_alloc`.
Context OpenDecoder(AVCodecID id, Bytes extradata);
/// Makes a packet one of these bytes. Throws `std::bad_alloc`.
void Fill(AVPacket& packet, Bytes bytes);

/// A decoder with these sets that was given a picture, an IDR picture in the form of a sample, and nothing
/// behind it. Null when it took none.
Context DecoderWith(const ParameterSets& sets, Bytes picture);
/// A picture, an IDR picture in the form of a sample, decoded with these sets. Null when it cannot be; it may
/// have faults all the same, which its flags tell.
Frame DecodePicture(const ParameterSets& sets, Bytes picture);

}  // namespace clipfile
