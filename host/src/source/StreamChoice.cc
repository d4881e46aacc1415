#include "source/StreamChoice.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <optional>
#include <string_view>
#include <vector>

#include "common/Credentials.h"
#include "common/ReceiverError.h"
#include "source/AudioPath.h"

namespace receiver {
namespace {

using Indices = std::vector<int>;

ReceiverError Unsuitable(const AVFormatContext& format, const std::string& rest) {
    return {ExitCode::kSourceUnsuitable, "'" + WithoutCredentials(format.url) + "' " + rest};
}

/// "1, 2 and 5"
std::string List(const std::vector<std::string>& items) {
    std::string text;
    for (std::size_t at = 0; at < items.size(); ++at) {
        text += at == 0 ? "" : at + 1 == items.size() ? " and " : ", ";
        text += items[at];
    }
    return text;
}

/// The streams among which is chosen.
Indices Members(const AVFormatContext& format, const SourceOptions& options) {
    if (!options.program) {
        Indices all(format.nb_streams);
        for (std::size_t at = 0; at < all.size(); ++at) {
            all[at] = static_cast<int>(at);
        }
        return all;
    }
    std::vector<std::string> numbers;
    for (unsigned int at = 0; at < format.nb_programs; ++at) {
        const AVProgram& program = *format.programs[at];
        if (program.id == static_cast<int>(*options.program)) {
            return Indices(program.stream_index, program.stream_index + program.nb_stream_indexes);
        }
        numbers.push_back(std::to_string(program.id));
    }
    throw Unsuitable(format, "has no program " + std::to_string(*options.program) + ": " +
                                 (numbers.empty() ? "it has none" : "it has " + List(numbers)));
}

Indices OfType(const AVFormatContext& format, const Indices& members, AVMediaType type) {
    Indices chosen;
    std::copy_if(members.begin(), members.end(), std::back_inserter(chosen), [&](int index) {
        const AVStream& stream = *format.streams[index];
        return stream.codecpar->codec_type == type && (stream.disposition & AV_DISPOSITION_ATTACHED_PIC) == 0;
    });
    return chosen;
}

/// The one that is asked for, counted from 1; else `usual`.
int Choose(const AVFormatContext& format, const Indices& streams, std::optional<std::uint32_t> number,
           int usual, const std::string& name) {
    if (!number) {
        return usual;
    }
    if (*number > streams.size()) {
        throw Unsuitable(format, "has no " + name + " " + std::to_string(*number) + ": it has " +
                                     std::to_string(streams.size()));
    }
    return streams[*number - 1];
}

/// The first one of the largest picture, -1 without any.
int LargestVideo(const AVFormatContext& format, const Indices& videos) {
    const auto area = [&format](int index) {
        const AVCodecParameters& parameters = *format.streams[index]->codecpar;
        return std::int64_t{parameters.width} * parameters.height;
    };
    const auto largest =
        std::max_element(videos.begin(), videos.end(), [&area](int a, int b) { return area(a) < area(b); });
    return largest != videos.end() ? *largest : -1;
}

/// The first one that sounds, of the video's program where there are programs; -1 without any.
int FirstAudio(AVFormatContext& format, const Indices& audios, int video) {
    const AVProgram* const program = av_find_program_from_stream(&format, nullptr, video);
    const auto first = std::find_if(audios.begin(), audios.end(), [&](int index) {
        const unsigned int* const begin = program != nullptr ? program->stream_index : nullptr;
        const unsigned int* const end = program != nullptr ? begin + program->nb_stream_indexes : nullptr;
        const bool related =
            program == nullptr || std::find(begin, end, static_cast<unsigned int>(index)) != end;
        // Nothing is known of a stream that has not begun.
        return related && format.streams[index]->codecpar->sample_rate > 0;
    });
    return first != audios.end() ? *first : -1;
}

/// "audio 2 (AAC LC 48 kHz stereo, deu)"
std::string Describe(const AVStream& stream, const std::string& name, std::size_t number) {
    const AVCodecParameters& parameters = *stream.codecpar;
    std::string text = name + " " + std::to_string(number) + " (";
    text += parameters.codec_type == AVMEDIA_TYPE_AUDIO
                ? AudioSummary(parameters)
                : std::string(avcodec_get_name(parameters.codec_id)) + " " +
                      std::to_string(parameters.width) + "x" + std::to_string(parameters.height);
    const AVDictionaryEntry* const language = av_dict_get(stream.metadata, "language", nullptr, 0);
    return text + (language != nullptr ? std::string(", ") + language->value : "") + ")";
}

std::string NoticeOf(const AVFormatContext& format, const Indices& videos, const Indices& audios,
                     const StreamChoice& choice) {
    std::vector<std::string> taken;
    std::vector<std::string> left;
    const auto sort = [&](const Indices& streams, int chosen, const std::string& name) {
        for (std::size_t at = 0; at < streams.size(); ++at) {
            (streams[at] == chosen ? taken : left)
                .push_back(Describe(*format.streams[streams[at]], name, at + 1));
        }
    };
    sort(videos, choice.video, "video");
    sort(audios, choice.audio, "audio");
    return left.empty() ? "" : "recorded: " + List(taken) + "; left out: " + List(left);
}

/// What FFmpeg's libraries read without a container.
bool IsBare(const AVInputFormat& format) {
    constexpr std::array<std::string_view, 5> kBare{"h264", "hevc", "m4v", "mpegvideo", "vc1"};
    return std::find(kBare.begin(), kBare.end(), format.name) != kBare.end();
}

}  // namespace

StreamChoice ChooseStreams(AVFormatContext& format, const SourceOptions& options) {
    const Indices members = Members(format, options);
    const Indices videos = OfType(format, members, AVMEDIA_TYPE_VIDEO);
    const Indices audios = OfType(format, members, AVMEDIA_TYPE_AUDIO);
    StreamChoice choice;
    choice.video = Choose(format, videos, options.video, LargestVideo(format, videos), "video");
    if (choice.video < 0) {
        throw Unsuitable(format, "carries no video: a recording needs one");
    }
    if (IsBare(*format.iformat)) {
        throw Unsuitable(
            format,
            "is a bare video stream: without time stamps nobody knows when a picture is due, and it "
            "has no audio; put it into a container first, such as ffmpeg -framerate 25 -i FILE "
            "-c copy FILE.mp4");
    }
    choice.audio = Choose(format, audios, options.audio, FirstAudio(format, audios, choice.video), "audio");
    choice.notice = NoticeOf(format, videos, audios, choice);
    return choice;
}

}  // namespace receiver
