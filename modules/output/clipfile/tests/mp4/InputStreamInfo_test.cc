#include "mp4/InputStreamInfo.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <string>
#include <vector>

#include "LogCapture.h"

namespace clipfileModule {
namespace {

using ::testing::ElementsAre;

constexpr char kMake[] = "clipfileModule::InputStreamInfo::MakeInputStreamInfo";

nal_access::NalUnit nalUnit(std::vector<unsigned char> bytes) {
    nal_access::NalUnit nal;
    nal.size = bytes.size();
    nal.data = std::shared_ptr<unsigned char>(new unsigned char[bytes.size()],
                                              std::default_delete<unsigned char[]>());
    std::copy(bytes.begin(), bytes.end(), nal.data.get());
    return nal;
}

OutputSettings settingsAt(std::uint32_t framerate) {
    OutputSettings settings;
    settings.framerate = framerate;
    settings.width = 1920;
    settings.height = 1080;
    settings.bitrate = 60000;
    settings.streamStart = 1ULL << 40;
    settings.sps = nalUnit({0x67, 0x64, 0x00, 0x28, 0xAC});
    settings.pps = nalUnit({0x68, 0xEE});
    return settings;
}

struct Row {
    std::uint32_t key;
    std::uint32_t timescale;
    std::uint32_t duration;
    double framerate;
    std::uint32_t average;
    std::uint32_t averagePoint;
    std::uint32_t numFrames;
    std::uint32_t tmcd;
    std::uint32_t cadenceVideo;
    std::uint32_t cadenceAudio;
};

void PrintTo(const Row& row, std::ostream* out) {
    *out << row.key;
}

class InputStreamInfoRate : public ::testing::TestWithParam<Row> {};

TEST_P(InputStreamInfoRate, FillsTheRowOfTheTable) {
    const Row& row = GetParam();
    InputStreamInfo info;
    info.MakeInputStreamInfo(settingsAt(row.key));
    EXPECT_EQ(info.video_track_timescale, row.timescale);
    EXPECT_EQ(info.video_sample_duration, row.duration);
    EXPECT_EQ(info.video_framerate, row.framerate);
    EXPECT_EQ(info.video_average_framerate, row.average);
    EXPECT_EQ(info.video_average_framerate_point, row.averagePoint);
    EXPECT_EQ(info.timecode_numFrames, row.numFrames);
    EXPECT_EQ(info.tmcd_m_data_type_it, row.tmcd);
    EXPECT_EQ(info.cadence_video_frames, row.cadenceVideo);
    EXPECT_EQ(info.cadence_audio_frames, row.cadenceAudio);
    EXPECT_EQ(info.audio_track_timescale, 48000u);
    EXPECT_EQ(info.audio_sample_duration, 1024u);
}

INSTANTIATE_TEST_SUITE_P(Rates, InputStreamInfoRate,
                         ::testing::Values(Row{23980, 24000, 1001, 23.98, 23, 63965, 24, 0x0A, 512, 1001},
                                           // The cadence of 30000, kept so.
                                           Row{24000, 24000, 1000, 24.0, 24, 0, 24, 0x0A, 16, 25},
                                           Row{25000, 25000, 1000, 25.0, 25, 0, 25, 0x0A, 8, 15},
                                           Row{29970, 30000, 1001, 29.97, 29, 63572, 30, 0x0B, 640, 1001},
                                           Row{30000, 30000, 1000, 30.0, 30, 0, 30, 0x0A, 16, 25},
                                           Row{50000, 50000, 1000, 50.0, 50, 0, 50, 0x0A, 16, 15},
                                           Row{59940, 60000, 1001, 59.94, 59, 61608, 60, 0x0B, 1280, 1001},
                                           Row{60000, 60000, 1000, 60.0, 60, 0, 60, 0x0A, 32, 25}),
                         [](const auto& param) { return std::to_string(param.param.key); });

TEST(InputStreamInfo, DropFrameIsSetAt29970And59940AndNotAt23980) {
    InputStreamInfo info;
    info.MakeInputStreamInfo(settingsAt(29970));
    EXPECT_EQ(info.tmcd_m_data_type_it & 1U, 1u);
    info.MakeInputStreamInfo(settingsAt(59940));
    EXPECT_EQ(info.tmcd_m_data_type_it & 1U, 1u);
    info.MakeInputStreamInfo(settingsAt(23980));
    EXPECT_EQ(info.tmcd_m_data_type_it & 1U, 0u);
}

TEST(InputStreamInfo, CopiesPictureBitRateAndStreamStart) {
    InputStreamInfo info;
    info.MakeInputStreamInfo(settingsAt(25000));
    EXPECT_EQ(info.video_size_width, 1920);
    EXPECT_EQ(info.video_size_height, 1080);
    EXPECT_EQ(info.video_average_bitrate, 60000u);
    EXPECT_EQ(info.video_max_bitrate, 60000u);
    EXPECT_EQ(info.stream_start, 1ULL << 40);
}

TEST(InputStreamInfo, TheCodecWordHoldsVersionProfileCompatibilityAndLevel) {
    InputStreamInfo info;
    info.MakeInputStreamInfo(settingsAt(25000));
    EXPECT_EQ(info.video_codec_specific_information, 0x01640028u);
}

TEST(InputStreamInfo, AnUnknownRateLogsNoTypeAndLeavesAFreshTableAtZero) {
    LogCapture log;
    InputStreamInfo info;
    info.MakeInputStreamInfo(settingsAt(26000));
    EXPECT_EQ(log.Count(LOG_PRIORITY_WARNING, kMake, "no type."), 1u);
    EXPECT_EQ(log.Find("no type.")->file,
              "modules/output/clipfile/src/clipfileModule/mp4/InputStreamInfo.cc");
    EXPECT_EQ(info.video_track_timescale, 0u);
    EXPECT_EQ(info.video_sample_duration, 0u);
    EXPECT_EQ(info.video_framerate, 0.0);
    EXPECT_EQ(info.video_average_framerate, 0u);
    EXPECT_EQ(info.video_average_framerate_point, 0u);
    EXPECT_EQ(info.timecode_numFrames, 0u);
    EXPECT_EQ(info.tmcd_m_data_type_it, 0u);
    EXPECT_EQ(info.cadence_video_frames, 0u);
    EXPECT_EQ(info.cadence_audio_frames, 0u);
    EXPECT_EQ(info.video_size_width, 1920);
    EXPECT_EQ(info.video_size_height, 1080);
    EXPECT_EQ(info.video_average_bitrate, 60000u);
    EXPECT_EQ(info.video_max_bitrate, 60000u);
    EXPECT_EQ(info.video_codec_specific_information, 0x01640028u);
    EXPECT_EQ(info.audio_track_timescale, 48000u);
    EXPECT_EQ(info.audio_sample_duration, 1024u);
    EXPECT_EQ(info.stream_start, 1ULL << 40);
}

TEST(InputStreamInfo, AnUnknownRateKeepsTheRowBefore) {
    InputStreamInfo info;
    info.MakeInputStreamInfo(settingsAt(59940));
    info.MakeInputStreamInfo(settingsAt(26000));
    EXPECT_EQ(info.video_track_timescale, 60000u);
    EXPECT_EQ(info.cadence_video_frames, 1280u);
}

TEST(InputStreamInfo, AKnownRateWithBothSetsLogsNeitherFault) {
    LogCapture log;
    InputStreamInfo info;
    info.MakeInputStreamInfo(settingsAt(25000));
    EXPECT_FALSE(log.Contains("no type."));
    EXPECT_FALSE(log.Contains("sps/pps is null."));
}

TEST(InputStreamInfo, AnEmptyPpsLeavesTheCodecWordUntouched) {
    InputStreamInfo info;
    info.MakeInputStreamInfo(settingsAt(25000));
    OutputSettings settings = settingsAt(25000);
    settings.sps = nalUnit({0x67, 1, 2, 3});
    settings.pps = {};
    LogCapture log;
    info.MakeInputStreamInfo(settings);
    EXPECT_EQ(info.video_codec_specific_information, 0x01640028u);
    EXPECT_EQ(log.Count(LOG_PRIORITY_TRACE, kMake, "sps/pps is null."), 1u);
}

TEST(InputStreamInfo, AnEmptySpsLeavesTheCodecWordUntouched) {
    OutputSettings settings = settingsAt(25000);
    settings.sps = {};
    LogCapture log;
    InputStreamInfo info;
    info.MakeInputStreamInfo(settings);
    EXPECT_EQ(info.video_codec_specific_information, 0u);
    EXPECT_TRUE(log.Contains(LOG_PRIORITY_TRACE, kMake, "sps/pps is null."));
}

TEST(InputStreamInfo, AnSpsWithoutItsLevelCountsAsMissing) {
    OutputSettings settings = settingsAt(25000);
    settings.sps = nalUnit({0x67, 0x64, 0x00});
    LogCapture log;
    InputStreamInfo info;
    info.MakeInputStreamInfo(settings);
    EXPECT_EQ(info.video_codec_specific_information, 0u);
    EXPECT_TRUE(log.Contains("sps/pps is null."));
}

TEST(InputStreamInfo, LogsEveryFieldInOrder) {
    LogCapture log;
    InputStreamInfo info;
    info.MakeInputStreamInfo(settingsAt(29970));
    EXPECT_THAT(log.Texts(), ElementsAre("ST: ---------- input stream information start.",
                                         "ST:            video_track_timescale            = 30000",
                                         "ST:            video_sample_duration            = 1001",
                                         "ST:            video_average_bitrate            = 60000",
                                         "ST:            video_max_bitrate                = 60000",
                                         "ST:            video_framerate                  = 29.970000",
                                         "ST:            video_average_framerate          = 29",
                                         "ST:            video_average_framerate_point    = 63572",
                                         "ST:            video_size_width                 = 1920",
                                         "ST:            video_size_height                = 1080",
                                         "ST:            timecode_numFrames               = 30",
                                         "ST:            video_codec_specific_information = 23330856",
                                         "ST: ",  //
                                         "ST:            audio_track_timescale            = 48000",
                                         "ST:            audio_sample_duration            = 1024",
                                         "ST: ",  //
                                         "ST:            tmcd_m_data_type_it              = 0xb",
                                         "ST: ---------- input stream information end."));
    for (const CapturedLine& line : log.Lines()) {
        EXPECT_EQ(line.priority, LOG_PRIORITY_TRACE);
        EXPECT_FALSE(line.file.has_value());
        EXPECT_FALSE(line.function.has_value());
        EXPECT_EQ(line.line, 0);
    }
}

}  // namespace
}  // namespace clipfileModule
