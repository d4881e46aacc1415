#include "mp4/InputStreamInfo.h"

#include <algorithm>
#include <iterator>

#include "common/Log.h"

namespace clipfileModule {

namespace {

/// AAC frames of 1024 samples at 48 kHz; nothing else is recorded.
constexpr std::uint32_t kAudioTimescale = 48000;
constexpr std::uint32_t kAudioSampleDuration = 1024;

struct FrameRateRow {
    std::uint32_t key;  // frames per 1000 seconds
    std::uint32_t timescale;
    std::uint32_t sampleDuration;
    double framerate;
    std::uint32_t averageFramerate;
    std::uint32_t averageFrameratePoint;
    std::uint32_t numFrames;
    std::uint32_t tmcdFlags;
    std::uint32_t cadenceVideoFrames;
    std::uint32_t cadenceAudioFrames;
};

// Contract: cadence-of-24-is-that-of-30. On purpose.
// Contract: rate-23-98-is-23-976. The fraction of 23980, other than those of 29970 and 59940.
constexpr FrameRateRow kFrameRates[] = {
    {23980, 24000, 1001, 23.98, 23, 63965, 24, 0x0A, 512, 1001},
    {24000, 24000, 1000, 24.0, 24, 0, 24, 0x0A, 16, 25},
    {25000, 25000, 1000, 25.0, 25, 0, 25, 0x0A, 8, 15},
    {29970, 30000, 1001, 29.97, 29, 63572, 30, 0x0B, 640, 1001},
    {30000, 30000, 1000, 30.0, 30, 0, 30, 0x0A, 16, 25},
    {50000, 50000, 1000, 50.0, 50, 0, 50, 0x0A, 16, 15},
    {59940, 60000, 1001, 59.94, 59, 61608, 60, 0x0B, 1280, 1001},
    {60000, 60000, 1000, 60.0, 60, 0, 60, 0x0A, 32, 25},
};

}  // namespace

void InputStreamInfo::MakeInputStreamInfo(const OutputSettings& settings) {
    const auto* const row =
        std::find_if(std::begin(kFrameRates), std::end(kFrameRates),
                     [&](const FrameRateRow& candidate) { return candidate.key == settings.framerate; });
    if (row != std::end(kFrameRates)) {
        video_track_timescale = row->timescale;
        video_sample_duration = row->sampleDuration;
        video_framerate = row->framerate;
        video_average_framerate = row->averageFramerate;
        video_average_framerate_point = row->averageFrameratePoint;
        timecode_numFrames = row->numFrames;
        tmcd_m_data_type_it = row->tmcdFlags;
        cadence_video_frames = row->cadenceVideoFrames;
        cadence_audio_frames = row->cadenceAudioFrames;
    } else {
        // Contract: unknown-frame-rate. The record keeps what it had: zeros.
        CLIPFILE_LOG(LOG_PRIORITY_WARNING, "no type.");
    }

    video_size_width = static_cast<std::uint16_t>(settings.width);
    video_size_height = static_cast<std::uint16_t>(settings.height);
    video_average_bitrate = settings.bitrate;
    video_max_bitrate = settings.bitrate;

    // Contract: short-set-counts-as-missing. One too short to carry its level came from a broken stream.
    if (settings.sps.data != nullptr && settings.sps.size >= kMinimumSpsSize &&
        settings.pps.data != nullptr) {
        const unsigned char* const sps = settings.sps.data.get();
        video_codec_specific_information = 0x01000000U + (static_cast<std::uint32_t>(sps[1]) << 16) +
                                           (static_cast<std::uint32_t>(sps[2]) << 8) + sps[3];
    } else {
        CLIPFILE_LOG(LOG_PRIORITY_TRACE, "sps/pps is null.");
    }

    audio_track_timescale = kAudioTimescale;
    audio_sample_duration = kAudioSampleDuration;
    stream_start = settings.streamStart;
    dump();
}

void InputStreamInfo::dump() const {
    const auto number = [](const char* name, std::uint32_t value) {
        CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST:            %-33s= %d", name, static_cast<int>(value));
    };
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: ---------- input stream information start.");
    number("video_track_timescale", video_track_timescale);
    number("video_sample_duration", video_sample_duration);
    number("video_average_bitrate", video_average_bitrate);
    number("video_max_bitrate", video_max_bitrate);
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST:            %-33s= %f", "video_framerate", video_framerate);
    number("video_average_framerate", video_average_framerate);
    number("video_average_framerate_point", video_average_framerate_point);
    number("video_size_width", video_size_width);
    number("video_size_height", video_size_height);
    number("timecode_numFrames", timecode_numFrames);
    number("video_codec_specific_information", video_codec_specific_information);
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: ");
    number("audio_track_timescale", audio_track_timescale);
    number("audio_sample_duration", audio_sample_duration);
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: ");
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST:            %-33s= 0x%x", "tmcd_m_data_type_it",
                       tmcd_m_data_type_it);
    CLIPFILE_LOG_PLAIN(LOG_PRIORITY_TRACE, "ST: ---------- input stream information end.");
}

}  // namespace clipfileModule
