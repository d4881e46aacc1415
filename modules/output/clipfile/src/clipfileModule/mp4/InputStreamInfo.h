#pragma once

#include <cstdint>

#include "common/OutputSettings.h"

namespace clipfileModule {

/// Bytes of the shortest sequence parameter set that counts: NAL header, profile, compatibility and level.
inline constexpr std::uint64_t kMinimumSpsSize = 4;

/// The numbers that file format and buffering need, derived once from the stream's parameters and then only
/// read.
class InputStreamInfo {
 public:
    virtual ~InputStreamInfo() = default;

    /// Fills the record from `settings` and logs it. A frame rate outside the table is logged and leaves the
    /// fields that depend on it as they were. A missing parameter set is logged and leaves
    /// `video_codec_specific_information` as it was.
    void MakeInputStreamInfo(const OutputSettings& settings);

    /// Time scale of the video, timecode and metadata tracks and of the movie, and ticks of a frame in it.
    std::uint32_t video_track_timescale = 0;
    std::uint32_t video_sample_duration = 0;
    std::uint32_t video_average_bitrate = 0;
    std::uint32_t video_max_bitrate = 0;
    double video_framerate = 0;
    /// The frame rate as a fixed-point number: integer part, and fraction in units of 1/65536.
    std::uint32_t video_average_framerate = 0;
    std::uint32_t video_average_framerate_point = 0;
    /// Pixels.
    std::uint16_t video_size_width = 0;
    std::uint16_t video_size_height = 0;
    /// Frames of a timecode second.
    std::uint32_t timecode_numFrames = 0;
    /// Head of the AVC decoder configuration record: version 1, profile, compatibility, level (ISO/IEC
    /// 14496-15 5.3.3.1.2).
    std::uint32_t video_codec_specific_information = 0;
    std::uint32_t audio_track_timescale = 0;
    std::uint32_t audio_sample_duration = 0;
    /// Timecode flag word; bit 0 is drop frame.
    std::uint32_t tmcd_m_data_type_it = 0;
    /// A period after which video and audio frames begin together again, in frames of each.
    std::uint32_t cadence_video_frames = 0;
    std::uint32_t cadence_audio_frames = 0;
    std::uint64_t stream_start = 0;

 private:
    void dump() const;
};

}  // namespace clipfileModule
