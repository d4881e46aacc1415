#pragma once

#include <cstdint>
#include <deque>
#include <optional>
#include <string>

#include "common/FrameRate.h"
#include "source/Libav.h"

namespace receiver {

/// What the first second of a source's video shows.
struct VideoFindings {
    /// The rate of the table, or nothing when the source has another one.
    std::optional<FrameRate> rate;
    /// What the source says of its rate; 0/1 when nothing.
    AVRational toldRate{0, 1};
    /// Pictures are sent in another order than they are shown in.
    bool reordered = false;
    /// They are, and the source does not tell in which.
    bool unordered = false;
    /// Of reordered ones: as many as were decoded in front of one that is shown before all of them.
    std::uint32_t decodedAhead = 0;
    /// Of these: how much earlier the n-th one is decoded than the n-th one is shown, in ticks of 90000.
    /// Nothing where the source does not tell when pictures are decoded.
    std::optional<std::int64_t> delay;
    /// Pictures are interlaced frames.
    bool interlaced = false;
    /// Packets hold single fields.
    bool fields = false;
};

/// Looks at the packets of `stream` among `packets`. `expected`: a rate that is taken for granted while the
/// packets do not speak against it (of an earlier connection), or null. Throws `ReceiverError`
/// (`kSourceUnsuitable`) where no packet has a time stamp, and `SourceLost` where most are damaged and the
/// rest makes no sense.
VideoFindings CheckVideo(AVFormatContext& format, AVStream& stream,
                         const std::deque<libav::Owner<AVPacket>>& packets, const FrameRate* expected);

/// The middle one of the distances between pictures in seconds, 0 when there are none.
double PictureSpacing(const AVStream& stream, const std::deque<libav::Owner<AVPacket>>& packets);

/// As many pictures may be decoded in front of one that is shown before all of them; 0 where they come as
/// they are shown. By the source's decoding times; without these by what its parameter sets tell (`told`),
/// and where they don't by what a decoder has room for (ITU-T H.264 E.2.1).
std::uint32_t ReorderDepth(const VideoFindings& findings, const AVCodecParameters& parameters,
                           std::optional<std::uint32_t> told);

/// Why such video cannot be recorded untouched, as the beginning of a sentence: "the video is hevc, not
/// H.264". Empty when it can.
std::string WhyNotPassed(const AVCodecParameters& parameters, const VideoFindings& findings);

}  // namespace receiver
