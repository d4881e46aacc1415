#include "LibavMuxer.h"

#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <vector>

#include "MuxerMaterial.h"

extern "C" {
#include <libavformat/avformat.h>
#include <libavutil/opt.h>
}

namespace {

constexpr int kVideo = 0;
constexpr int kSound = 1;
constexpr int kData = 2;
/// As libavformat takes for a file.
constexpr int kBufferBytes = 32768;
constexpr const char* kFragmentMicroseconds = "2000000";

void Check(int result, const char* what) {
    if (result < 0) {
        char text[AV_ERROR_MAX_STRING_SIZE] = {};
        av_strerror(result, text, sizeof(text));
        std::fprintf(stderr, "libavformat cannot %s: %s\n", what, text);
        std::abort();
    }
}

int CountBytes(void* bytes, std::uint8_t* /*data*/, int size) {
    *static_cast<std::uint64_t*>(bytes) += static_cast<std::uint64_t>(size);
    return size;
}

std::int64_t SeekNowhere(void* /*bytes*/, std::int64_t offset, int whence) {
    return whence == AVSEEK_SIZE ? AVERROR(ENOSYS) : offset;
}

void SetExtradata(AVCodecParameters& parameters, const std::vector<unsigned char>& bytes) {
    parameters.extradata =
        static_cast<std::uint8_t*>(av_mallocz(bytes.size() + AV_INPUT_BUFFER_PADDING_SIZE));
    parameters.extradata_size = static_cast<int>(bytes.size());
    std::memcpy(parameters.extradata, bytes.data(), bytes.size());
}

}  // namespace

LibavMuxer::LibavMuxer(const std::string& path, bool fragmented)
    : packet_(av_packet_alloc()), counting_(path.empty()) {
    Check(avformat_alloc_output_context2(&format_, nullptr, "mp4", path.c_str()), "make an MP4 file");
    AddVideo();
    AddSound();
    AddData();
    if (counting_) {
        format_->pb = avio_alloc_context(static_cast<unsigned char*>(av_malloc(kBufferBytes)), kBufferBytes,
                                         1, &bytes_, nullptr, CountBytes, SeekNowhere);
    } else {
        Check(avio_open(&format_->pb, path.c_str(), AVIO_FLAG_WRITE), "open the file");
    }
    if (fragmented) {
        Check(av_opt_set(format_->priv_data, "frag_duration", kFragmentMicroseconds, 0), "make fragments");
    }
    Check(avformat_write_header(format_, nullptr), "write the header");
}

LibavMuxer::~LibavMuxer() {
    av_packet_free(&packet_);
    if (counting_) {
        av_freep(&format_->pb->buffer);
        avio_context_free(&format_->pb);
    } else {
        avio_closep(&format_->pb);
    }
    avformat_free_context(format_);
}

void LibavMuxer::AddVideo() {
    AVStream* const stream = avformat_new_stream(format_, nullptr);
    AVCodecParameters& parameters = *stream->codecpar;
    parameters.codec_type = AVMEDIA_TYPE_VIDEO;
    parameters.codec_id = AV_CODEC_ID_H264;
    parameters.width = 1920;
    parameters.height = 1080;
    // ISO/IEC 14496-15 5.3.3.1.2: samples have their lengths in front of NAL units already.
    using muxer_material::kPictureSet;
    using muxer_material::kSequenceSet;
    std::vector<unsigned char> record = {1, kSequenceSet[1], kSequenceSet[2], kSequenceSet[3], 0xFF, 0xE1};
    record.insert(record.end(), {0, static_cast<unsigned char>(kSequenceSet.size())});
    record.insert(record.end(), kSequenceSet.begin(), kSequenceSet.end());
    record.insert(record.end(), {1, 0, static_cast<unsigned char>(kPictureSet.size())});
    record.insert(record.end(), kPictureSet.begin(), kPictureSet.end());
    SetExtradata(parameters, record);
    stream->time_base = {1, muxer_material::kPictureTimescale};
}

void LibavMuxer::AddSound() {
    AVStream* const stream = avformat_new_stream(format_, nullptr);
    AVCodecParameters& parameters = *stream->codecpar;
    parameters.codec_type = AVMEDIA_TYPE_AUDIO;
    parameters.codec_id = AV_CODEC_ID_AAC;
    parameters.sample_rate = muxer_material::kSoundTimescale;
    parameters.frame_size = muxer_material::kSoundTicks;
    parameters.ch_layout = AV_CHANNEL_LAYOUT_STEREO;
    SetExtradata(parameters, {0x11, 0x90});  // AAC LC, 48 kHz, stereo
    stream->time_base = {1, muxer_material::kSoundTimescale};
}

void LibavMuxer::AddData() {
    AVStream* const stream = avformat_new_stream(format_, nullptr);
    stream->codecpar->codec_type = AVMEDIA_TYPE_DATA;
    stream->codecpar->codec_id = AV_CODEC_ID_BIN_DATA;
    stream->codecpar->codec_tag = MKTAG('g', 'p', 'm', 'd');  // the one data track that it takes
    stream->time_base = {1, muxer_material::kPictureTimescale};
}

void LibavMuxer::Write(const clipfileModule::ChunkData& chunk) {
    WriteList(chunk.meta, kData, muxer_material::kPictureTicks, dataTime_);
    WriteList(chunk.audio, kSound, muxer_material::kSoundTicks, soundTime_);
    WriteList(chunk.video, kVideo, muxer_material::kPictureTicks, pictureTime_);
}

void LibavMuxer::WriteList(const std::vector<std::shared_ptr<nal_access::SampleData>>& samples, int stream,
                           std::int64_t duration, std::int64_t& time) {
    // The header may have chosen another time base.
    const AVRational told = {1, stream == kSound ? static_cast<int>(muxer_material::kSoundTimescale)
                                                 : static_cast<int>(muxer_material::kPictureTimescale)};
    for (const auto& sample : samples) {
        packet_->data = sample->GetData();
        packet_->size = static_cast<int>(sample->GetDataSize());
        packet_->stream_index = stream;
        packet_->pts = packet_->dts = time;
        packet_->duration = duration;
        packet_->flags = sample->GetSync() ? AV_PKT_FLAG_KEY : 0;
        av_packet_rescale_ts(packet_, told, format_->streams[stream]->time_base);
        Check(av_write_frame(format_, packet_), "write a sample");
        time += duration;
    }
}

void LibavMuxer::Close() {
    Check(av_write_trailer(format_), "complete the file");
}
