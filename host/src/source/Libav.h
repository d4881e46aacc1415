#pragma once

extern "C" {
#include <libavcodec/avcodec.h>
#include <libavcodec/bsf.h>
#include <libavformat/avformat.h>
#include <libavutil/audio_fifo.h>
#include <libavutil/avutil.h>
#include <libavutil/dict.h>
#include <libavutil/frame.h>
#include <libswresample/swresample.h>
}

#include <memory>
#include <string>

namespace receiver {

/// The time base of video in a transport stream, and of all times in the receiver but those of audio.
inline constexpr AVRational kTicks{1, 90000};

}  // namespace receiver

namespace receiver::libav {

/// Ends the life of FFmpeg's objects, each in its own way.
struct Free {
    void operator()(AVAudioFifo* fifo) const { av_audio_fifo_free(fifo); }
    void operator()(AVBSFContext* filter) const { av_bsf_free(&filter); }
    void operator()(AVCodecContext* codec) const { avcodec_free_context(&codec); }
    void operator()(AVCodecParserContext* parser) const { av_parser_close(parser); }
    void operator()(AVFormatContext* format) const { avformat_close_input(&format); }
    void operator()(AVFrame* frame) const { av_frame_free(&frame); }
    void operator()(AVPacket* packet) const { av_packet_free(&packet); }
    void operator()(SwrContext* resampler) const { swr_free(&resampler); }
};
template <typename T>
using Owner = std::unique_ptr<T, Free>;

/// Empty ones. Throw `std::bad_alloc`.
Owner<AVFrame> NewFrame();
Owner<AVPacket> NewPacket();
Owner<AVCodecContext> NewCodec(const AVCodec* codec);

/// The libraries' sentence for an error.
std::string ErrorText(int error);
/// Gives `result` back. Throws `ReceiverError` (`kInternal`), "cannot `action`: ...", when it is negative.
int Check(int result, const char* action);

/// The payload of a packet, held by a reference of its own.
std::shared_ptr<unsigned char> Share(const AVPacket& packet);

/// Options for the libraries' open functions.
class Options {
 public:
    Options() = default;
    Options(const Options&) = delete;
    Options& operator=(const Options&) = delete;
    ~Options() { av_dict_free(&dictionary_); }
    void Set(const char* key, const std::string& value) { av_dict_set(&dictionary_, key, value.c_str(), 0); }
    /// For an open function, which replaces it by what it did not understand.
    AVDictionary** Get() { return &dictionary_; }

 private:
    AVDictionary* dictionary_ = nullptr;
};

/// From now on the libraries print nothing; `LastError` keeps what they would have.
void CollectMessages();
/// What the libraries last called an error on this thread since `ForgetErrors`, without line end; often the
/// only place where they tell the cause.
std::string LastError();
void ForgetErrors();

}  // namespace receiver::libav
