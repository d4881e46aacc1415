#include "support/CodedMedia.h"

#include <memory>
#include <stdexcept>

extern "C" {
#include <libavformat/avformat.h>
#include <libavutil/log.h>
}

namespace endtoend {
namespace {

void check(int result, const std::string& what) {
    if (result < 0) {
        throw std::runtime_error(what + ": error " + std::to_string(result));
    }
}

struct InputCloser {
    void operator()(AVFormatContext* context) const { avformat_close_input(&context); }
};
struct OutputCloser {
    void operator()(AVFormatContext* context) const {
        avio_closep(&context->pb);
        avformat_free_context(context);
    }
};
struct PacketFreer {
    void operator()(AVPacket* packet) const { av_packet_free(&packet); }
};
using Input = std::unique_ptr<AVFormatContext, InputCloser>;
using Output = std::unique_ptr<AVFormatContext, OutputCloser>;
using Packet = std::unique_ptr<AVPacket, PacketFreer>;

Input openInput(const std::filesystem::path& file) {
    av_log_set_level(AV_LOG_FATAL);
    AVFormatContext* context = nullptr;
    check(avformat_open_input(&context, file.c_str(), nullptr, nullptr), "open " + file.string());
    Input input(context);
    check(avformat_find_stream_info(context, nullptr), "probe " + file.string());
    return input;
}

Bytes bytesOf(const AVPacket& packet) {
    return {packet.data, packet.data + packet.size};
}

/// The NAL units of an access unit with 4-byte lengths (ISO/IEC 14496-15) or start codes (ISO/IEC 14496-10
/// annex B).
std::vector<Bytes> splitNalUnits(const Bytes& unit, bool lengths) {
    std::vector<Bytes> found;
    const auto cut = [&](std::size_t from, std::size_t to) {
        found.emplace_back(unit.begin() + static_cast<std::ptrdiff_t>(from),
                           unit.begin() + static_cast<std::ptrdiff_t>(to));
    };
    if (lengths) {
        for (std::size_t at = 0; at + 4 <= unit.size();) {
            std::size_t length = 0;
            for (int i = 0; i < 4; ++i) {
                length = length << 8 | unit[at++];
            }
            if (length > unit.size() - at) {
                throw std::runtime_error("a NAL unit runs past its sample");
            }
            cut(at, at + length);
            at += length;
        }
        return found;
    }
    std::size_t begin = 0;
    for (std::size_t at = 0; at + 3 <= unit.size(); ++at) {
        if (unit[at] == 0 && unit[at + 1] == 0 && unit[at + 2] == 1) {
            std::size_t end = at;
            while (end > begin && unit[end - 1] == 0) {
                --end;
            }
            if (begin > 0) {
                cut(begin, end);
            }
            begin = at + 3;
            at += 2;
        }
    }
    if (begin > 0) {
        std::size_t end = unit.size();
        while (end > begin && unit[end - 1] == 0) {
            --end;
        }
        cut(begin, end);
    }
    return found;
}

CodedPicture makePicture(const Bytes& unit, bool lengths) {
    CodedPicture picture;
    for (Bytes& nal : splitNalUnits(unit, lengths)) {
        const int type = nal.empty() ? 0 : nal.front() & 0x1F;
        if (type >= 1 && type <= 6) {
            picture.idr = picture.idr || type == 5;
            picture.nalUnits.push_back(std::move(nal));
        }
    }
    return picture;
}

Bytes withoutAdtsHeader(const Bytes& frame) {
    if (frame.size() > 9 && frame[0] == 0xFF && (frame[1] & 0xF6) == 0xF0) {
        const std::ptrdiff_t header = (frame[1] & 1) != 0 ? 7 : 9;
        return {frame.begin() + header, frame.end()};
    }
    return frame;
}

/// A file with the streams of `input`, open and without header.
Output makeTransportStream(const AVFormatContext& input, const std::filesystem::path& target) {
    AVFormatContext* context = nullptr;
    check(avformat_alloc_output_context2(&context, nullptr, "mpegts", target.c_str()), "mpegts");
    Output output(context);
    for (unsigned i = 0; i < input.nb_streams; ++i) {
        AVStream* stream = avformat_new_stream(context, nullptr);
        check(avcodec_parameters_copy(stream->codecpar, input.streams[i]->codecpar), "copy parameters");
        stream->codecpar->codec_tag = 0;
    }
    check(avio_open(&context->pb, target.c_str(), AVIO_FLAG_WRITE), "create " + target.string());
    return output;
}

}  // namespace

CodedMedia ReadCodedMedia(const std::filesystem::path& file) {
    const Input input = openInput(file);
    int dataStream = -1;
    for (unsigned i = 0; i < input->nb_streams; ++i) {
        if (input->streams[i]->codecpar->codec_type == AVMEDIA_TYPE_DATA) {
            dataStream = static_cast<int>(i);
        }
    }
    CodedMedia media;
    const Packet packet(av_packet_alloc());
    while (av_read_frame(input.get(), packet.get()) >= 0) {
        const AVStream& stream = *input->streams[packet->stream_index];
        const AVCodecParameters& codec = *stream.codecpar;
        const double time = static_cast<double>(packet->pts) * av_q2d(stream.time_base);
        if (codec.codec_type == AVMEDIA_TYPE_VIDEO) {
            media.videoTimes.push_back(time);
            const bool lengths = codec.extradata_size > 0 && codec.extradata[0] == 1;
            media.video.push_back(makePicture(bytesOf(*packet), lengths));
        } else if (codec.codec_type == AVMEDIA_TYPE_AUDIO) {
            media.audioTimes.push_back(time);
            media.audio.push_back(withoutAdtsHeader(bytesOf(*packet)));
        } else if (packet->stream_index == dataStream) {
            media.data.push_back(bytesOf(*packet));
        }
        av_packet_unref(packet.get());
    }
    return media;
}

void AddKlvStream(const std::filesystem::path& source, const std::filesystem::path& target,
                  std::size_t picturesPerPacket) {
    const Input input = openInput(source);
    const Output output = makeTransportStream(*input, target);
    AVFormatContext* const context = output.get();
    AVStream* klv = avformat_new_stream(context, nullptr);
    klv->codecpar->codec_type = AVMEDIA_TYPE_DATA;
    klv->codecpar->codec_id = AV_CODEC_ID_SMPTE_KLV;
    check(avformat_write_header(context, nullptr), "header");

    std::size_t pictures = 0;
    std::size_t packets = 0;
    const Packet packet(av_packet_alloc());
    while (av_read_frame(input.get(), packet.get()) >= 0) {
        const AVStream& from = *input->streams[packet->stream_index];
        const bool isVideo = from.codecpar->codec_type == AVMEDIA_TYPE_VIDEO;
        av_packet_rescale_ts(packet.get(), from.time_base, context->streams[packet->stream_index]->time_base);
        if (isVideo && pictures++ % picturesPerPacket == 0) {
            const Bytes bytes = MakeKlvPacket(packets++);
            const Packet extra(av_packet_alloc());
            check(av_new_packet(extra.get(), static_cast<int>(bytes.size())), "packet");
            std::copy(bytes.begin(), bytes.end(), extra->data);
            extra->stream_index = klv->index;
            extra->pts = extra->dts = packet->pts;
            av_packet_rescale_ts(extra.get(), context->streams[packet->stream_index]->time_base,
                                 klv->time_base);
            check(av_interleaved_write_frame(context, extra.get()), "write");
        }
        packet->pos = -1;
        check(av_interleaved_write_frame(context, packet.get()), "write");
    }
    check(av_write_trailer(context), "trailer");
}

void RepeatMaterial(const std::filesystem::path& source, const std::filesystem::path& target,
                    std::size_t pictures, std::size_t sounds, std::size_t times, int rate) {
    const Input input = openInput(source);
    std::vector<Packet> video;
    std::vector<Packet> audio;
    Packet packet(av_packet_alloc());
    while (av_read_frame(input.get(), packet.get()) >= 0) {
        const bool isVideo = input->streams[packet->stream_index]->codecpar->codec_type == AVMEDIA_TYPE_VIDEO;
        (isVideo ? video : audio).push_back(std::move(packet));
        packet.reset(av_packet_alloc());
    }
    if (video.size() < pictures || audio.size() < sounds) {
        throw std::runtime_error("the material is too short");
    }
    const Output output = makeTransportStream(*input, target);
    check(avformat_write_header(output.get(), nullptr), "header");
    const auto write = [&](const AVPacket& from, std::size_t number, AVRational timeBase) {
        const Packet copy(av_packet_clone(&from));
        copy->pts = copy->dts = static_cast<std::int64_t>(number);
        copy->duration = 1;
        copy->pos = -1;
        av_packet_rescale_ts(copy.get(), timeBase, output->streams[copy->stream_index]->time_base);
        check(av_interleaved_write_frame(output.get(), copy.get()), "write");
    };
    std::size_t sound = 0;
    for (std::size_t picture = 0; picture < pictures * times; ++picture) {
        write(*video[picture % pictures], picture, {1, rate});
        // As much sound as goes with the pictures so far.
        for (; sound < sounds * times && av_compare_ts(static_cast<std::int64_t>(sound), {1024, 48000},
                                                       static_cast<std::int64_t>(picture + 1), {1, rate}) < 0;
             ++sound) {
            write(*audio[sound % sounds], sound, {1024, 48000});
        }
    }
    check(av_write_trailer(output.get()), "trailer");
}

}  // namespace endtoend
