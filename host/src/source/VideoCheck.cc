#include "source/VideoCheck.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdio>
#include <iterator>
#include <string_view>
#include <vector>

#include "common/ReceiverError.h"
#include "source/CodedUnits.h"
#include "source/Input.h"
#include "source/PictureParser.h"
#include "timing/FrameGrid.h"

namespace receiver {
namespace {

struct Stamps {
    std::int64_t shown = 0;
    std::optional<std::int64_t> decoded;
    bool keyFrame = false;
};

std::vector<Stamps> StampsOf(const AVStream& stream, const std::deque<libav::Owner<AVPacket>>& packets) {
    std::vector<Stamps> stamps;
    for (const auto& packet : packets) {
        // What is damaged may have the stamps of another picture.
        const bool whole = (packet->flags & AV_PKT_FLAG_CORRUPT) == 0;
        if (packet->stream_index == stream.index && packet->pts != AV_NOPTS_VALUE && whole) {
            stamps.push_back({packet->pts,
                              packet->dts == AV_NOPTS_VALUE ? std::optional<std::int64_t>() : packet->dts,
                              (packet->flags & AV_PKT_FLAG_KEY) != 0});
        }
    }
    return stamps;
}

struct PictureCounts {
    std::size_t all = 0;
    std::size_t damaged = 0;
    std::size_t stamped = 0;
};

PictureCounts CountPictures(const AVStream& stream, const std::deque<libav::Owner<AVPacket>>& packets) {
    PictureCounts counts;
    for (const auto& packet : packets) {
        if (packet->stream_index == stream.index) {
            ++counts.all;
            counts.damaged += (packet->flags & AV_PKT_FLAG_CORRUPT) != 0 ? 1 : 0;
            counts.stamped += packet->pts != AV_NOPTS_VALUE || packet->dts != AV_NOPTS_VALUE ? 1 : 0;
        }
    }
    return counts;
}

bool Reordered(const AVStream& stream, const std::vector<Stamps>& stamps) {
    std::optional<std::int64_t> delay;
    for (std::size_t at = 0; at < stamps.size(); ++at) {
        // A counter that wraps goes back by far more.
        const std::int64_t step = at == 0 ? 1 : stamps[at].shown - stamps[at - 1].shown;
        if (step < 0 && av_rescale_q(-step, stream.time_base, {1, 1}) < 10) {
            return true;
        }
        if (stamps[at].decoded) {
            const std::int64_t now = stamps[at].shown - *stamps[at].decoded;
            if (delay && now != *delay) {
                return true;
            }
            delay = now;
        }
    }
    // The encoder announces reordering and stamps for it, though it has not come to it yet.
    return delay && *delay > 0 && stream.codecpar->video_delay > 0;
}

/// RTP and Matroska stamp pictures with the time when they are shown, and nothing else.
bool TellsDecoding(const AVFormatContext& format) {
    const std::string_view name = format.iformat->name;
    return name != "sdp" && name != "rtsp" && name != "rtp" && name != "matroska,webm";
}

/// How much earlier the n-th picture is decoded than the n-th one is shown, of the middle one: at either end
/// pictures are missing that are shown beyond it.
std::optional<std::int64_t> DelayOfTurns(const AVStream& stream, const std::vector<Stamps>& stamps) {
    std::vector<std::int64_t> shown;
    std::vector<std::int64_t> decoded;
    for (const Stamps& picture : stamps) {
        if (picture.decoded) {
            shown.push_back(picture.shown);
            decoded.push_back(*picture.decoded);
        }
    }
    if (shown.empty()) {
        return std::nullopt;
    }
    const auto middle = static_cast<std::ptrdiff_t>(shown.size() / 2);
    std::nth_element(shown.begin(), shown.begin() + middle, shown.end());
    std::nth_element(decoded.begin(), decoded.begin() + middle, decoded.end());
    return av_rescale_q(shown[shown.size() / 2] - decoded[decoded.size() / 2], stream.time_base, kTicks);
}

/// Of pictures that are reordered.
std::uint32_t DecodedAhead(const std::vector<Stamps>& stamps) {
    std::ptrdiff_t most = 0;
    for (auto picture = stamps.begin(); picture != stamps.end(); ++picture) {
        // Behind an IDR picture nothing is shown in front of it.
        const auto group = std::find_if(std::make_reverse_iterator(picture), stamps.rend(),
                                        [](const Stamps& before) { return before.keyFrame; });
        const auto begin = group == stamps.rend() ? stamps.begin() : std::prev(group.base());
        most = std::max(most, std::count_if(begin, picture, [&picture](const Stamps& before) {
                            return before.shown > picture->shown;
                        }));
    }
    return static_cast<std::uint32_t>(most);
}

/// Frames that a decoder has room for (ITU-T H.264 A.3.1, MaxDpbMbs in table A-1).
std::uint32_t DecoderFrames(const AVCodecParameters& parameters) {
    struct Level {
        int idc;
        int macroblocks;
    };
    static constexpr Level kLevels[] = {{10, 396},   {11, 900},   {12, 2376},   {20, 2376},   {21, 4752},
                                        {22, 8100},  {30, 8100},  {31, 18000},  {32, 20480},  {40, 32768},
                                        {41, 32768}, {42, 34816}, {50, 110400}, {51, 184320}, {52, 184320}};
    const int size = (parameters.width + 15) / 16 * ((parameters.height + 15) / 16);
    const auto* const level =
        std::find_if(std::begin(kLevels), std::end(kLevels),
                     [&parameters](const Level& entry) { return entry.idc == parameters.level; });
    if (level == std::end(kLevels) || size <= 0) {
        return kMostReorderFrames;
    }
    return std::clamp(static_cast<std::uint32_t>(level->macroblocks / size), 1U, kMostReorderFrames);
}

/// The mean distance between pictures in seconds. There must be two.
double MeanSpacing(const AVStream& stream, const std::vector<Stamps>& stamps) {
    const auto [first, last] = std::minmax_element(
        stamps.begin(), stamps.end(), [](const Stamps& a, const Stamps& b) { return a.shown < b.shown; });
    return static_cast<double>(last->shown - first->shown) * av_q2d(stream.time_base) /
           static_cast<double>(stamps.size() - 1);
}

/// Stamps in milliseconds move a distance by up to one.
bool Fits(AVRational rate, double spacing) {
    return spacing <= 0 || std::abs(av_q2d(av_inv_q(rate)) - spacing) < 0.0015;
}

}  // namespace

double PictureSpacing(const AVStream& stream, const std::deque<libav::Owner<AVPacket>>& packets) {
    const std::vector<Stamps> stamps = StampsOf(stream, packets);
    std::vector<std::int64_t> shown;
    std::transform(stamps.begin(), stamps.end(), std::back_inserter(shown),
                   [](const Stamps& stamp) { return stamp.shown; });
    std::sort(shown.begin(), shown.end());
    std::vector<std::int64_t> steps;
    for (std::size_t at = 1; at < shown.size(); ++at) {
        steps.push_back(shown[at] - shown[at - 1]);
    }
    if (steps.empty()) {
        return 0;
    }
    std::nth_element(steps.begin(), steps.begin() + static_cast<std::ptrdiff_t>(steps.size() / 2),
                     steps.end());
    return static_cast<double>(steps[steps.size() / 2]) * av_q2d(stream.time_base);
}

VideoFindings CheckVideo(AVFormatContext& format, AVStream& stream,
                         const std::deque<libav::Owner<AVPacket>>& packets, const FrameRate* expected) {
    const PictureCounts pictures = CountPictures(stream, packets);
    if (pictures.all > 0 && pictures.stamped == 0) {
        throw ReceiverError(ExitCode::kSourceUnsuitable,
                            "the video has no time stamps, as a raw byte stream has none: send a transport "
                            "stream, or put it into a container with its frame rate");
    }
    VideoFindings findings;
    const std::vector<Stamps> stamps = StampsOf(stream, packets);
    findings.reordered = Reordered(stream, stamps);
    // As in AVI, which stamps pictures with the time when they are decoded and nothing else.
    findings.unordered = stamps.empty() && pictures.stamped > 0 && stream.codecpar->video_delay > 0;
    if (findings.reordered) {
        findings.decodedAhead = DecodedAhead(stamps);
        findings.delay = TellsDecoding(format) ? DelayOfTurns(stream, stamps) : std::nullopt;
    }
    AVRational pictureRate{0, 1};
    if (stream.codecpar->codec_id == AV_CODEC_ID_H264) {
        PictureParser parser(*stream.codecpar);
        for (const auto& packet : packets) {
            if (packet->stream_index == stream.index) {
                const auto picture = parser.Parse({packet->data, static_cast<std::size_t>(packet->size)});
                findings.fields |= picture.field;
                findings.interlaced |= picture.interlaced;
            }
        }
        pictureRate = parser.FrameRate();
    }
    const double spacing = PictureSpacing(stream, packets) * (findings.fields ? 2 : 1);
    if (expected != nullptr &&
        Fits({static_cast<int>(expected->numerator), static_cast<int>(expected->denominator)}, spacing)) {
        findings.rate = *expected;
    }
    const std::array<AVRational, 4> told{pictureRate, stream.avg_frame_rate, stream.r_frame_rate,
                                         av_guess_frame_rate(&format, &stream, nullptr)};
    for (const AVRational& rate : told) {
        if (rate.num <= 0 || rate.den <= 0 || !Fits(rate, spacing)) {
            continue;
        }
        if (findings.toldRate.num == 0) {
            findings.toldRate = rate;
        }
        if (!findings.rate) {
            findings.rate = NearestFrameRate(rate.num, rate.den);
        }
    }
    if (findings.toldRate.num == 0 && spacing > 0) {
        // Nobody tells; what the pictures show is good for the nearest rate only.
        const double mean = MeanSpacing(stream, stamps) * (findings.fields ? 2 : 1);
        findings.toldRate = av_d2q(1 / mean, 100000);
        if (!findings.rate) {
            findings.rate = NearestFrameRate(findings.toldRate.num, findings.toldRate.den);
        }
    }
    if ((findings.reordered || !findings.rate) && pictures.damaged * 2 > pictures.all) {
        // What is left of the pictures is no witness against the encoder.
        throw SourceLost(std::to_string(pictures.damaged) + " of " + std::to_string(pictures.all) +
                         " pictures arrived damaged; look for a second sender at the same address, and for "
                         "losses on the network");
    }
    return findings;
}

std::uint32_t ReorderDepth(const VideoFindings& findings, const AVCodecParameters& parameters,
                           std::optional<std::uint32_t> told) {
    if (!findings.reordered) {
        return 0;
    }
    std::uint32_t depth = told ? *told : DecoderFrames(parameters);
    if (findings.delay && findings.rate) {
        depth = static_cast<std::uint32_t>(
            std::max<std::int64_t>(0, FrameGrid(*findings.rate).FramesIn(*findings.delay)));
    }
    return std::clamp(std::max(depth, findings.decodedAhead), 1U, kMostReorderFrames);
}

std::string WhyNotPassed(const AVCodecParameters& parameters, const VideoFindings& findings) {
    if (parameters.codec_id != AV_CODEC_ID_H264) {
        return std::string("the video is ") + avcodec_get_name(parameters.codec_id) +
               ", and only H.264 is recorded as it comes: set the encoder to H.264";
    }
    if (parameters.width <= 0) {
        // Nothing can be said of its pictures.
        return "";
    }
    if (findings.fields) {
        return "the video is interlaced with single fields: set the encoder to progressive pictures";
    }
    if (findings.unordered) {
        return "the video has reordered pictures (B frames), and the source does not tell when they are "
               "shown: set the encoder to no B frames";
    }
    if (!findings.rate) {
        std::array<char, 32> rate{};
        std::snprintf(rate.data(), rate.size(), "%.5g",
                      findings.toldRate.num == 0 ? 0 : av_q2d(findings.toldRate));
        return "the video has " + std::string(rate.data()) +
               " frames a second: set the encoder to 23.976, 24, 25, 29.97, 30, 50, 59.94 or 60";
    }
    return "";
}

}  // namespace receiver
