#include "display/FileReport.h"

extern "C" {
#include <libavformat/avformat.h>
}

#include <algorithm>
#include <array>
#include <cerrno>
#include <cmath>
#include <cstdio>
#include <filesystem>
#include <iomanip>
#include <memory>

#include "StreamAnalyzer.h"
#include "common/Timecode.h"

namespace receiver {
namespace {

struct CloseInput {
    void operator()(AVFormatContext* context) const { avformat_close_input(&context); }
};
struct FreePacket {
    void operator()(AVPacket* packet) const { av_packet_free(&packet); }
};

std::string Problem(int error) {
    std::array<char, AV_ERROR_MAX_STRING_SIZE> text{};
    av_strerror(error, text.data(), text.size());
    return text.data();
}

constexpr std::uint32_t kTimecodeTag = MKTAG('t', 'm', 'c', 'd');
constexpr std::uint32_t kMetadataTag = MKTAG('r', 't', 'm', 'd');

AVStream* FindStream(const AVFormatContext& context, bool (*matches)(const AVCodecParameters&)) {
    for (unsigned int i = 0; i < context.nb_streams; ++i) {
        if (matches(*context.streams[i]->codecpar)) {
            return context.streams[i];
        }
    }
    return nullptr;
}

double Seconds(std::int64_t ticks, const AVStream& stream) {
    return static_cast<double>(ticks) * av_q2d(stream.time_base);
}

const AVStream* FindMetadata(const AVFormatContext& context) {
    return FindStream(context,
                      [](const AVCodecParameters& codec) { return codec.codec_tag == kMetadataTag; });
}

/// Of a file's pictures those that are shown: the last ones may only be there because shown ones need them.
/// Each that is shown has a unit of metadata.
std::uint64_t Shown(std::int64_t pictures, std::int64_t units) {
    return static_cast<std::uint64_t>(
        std::max<std::int64_t>(0, units > 0 ? std::min(pictures, units) : pictures));
}

/// The address in a metadata sample; empty when it has none.
std::string TimecodeOfMetadata(const AVPacket& packet) {
    const auto unit = std::make_shared<StreamData>();
    unit->size = static_cast<std::uint64_t>(packet.size);
    unit->payload = packet.data;
    std::shared_ptr<nal_access::SampleData> sample;
    bool dropFrame = false;
    nal_access::StreamAnalyzer().ConvertTmcd(unit, sample, dropFrame, 0, 0);
    if (sample == nullptr) {
        return {};
    }
    const unsigned char* const fields = sample->GetData();
    return ToString(Timecode{fields[0], fields[1], fields[2], fields[3], dropFrame});
}

/// The tables of a fragmented file are empty: length and frames come from its fragments, and the first
/// address from its metadata, since its timecode track holds no value. Only the first samples are read, and
/// of the rest what the fragments say of them: files are large, and may lie behind a network.
void ReadFragments(AVFormatContext& context, AVStream& video, RecordedFile& file) {
    const AVStream* const metadata = FindMetadata(context);
    const auto isOfInterest = [&](const AVStream* stream) { return stream == &video || stream == metadata; };
    for (unsigned int i = 0; i < context.nb_streams; ++i) {
        context.streams[i]->discard = isOfInterest(context.streams[i]) ? AVDISCARD_DEFAULT : AVDISCARD_ALL;
    }
    const std::unique_ptr<AVPacket, FreePacket> packet(av_packet_alloc());
    std::int64_t duration = 0;
    file.startTimecode.clear();
    while (packet && av_read_frame(&context, packet.get()) >= 0) {
        AVStream& stream = *context.streams[packet->stream_index];
        if (&stream == &video) {
            duration = packet->duration;
        } else {
            file.startTimecode = TimecodeOfMetadata(*packet);
        }
        stream.discard = AVDISCARD_ALL;
        av_packet_unref(packet.get());
    }
    const int count = avformat_index_get_entries_count(&video);
    if (count > 0) {
        // Reordered pictures are decoded from before 0 on.
        const std::int64_t first = avformat_index_get_entry(&video, 0)->timestamp;
        const std::int64_t last = avformat_index_get_entry(&video, count - 1)->timestamp;
        // The demuxer does not tell how long the last frame lasts: as long as the one before it.
        const std::int64_t before =
            count > 1 ? avformat_index_get_entry(&video, count - 2)->timestamp : last - duration;
        file.frames = Shown(count, metadata != nullptr ? avformat_index_get_entries_count(metadata) : 0);
        file.seconds =
            Seconds(last + last - before - first, video) * static_cast<double>(file.frames) / count;
    }
}

/// Octets of one question to the reader of a file.
constexpr int kReadSize = 1 << 16;

/// A file as FFmpeg's libraries read it.
struct ReaderState {
    const FileReader& read;
    std::int64_t size;
    std::int64_t position = 0;
};

struct FreeReader {
    void operator()(AVIOContext* reader) const {
        av_freep(&reader->buffer);
        avio_context_free(&reader);
    }
};

int ReadFrom(void* opaque, std::uint8_t* data, int size) {
    auto& state = *static_cast<ReaderState*>(opaque);
    const int count = state.read(state.position, data, size);
    state.position += std::max(count, 0);
    return count > 0 ? count : count == 0 ? AVERROR_EOF : AVERROR(EIO);
}

std::int64_t SeekIn(void* opaque, std::int64_t offset, int origin) {
    auto& state = *static_cast<ReaderState*>(opaque);
    switch (origin & ~AVSEEK_FORCE) {
        case AVSEEK_SIZE:
            return state.size;
        case SEEK_SET:
            return state.position = offset;
        case SEEK_CUR:
            return state.position += offset;
        case SEEK_END:
            return state.position = state.size + offset;
        default:
            return AVERROR(EINVAL);
    }
}

AVFormatContext* NewContext() {
    AVFormatContext* const context = avformat_alloc_context();
    if (context != nullptr) {
        // What stands in the samples is of no interest here.
        context->flags |= AVFMT_FLAG_NOPARSE | AVFMT_FLAG_NOFILLIN;
    }
    return context;
}

/// Opens `name` with `opened`, which it takes over, and fills in `file`.
void ReadOpened(AVFormatContext* opened, const std::string& name, RecordedFile& file) {
    const int result =
        opened == nullptr ? AVERROR(ENOMEM) : avformat_open_input(&opened, name.c_str(), nullptr, nullptr);
    if (result < 0) {
        file.problem = Problem(result);
        return;
    }
    const std::unique_ptr<AVFormatContext, CloseInput> context(opened);
    AVStream* const video = FindStream(
        *context, [](const AVCodecParameters& codec) { return codec.codec_type == AVMEDIA_TYPE_VIDEO; });
    if (video == nullptr) {
        file.problem = "there is no video in it";
        return;
    }
    const AVStream* const timecode =
        FindStream(*context, [](const AVCodecParameters& codec) { return codec.codec_tag == kTimecodeTag; });
    const AVDictionaryEntry* const first =
        timecode != nullptr ? av_dict_get(timecode->metadata, "timecode", nullptr, 0) : nullptr;
    file.startTimecode = first != nullptr ? first->value : "";
    if (context->duration > 0 && video->duration > 0) {
        // The sound may end half an audio frame behind the pictures.
        file.seconds = Seconds(video->duration, *video);
        const AVStream* const metadata = FindMetadata(*context);
        file.frames = Shown(video->nb_frames, metadata != nullptr ? metadata->nb_frames : 0);
    } else {
        ReadFragments(*context, *video, file);
    }
}

}  // namespace

RecordedFile ReadBack(const std::string& path) {
    RecordedFile file;
    file.path = path;
    std::error_code error;
    const std::uintmax_t bytes = std::filesystem::file_size(path, error);
    if (error) {
        file.problem = error.message();
        return file;
    }
    file.bytes = bytes;
    // The prefix keeps a path with a colon from being taken for an address.
    ReadOpened(NewContext(), "file:" + path, file);
    return file;
}

RecordedFile ReadBack(const std::string& path, std::uint64_t bytes, const FileReader& reader) {
    RecordedFile file;
    file.path = path;
    file.bytes = bytes;
    ReaderState state{reader, static_cast<std::int64_t>(bytes)};
    auto* const buffer = static_cast<unsigned char*>(av_malloc(kReadSize));
    const std::unique_ptr<AVIOContext, FreeReader> input(
        avio_alloc_context(buffer, kReadSize, 0, &state, ReadFrom, nullptr, SeekIn));
    AVFormatContext* const context = NewContext();
    if (buffer == nullptr || input == nullptr || context == nullptr) {
        avformat_free_context(context);
        file.problem = Problem(AVERROR(ENOMEM));
        return file;
    }
    context->pb = input.get();
    ReadOpened(context, path, file);
    return file;
}

std::string FormatBytes(std::uint64_t bytes) {
    constexpr std::array<const char*, 5> kUnits{"B", "kB", "MB", "GB", "TB"};
    auto value = static_cast<double>(bytes);
    std::size_t unit = 0;
    // 999.95 would be printed as 1000.0.
    while (value >= 999.95 && unit + 1 < kUnits.size()) {
        value /= 1000;
        ++unit;
    }
    std::array<char, 32> text{};
    std::snprintf(text.data(), text.size(), unit == 0 ? "%.0f %s" : "%.1f %s", value, kUnits[unit]);
    return text.data();
}

std::string FormatSeconds(double seconds) {
    const long long milliseconds = std::llround(std::max(seconds, 0.0) * 1000);
    std::array<char, 48> text{};
    std::snprintf(text.data(), text.size(), "%02lld:%02lld:%02lld.%03lld", milliseconds / 3600000,
                  milliseconds / 60000 % 60, milliseconds / 1000 % 60, milliseconds % 1000);
    return text.data();
}

void PrintFiles(std::ostream& out, const std::vector<RecordedFile>& files) {
    if (files.empty()) {
        return;
    }
    std::size_t width = 4;
    for (const RecordedFile& file : files) {
        width = std::max(width, file.path.size());
    }
    const auto column = static_cast<int>(width);
    out << std::left << std::setw(column) << "File" << std::right << std::setw(11) << "Size" << std::setw(13)
        << "Start" << std::setw(14) << "Length" << std::setw(9) << "Frames" << '\n';
    for (const RecordedFile& file : files) {
        out << std::left << std::setw(column) << file.path << std::right << std::setw(11)
            << FormatBytes(file.bytes);
        if (file.problem.empty()) {
            out << std::setw(13) << (file.startTimecode.empty() ? "-" : file.startTimecode) << std::setw(14)
                << FormatSeconds(file.seconds) << std::setw(9) << file.frames << '\n';
        } else {
            out << "  cannot be read: " << file.problem << '\n';
        }
    }
}

}  // namespace receiver
