#include "source/StreamPaths.h"

#include <algorithm>
#include <cmath>
#include <utility>

#include "common/Credentials.h"
#include "common/ReceiverError.h"
#include "source/Summary.h"
#include "source/VideoCheck.h"
#include "source/VideoConverter.h"
#include "source/VideoPass.h"

namespace receiver {
namespace {

/// Throws `ReceiverError` for video that can neither pass nor be converted.
void CheckUsable(const AVFormatContext& format, const AVCodecParameters& parameters,
                 const SourceOptions& options, const std::string& whyNotPassed) {
    if (!options.transcode && !whyNotPassed.empty()) {
        throw ReceiverError(ExitCode::kSourceUnsuitable, whyNotPassed + ", or use --transcode");
    }
    if (parameters.width <= 0 || parameters.height <= 0) {
        throw ReceiverError(
            ExitCode::kSourceUnsuitable,
            "the video of '" + WithoutCredentials(format.url) +
                "' cannot be read: no parameter sets came; set the encoder to send them with each "
                "IDR frame");
    }
}

SourceDescription Describe(const AVFormatContext& format, const AVCodecParameters& parameters,
                           const VideoFindings& findings) {
    SourceDescription description;
    description.width = static_cast<std::uint32_t>(parameters.width);
    description.height = static_cast<std::uint32_t>(parameters.height);
    if (findings.rate) {
        description.frameRate = *findings.rate;
    }
    const std::int64_t bitrate =
        parameters.bit_rate != 0 ? parameters.bit_rate : std::max<std::int64_t>(0, format.bit_rate);
    description.bitrate = static_cast<std::uint32_t>(bitrate / 1000);
    return description;
}

std::string H264With(const AVCodecParameters& parameters) {
    const char* const profile = avcodec_profile_name(parameters.codec_id, parameters.profile);
    return profile != nullptr ? std::string("H.264 ") + profile : "H.264";
}

/// Replaces the description by that of what the video is converted to.
void Convert(const AVCodecParameters& parameters, const VideoEncoding& encoding,
             const VideoFindings& findings, const SourceOptions& options, bool buildsUp, StreamPaths& paths) {
    if (!findings.rate && !options.frameRate) {
        throw ReceiverError(
            ExitCode::kSourceUnsuitable,
            "the frame rate of the source is none that can be recorded: tell --transcode which "
            "one to make of it with --fps");
    }
    paths.video = std::make_unique<VideoConverter>(parameters, encoding, findings.toldRate, buildsUp);
    paths.description = {encoding.frameRate, encoding.width, encoding.height, encoding.bitrate, {}};
    paths.description.summary = VideoSummary("H.264", paths.description);
    paths.notices.push_back("video is converted: " + std::string(avcodec_get_name(parameters.codec_id)) +
                            " " + std::to_string(parameters.width) + "x" + std::to_string(parameters.height) +
                            " to " + paths.description.summary);
}

/// The pictures with which a decoder can begin are no IDR frames, as from an encoder that refreshes its
/// pictures bit by bit: a recording might wait for one for ever.
bool RefreshesWithoutIdr(VideoPass& pass, const AVStream& stream, const Packets& ahead) {
    bool refreshes = false;
    for (const auto& packet : ahead) {
        if (packet->stream_index == stream.index && (packet->flags & AV_PKT_FLAG_KEY) != 0) {
            if (pass.IsStart(*packet)) {
                return false;
            }
            refreshes = true;
        }
    }
    return refreshes;
}

/// The file tells that it has another number of pictures than its rate asks for: where one was shown longer,
/// none follows.
bool RateVaries(const AVStream& stream, const FrameRate& rate) {
    constexpr double kSlack = 0.02;
    if (stream.nb_frames <= 1 || stream.duration <= 0) {
        return false;
    }
    const double seconds = static_cast<double>(stream.duration) * av_q2d(stream.time_base);
    const double expected =
        seconds * static_cast<double>(rate.numerator) / static_cast<double>(rate.denominator);
    // One picture more or less is a matter of rounding.
    const double missing = std::abs(static_cast<double>(stream.nb_frames) - expected);
    return missing > 1 && missing > kSlack * expected;
}

void DecideVideo(AVFormatContext& format, AVStream& stream, const Packets& ahead,
                 const SourceOptions& options, const SourceDescription* before, StreamPaths& paths) {
    const AVCodecParameters& parameters = *stream.codecpar;
    const VideoFindings findings = CheckVideo(
        format, stream, ahead, before != nullptr && !options.transcode ? &before->frameRate : nullptr);
    const std::string reason = WhyNotPassed(parameters, findings);
    CheckUsable(format, parameters, options, reason);
    SourceDescription& description = paths.description;
    description = Describe(format, parameters, findings);
    const VideoEncoding encoding = EncodingOf(options, description);
    const FrameRate& likely = encoding.frameRate;
    paths.sourceRate = findings.toldRate.num > 0 ? findings.toldRate
                                                 : AVRational{static_cast<int>(likely.numerator),
                                                              static_cast<int>(likely.denominator)};
    paths.passes = reason.empty() && (!options.transcode || (encoding.frameRate == description.frameRate &&
                                                             encoding.width == description.width &&
                                                             encoding.height == description.height));
    std::unique_ptr<VideoPass> pass;
    bool buildsUp = false;
    if (paths.passes) {
        pass = std::make_unique<VideoPass>(parameters);
        buildsUp = options.transcode && RefreshesWithoutIdr(*pass, stream, ahead);
        const bool varies = findings.rate && RateVaries(stream, *findings.rate);
        if (varies && !options.transcode) {
            paths.notices.emplace_back(
                "the frame rate varies, and pictures that are not there count as lost: --transcode makes it "
                "constant");
        }
        paths.passes = !buildsUp && !(varies && options.transcode);
    }
    if (findings.interlaced) {
        paths.notices.emplace_back(paths.passes ? "the video is interlaced and is recorded as such"
                                                : "the video is interlaced and becomes progressive");
    }
    if (paths.passes) {
        description.reordering = ReorderDepth(findings, parameters, pass->ReorderFrames());
        pass->SetReordering(description.reordering);
        paths.video = std::move(pass);
        description.summary = VideoSummary(H264With(parameters), description);
    } else {
        Convert(parameters, encoding, findings, options, buildsUp, paths);
    }
}

void DecideAudio(const AVStream* stream, const Packets& ahead, StreamPaths& paths) {
    if (stream == nullptr) {
        paths.notices.emplace_back("there is no audio: silence is recorded");
        paths.description.summary += ", silence";
        return;
    }
    const auto first = std::find_if(ahead.begin(), ahead.end(), [stream](const auto& packet) {
        return packet->stream_index == stream->index;
    });
    paths.description.summary += std::string(", ") + kRecordedAudioSummary;
    const AVCodecParameters& parameters = *stream->codecpar;
    if (CanPass(parameters, first == ahead.end() ? nullptr : first->get())) {
        paths.audio = std::make_unique<AudioPass>();
        return;
    }
    paths.audio = std::make_unique<AudioConverter>(parameters);
    paths.notices.push_back("audio is converted: " + AudioSummary(parameters) + " to " +
                            kRecordedAudioSummary);
}

}  // namespace

StreamPaths DecidePaths(AVFormatContext& format, AVStream& video, const AVStream* audio, const Packets& ahead,
                        const SourceOptions& options, const SourceDescription* before) {
    StreamPaths paths;
    DecideVideo(format, video, ahead, options, before, paths);
    DecideAudio(audio, ahead, paths);
    return paths;
}

}  // namespace receiver
