#include <algorithm>
#include <chrono>
#include <sstream>

#include "SourceTesting.h"
#include "support/CodedMedia.h"

namespace receiver {
namespace {

using std::string;

class FileSource : public SourceTest {
 protected:
    /// What another program finds in the file: the video as byte stream, and the sizes of its packets.
    string VideoOf(const string& name) const {
        Ffmpeg("-i " + name + " -map 0:v -c copy -bsf:v h264_mp4toannexb -f data video.bin");
        return FileBytes(Path("video.bin"));
    }
    string AudioOf(const string& name) const {
        Ffmpeg("-i " + name + " -map 0:a -c copy -f adts audio.bin");
        return FileBytes(Path("audio.bin"));
    }
};

void ExpectFrames(const std::vector<SourceUnit>& video, std::size_t count, std::int64_t period) {
    ASSERT_EQ(video.size(), count);
    for (std::size_t n = 0; n < count; ++n) {
        EXPECT_EQ(video[n].time, static_cast<std::int64_t>(n) * period);
    }
}

void ExpectGapless(const std::vector<SourceUnit>& audio) {
    ASSERT_FALSE(audio.empty());
    // In step with the first picture: within half a frame of it.
    EXPECT_GE(audio[0].time, -512);
    EXPECT_LE(audio[0].time, 512);
    for (std::size_t n = 1; n < audio.size(); ++n) {
        EXPECT_EQ(audio[n].time - audio[n - 1].time, 1024);
    }
}

TEST_F(FileSource, TransportStreamPassesByteForByte) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "a.ts");
    const auto source = OpenSource(Fast("a.ts"), notices_, nullptr);
    EXPECT_EQ(source->Description().frameRate.key, 25000u);
    EXPECT_EQ(source->Description().width, 128u);
    EXPECT_EQ(source->Description().height, 96u);
    EXPECT_EQ(source->Description().summary,
              "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo");
    const auto units = ReadAll(*source);
    const auto video = Of(Medium::kVideo, units);
    ExpectFrames(video, 25, 3600);
    EXPECT_EQ(BytesOf(video), VideoOf("a.ts"));
    const auto audio = Of(Medium::kAudio, units);
    ExpectGapless(audio);
    // The encoder's priming stands before the first picture.
    const string sent = AudioOf("a.ts");
    const string got = BytesOf(audio);
    ASSERT_GE(sent.size(), got.size());
    EXPECT_NE(sent.find(got), string::npos);
    EXPECT_EQ(source->Counts().lostFrames, 0u);
    EXPECT_EQ(source->Counts().damagedPackets, 0u);
    EXPECT_TRUE(notices_.sentences.empty()) << notices_.sentences[0];
}

TEST_F(FileSource, Mp4GetsItsParameterSetsInFrontOfEachIdrFrame) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "a.mp4");
    const auto units = ReadFile("a.mp4");
    const auto video = Of(Medium::kVideo, units);
    ExpectFrames(video, 25, 3600);
    for (std::size_t n = 0; n < video.size(); ++n) {
        const auto types = NalTypes(video[n]);
        EXPECT_EQ(video[n].keyFrame, n % 12 == 0);
        EXPECT_EQ(std::count(types.begin(), types.end(), 7), n % 12 == 0 ? 1 : 0);
        EXPECT_EQ(std::count(types.begin(), types.end(), 8), n % 12 == 0 ? 1 : 0);
    }
    EXPECT_EQ(BytesOf(video), VideoOf("a.mp4"));
    const auto audio = Of(Medium::kAudio, units);
    ExpectGapless(audio);
    EXPECT_NE(AudioOf("a.mp4").find(BytesOf(audio)), string::npos);
}

TEST_F(FileSource, AccessUnitsWithDelimitersComeWhole) {
    Ffmpeg(string(kPicture) + kPlainH264 + "-x264-params aud=1:slices=3 a.ts");
    const auto video = Of(Medium::kVideo, ReadFile("a.ts"));
    ExpectFrames(video, 25, 3600);
    for (const SourceUnit& unit : video) {
        const auto types = NalTypes(unit);
        EXPECT_EQ(types.front(), 9);
        EXPECT_EQ(std::count(types.begin(), types.end(), 9), 1);
        EXPECT_EQ(std::count_if(types.begin(), types.end(), [](int type) { return type == 1 || type == 5; }),
                  3);
    }
    EXPECT_EQ(BytesOf(video), VideoOf("a.ts"));
}

TEST_F(FileSource, ParameterSetsThatCameOnceAreRepeatedBehindTheDelimiter) {
    // The global header keeps x264 from repeating them; the raw stream begins with them.
    Ffmpeg(string(kPicture) + kPlainH264 + "-x264-params aud=1 -flags +global_header a.mp4");
    Ffmpeg("-i a.mp4 -c copy -bsf:v 'h264_mp4toannexb,filter_units=remove_types=6|7|8' bare.h264");
    Ffmpeg("-i a.mp4 -c copy -frames:v 1 -bsf:v 'h264_mp4toannexb,filter_units=remove_types=6' first.h264");
    Shell("cat first.h264 bare.h264 > once.h264");
    Ffmpeg("-r 25 -i once.h264 -c copy once.ts");
    const auto video = Of(Medium::kVideo, ReadFile("once.ts"));
    ASSERT_EQ(video.size(), 26u);
    for (const SourceUnit& unit : video) {
        const auto types = NalTypes(unit);
        EXPECT_EQ(types.front(), 9);
        if (unit.keyFrame) {
            ASSERT_GE(types.size(), 4u);
            EXPECT_EQ(std::vector<int>(types.begin(), types.begin() + 3), (std::vector<int>{9, 7, 8}));
        }
    }
}

TEST_F(FileSource, MediaComeInTheOrderOfTime) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "a.ts");
    std::int64_t picture = -1;
    for (const SourceUnit& unit : ReadFile("a.ts")) {
        if (unit.medium == Medium::kVideo) {
            picture = unit.time;
        } else if (picture >= 0) {
            // Never more than a picture ahead.
            EXPECT_LE(unit.time * 15 / 8, picture + 3600);
        }
    }
}

TEST_F(FileSource, WithoutAudioSilenceIsMadeInStepWithThePictures) {
    Ffmpeg(string(kPicture) + kPlainH264 + "a.ts");
    const auto source = OpenSource(Fast("a.ts"), notices_, nullptr);
    EXPECT_EQ(source->Description().summary, "H.264 Constrained Baseline 128x96 25 fps, silence");
    const auto units = ReadAll(*source);
    const auto audio = Of(Medium::kAudio, units);
    ExpectGapless(audio);
    // 25 pictures of 1920 samples: frames up to the end of the last one.
    EXPECT_EQ(audio.size(), 47u);
    EXPECT_EQ(notices_.CountOf("there is no audio: silence is recorded"), 1u);
    std::FILE* const file = std::fopen(Path("silence.aac").c_str(), "wb");
    const string bytes = BytesOf(audio);
    std::fwrite(bytes.data(), 1, bytes.size(), file);
    ASSERT_EQ(std::fclose(file), 0);
    EXPECT_NE(Shell("ffmpeg -i silence.aac -af volumedetect -f null - 2>&1").find("max_volume: -91.0 dB"),
              string::npos);
}

TEST_F(FileSource, AudioThatBeginsLateIsLedUpToBySilence) {
    Ffmpeg(string(kPicture) + "-itsoffset 0.4" + kTone + kPlainH264 + kPlainAac + "a.ts");
    const auto units = ReadFile("a.ts");
    const auto audio = Of(Medium::kAudio, units);
    ExpectGapless(audio);
    // 0.4 s, less the encoder's priming, in frames of 1024; the first one begins 5.3 ms before the picture.
    EXPECT_EQ(std::count_if(audio.begin(), audio.end(),
                            [&audio](const SourceUnit& unit) { return unit.size == audio[0].size; }),
              18);
}

TEST_F(FileSource, AGapInTheAudioIsFilledAndTold) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac +
           "-bsf:a 'noise=drop=between(n\\,20\\,24)' a.ts");
    const auto units = ReadFile("a.ts");
    ExpectGapless(Of(Medium::kAudio, units));
    EXPECT_EQ(notices_.CountOf("5 audio frames missing and filled with silence"), 1u);
}

TEST_F(FileSource, AnAudioFrameThatIsCutShortIsNotRecorded) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "a.ts");
    // The stream breaks off within the last frame: its last packet but the stuffing is audio.
    Ffmpeg("-i a.ts -map 0:v -c copy v.ts");
    Ffmpeg("-i a.ts -map 0:a -c copy whole.aac");
    const string whole = FileBytes(Path("whole.aac"));
    std::FILE* const file = std::fopen(Path("short.aac").c_str(), "wb");
    std::fwrite(whole.data(), 1, whole.size() - 40, file);
    ASSERT_EQ(std::fclose(file), 0);
    Ffmpeg("-i a.ts -i short.aac -map 0:v -map 1:a -c copy -flush_packets 1 short.nut");
    const auto source = OpenSource(Fast("short.nut"), notices_, nullptr);
    for (const SourceUnit& unit : Of(Medium::kAudio, ReadAll(*source))) {
        // aac_frame_length
        const std::size_t length =
            (unit.data.get()[3] & 3U) << 11 | unit.data.get()[4] << 3U | unit.data.get()[5] >> 5U;
        EXPECT_EQ(length, unit.size);
    }
    EXPECT_EQ(source->Counts().damagedPackets, 1u);
}

TEST_F(FileSource, LostPicturesAreCountedKeepTheirPlacesAndTakeTheirAudioAlong) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "-bsf:v 'noise=drop=between(n\\,5\\,8)' a.ts");
    const auto source = OpenSource(Fast("a.ts"), notices_, nullptr);
    const auto units = ReadAll(*source);
    const auto video = Of(Medium::kVideo, units);
    ASSERT_EQ(video.size(), 21u);
    EXPECT_EQ(video[4].time, 4 * 3600);
    EXPECT_EQ(video[5].time, 9 * 3600);
    EXPECT_EQ(source->Counts().lostFrames, 4u);
    // 4 pictures are 7.5 audio frames.
    const auto audio = Of(Medium::kAudio, units);
    std::int64_t missing = 0;
    std::int64_t passed = 0;
    for (std::size_t n = 1; n < audio.size(); ++n) {
        missing += audio[n].time - audio[n - 1].time - 1024;
        passed += audio[n].passed;
    }
    EXPECT_EQ(missing, 7 * 1024);
    EXPECT_EQ(passed, 4 * 1920);
    EXPECT_EQ(notices_.CountOf("4 video frames lost"), 1u);
}

struct Conversion {
    const char* name;
    const char* encoder;
    const char* notice;
};
void PrintTo(const Conversion& conversion, std::ostream* out) {
    *out << conversion.name;
}

class AudioConversion : public FileSource, public testing::WithParamInterface<Conversion> {};

TEST_P(AudioConversion, GivesTheSameToneInFramesWithoutGaps) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + GetParam().encoder);
    const auto units = ReadFile("a.ts");
    ExpectFrames(Of(Medium::kVideo, units), 25, 3600);
    const auto audio = Of(Medium::kAudio, units);
    ExpectGapless(audio);
    EXPECT_NEAR(static_cast<double>(audio.size()), 46, 3);
    EXPECT_EQ(notices_.CountOf(GetParam().notice), 1u);
    std::FILE* const file = std::fopen(Path("out.aac").c_str(), "wb");
    const string bytes = BytesOf(audio);
    std::fwrite(bytes.data(), 1, bytes.size(), file);
    ASSERT_EQ(std::fclose(file), 0);
    EXPECT_EQ(Shell("ffprobe -v error -show_entries stream=profile,sample_rate,channels -of csv=p=0 out.aac"),
              "LC,48000,2\n");
    // A tone of 500 Hz crosses zero 1000 times a second.
    const string stats =
        Shell("ffmpeg -ss 0.2 -t 0.5 -i out.aac -af astats=measure_overall=none -f null - 2>&1");
    const std::size_t at = stats.find("Zero crossings rate: ");
    ASSERT_NE(at, string::npos) << stats;
    EXPECT_NEAR(std::stod(stats.substr(at + 21)) * 48000, 1000, 20);
}

INSTANTIATE_TEST_SUITE_P(
    All, AudioConversion,
    testing::Values(Conversion{"mp2", " -c:a mp2 -ar 48000 -ac 2 a.ts",
                               "audio is converted: MP2 48 kHz stereo to AAC LC 48 kHz stereo"},
                    Conversion{"mp2 at 44.1 kHz", " -c:a mp2 -ar 44100 -ac 2 a.ts",
                               "audio is converted: MP2 44.1 kHz stereo"},
                    Conversion{"mono", " -c:a aac -ar 48000 -ac 1 a.ts",
                               "audio is converted: AAC LC 48 kHz mono"},
                    Conversion{"latm", " -c:a aac -ar 48000 -ac 2 -mpegts_flags +latm a.ts",
                               "audio is converted: AAC_LATM LC 48 kHz stereo"}));

/// Files of reordered pictures, by their extension.
class ReorderedFile : public SourceTest, public testing::WithParamInterface<const char*> {};

TEST_P(ReorderedFile, ComesInTheOrderOfDecodingWithTheTimesAtWhichPicturesAreShown) {
    const string file = string("a.") + GetParam();
    Ffmpeg(string(kPicture) + kTone +
           " -pix_fmt yuv420p -c:v libx264 -preset ultrafast -g 12"
           " -x264-params bframes=3:b-pyramid=normal:b-adapt=0:scenecut=0:open-gop=0 " +
           kPlainAac + file);
    const auto source = OpenSource(Fast(file), notices_, nullptr);
    EXPECT_EQ(source->Description().reordering, 2u);
    const auto video = Of(Medium::kVideo, ReadAll(*source));
    ASSERT_EQ(video.size(), 25u);
    // A group of 12: I0 P4 B2 b1 b3, P8 B6 b5 b7, P11 b9 b10.
    constexpr std::int64_t kShown[] = {0, 4, 2, 1, 3, 8, 6, 5, 7, 11, 9, 10};
    for (std::int64_t i = 0; i < 24; ++i) {
        const SourceUnit& unit = video[static_cast<std::size_t>(i)];
        EXPECT_EQ(unit.time, i * 3600);
        EXPECT_EQ(unit.time + unit.later, (i / 12 * 12 + kShown[i % 12]) * 3600) << i;
        EXPECT_EQ(unit.keyFrame, i % 12 == 0);
    }
}

INSTANTIATE_TEST_SUITE_P(Containers, ReorderedFile, testing::Values("ts", "mp4", "mov", "flv", "mkv", "nut"));

/// Ticks by which the clock of a source of reordered pictures is set.
class ReorderedClock : public SourceTest, public testing::WithParamInterface<int> {};

TEST_P(ReorderedClock, ThatIsSetMovesNoPictureFromItsTurn) {
    const auto make = [this](double offset, const string& name) {
        Ffmpeg(string(kPicture) + kTone +
               " -pix_fmt yuv420p -c:v libx264 -preset ultrafast -g 12 -x264-params "
               "bframes=3:b-pyramid=normal:b-adapt=0:scenecut=0:open-gop=0:repeat-headers=1 " +
               kPlainAac + "-muxdelay 0 -output_ts_offset " + std::to_string(offset) + " " + name);
    };
    make(50, "a.ts");
    make(51 + GetParam(), "b.ts");
    Shell("cat a.ts b.ts > c.ts");
    const auto video = Of(Medium::kVideo, ReadFile("c.ts"));
    ASSERT_GE(video.size(), 49u);
    std::vector<std::int64_t> turns;
    std::vector<std::int64_t> shown;
    for (const SourceUnit& unit : video) {
        turns.push_back(unit.time / 3600);
        shown.push_back((unit.time + unit.later) / 3600);
    }
    EXPECT_TRUE(std::is_sorted(turns.begin(), turns.end())) << testing::PrintToString(turns);
    std::sort(shown.begin(), shown.end());
    EXPECT_EQ(turns, shown);
    EXPECT_LE(turns.back(), 51);
    EXPECT_EQ(notices_.CountOf("the source's clock jumped by"), GetParam() == 0 ? 0u : 1u)
        << testing::PrintToString(notices_.sentences);
}

INSTANTIATE_TEST_SUITE_P(Seconds, ReorderedClock, testing::Values(0, 20, -20, 3600));

TEST_F(FileSource, ReorderedPicturesAreRefusedWhereNothingTellsWhenTheyAreShown) {
    Ffmpeg(string(kPicture) + " -pix_fmt yuv420p -c:v libx264 -preset ultrafast -bf 2 a.avi");
    const auto error = Refusal(Fast("a.avi"));
    EXPECT_EQ(error.Code(), ExitCode::kSourceUnsuitable);
    EXPECT_STREQ(error.what(),
                 "the video has reordered pictures (B frames), and the source does not tell when they are "
                 "shown: set the encoder to no B frames, or use --transcode");
}

TEST_F(FileSource, OtherCodecsAreRefused) {
    Ffmpeg(string(kPicture) + "-c:v mpeg2video a.ts");
    const auto error = Refusal(Fast("a.ts"));
    EXPECT_EQ(error.Code(), ExitCode::kSourceUnsuitable);
    EXPECT_STREQ(
        error.what(),
        "the video is mpeg2video, and only H.264 is recorded as it comes: set the encoder to H.264, or use "
        "--transcode");
}

TEST_F(FileSource, OtherFrameRatesAreRefused) {
    Ffmpeg(string("-f lavfi -i testsrc2=size=128x96:rate=15:duration=2") + kPlainH264 + "a.ts");
    const auto error = Refusal(Fast("a.ts"));
    EXPECT_EQ(error.Code(), ExitCode::kSourceUnsuitable);
    EXPECT_STREQ(
        error.what(),
        "the video has 15 frames a second: set the encoder to 23.976, 24, 25, 29.97, 30, 50, 59.94 or 60, "
        "or use --transcode");
}

TEST_F(FileSource, ParameterSetsThatNoFileCanHoldAreRefused) {
    Ffmpeg(string(kPicture) + kPlainH264 + "a.h264");
    const string plain = FileBytes(Path("a.h264"));
    const std::size_t idr = plain.find(string("\0\0\1\x65", 4));
    ASSERT_NE(idr, string::npos);
    for (const std::size_t size : {65535U, 65536U}) {
        // A picture parameter set with the number 2 that nobody refers to.
        const string padded = string("\0\0\1\x68\x6F", 5) + string(size - 2, '\x55');
        std::FILE* const file = std::fopen(Path("large.h264").c_str(), "wb");
        for (const string& part : {plain.substr(0, idr), padded, plain.substr(idr)}) {
            std::fwrite(part.data(), 1, part.size(), file);
        }
        ASSERT_EQ(std::fclose(file), 0);
        Ffmpeg("-r 25 -i large.h264 -c copy large.ts");
        string refusal;
        try {
            ReadFile("large.ts");
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kSourceUnsuitable);
            refusal = error.what();
        }
        EXPECT_EQ(refusal, size == 65535U
                               ? ""
                               : "the video has a parameter set of 65536 bytes, and a file holds none "
                                 "above 65535: set the encoder to parameter sets without padding");
    }
}

TEST_F(FileSource, AFileWithoutVideoIsRefused) {
    Ffmpeg(string(kTone) + kPlainAac + "a.ts");
    const auto error = Refusal(Fast("a.ts"));
    EXPECT_EQ(error.Code(), ExitCode::kSourceUnsuitable);
    EXPECT_EQ(string(error.what()), "'" + Path("a.ts") + "' carries no video: a recording needs one");
}

TEST_F(FileSource, AFileThatIsNotThereIsUnavailable) {
    const auto error = Refusal(Fast("none.ts"));
    EXPECT_EQ(error.Code(), ExitCode::kSourceUnavailable);
    EXPECT_EQ(string(error.what()), "there is no file '" + Path("none.ts") + "'");
}

TEST_F(FileSource, AFileOfAnotherKindIsUnavailable) {
    Shell("head -c 50000 /dev/zero > a.bin");
    const auto error = Refusal(Fast("a.bin"));
    EXPECT_EQ(error.Code(), ExitCode::kSourceUnavailable);
    EXPECT_NE(string(error.what()).find("carries nothing that is known as audio and video"), string::npos)
        << error.what();
}

TEST_F(FileSource, AStopWhileOpeningGivesNothing) {
    Ffmpeg(string(kPicture) + kPlainH264 + "a.ts");
    EXPECT_EQ(OpenSource(Fast("a.ts"), notices_, [] { return true; }), nullptr);
}

struct VideoConversion {
    const char* name;
    const char* encoder;
    const char* file;
};
void PrintTo(const VideoConversion& conversion, std::ostream* out) {
    *out << conversion.name;
}

class Transcode : public FileSource, public testing::WithParamInterface<VideoConversion> {};

TEST_P(Transcode, MakesPlainH264OfAnything) {
    Ffmpeg(string(kPicture) + kTone + GetParam().encoder + kPlainAac + GetParam().file);
    SourceOptions options = Fast(GetParam().file);
    options.transcode = true;
    options.bitrate = 500;
    options.pictureGroup = 10;
    const auto source = OpenSource(options, notices_, nullptr);
    EXPECT_EQ(source->Description().bitrate, 500u);
    const auto units = ReadAll(*source);
    const auto video = Of(Medium::kVideo, units);
    ExpectFrames(video, 25, 3600);
    for (std::size_t n = 0; n < video.size(); ++n) {
        EXPECT_EQ(video[n].keyFrame, n % 10 == 0);
    }
    ExpectGapless(Of(Medium::kAudio, units));
    EXPECT_EQ(notices_.CountOf("video is converted: "), 1u);
    std::FILE* const file = std::fopen(Path("out.h264").c_str(), "wb");
    const string bytes = BytesOf(video);
    std::fwrite(bytes.data(), 1, bytes.size(), file);
    ASSERT_EQ(std::fclose(file), 0);
    // The pictures are the source's, in their order.
    const string quality =
        Shell("ffmpeg -r 25 -i out.h264 -i " + string(GetParam().file) +
              " -lavfi '[0:v]settb=1/25,setpts=N[a];[1:v]settb=1/25,setpts=N[b];[a][b]psnr' "
              "-f null - 2>&1 | grep -o 'min:[0-9.]*'");
    EXPECT_GT(std::stod(quality.substr(4)), 24) << quality;
}

INSTANTIATE_TEST_SUITE_P(
    All, Transcode,
    testing::Values(VideoConversion{"MPEG-2", " -c:v mpeg2video -b:v 2M ", "a.ts"},
                    VideoConversion{"MPEG-4 with B frames in MP4", " -c:v mpeg4 -bf 2 -b:v 2M ", "a.mp4"},
                    VideoConversion{
                        "HEVC",
                        " -pix_fmt yuv420p -c:v libx265 -preset ultrafast -x265-params log-level=none ",
                        "a.ts"}));

TEST_F(FileSource, TranscodeChangesSizeAndRateAsAsked) {
    Ffmpeg(string(kPicture) + kPlainH264 + "a.ts");
    SourceOptions options = Fast("a.ts");
    options.transcode = true;
    options.width = 64;
    options.height = 48;
    options.frameRate = ParseFrameRate("50");
    const auto source = OpenSource(options, notices_, nullptr);
    EXPECT_EQ(source->Description().width, 64u);
    EXPECT_EQ(source->Description().height, 48u);
    EXPECT_EQ(source->Description().frameRate.key, 50000u);
    const auto video = Of(Medium::kVideo, ReadAll(*source));
    ASSERT_GE(video.size(), 49u);
    ExpectFrames(video, video.size(), 1800);
}

TEST_F(FileSource, TranscodePassesWhatCanBeRecordedAsItIs) {
    Ffmpeg(string(kPicture) + kPlainH264 + "a.ts");
    SourceOptions options = Fast("a.ts");
    options.transcode = true;
    const auto units = ReadAll(*OpenSource(options, notices_, nullptr));
    EXPECT_EQ(BytesOf(Of(Medium::kVideo, units)), VideoOf("a.ts"));
    EXPECT_EQ(notices_.CountOf("video is converted"), 0u);
}

TEST_F(FileSource, ACounterOf33BitsMayWrap) {
    // The counter wraps half a second behind the first picture: 2^33 / 90000 = 95443.7177 s; a muxer adds 1.4
    // s.
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "-output_ts_offset 95441.8 a.ts");
    const string stamps = Shell(
        "ffprobe -v error -select_streams v -show_entries packet=pts -of csv=p=0 "
        "-correct_ts_overflow 0 a.ts");
    std::istringstream lines(stamps);
    std::vector<std::int64_t> values;
    for (string line; std::getline(lines, line);) {
        if (!line.empty()) {
            values.push_back(std::stoll(line));
        }
    }
    ASSERT_EQ(values.size(), 25u);
    ASSERT_GT(values.front(), values.back());
    const auto units = ReadFile("a.ts");
    ExpectFrames(Of(Medium::kVideo, units), 25, 3600);
    ExpectGapless(Of(Medium::kAudio, units));
    EXPECT_GE(Of(Medium::kAudio, units).size(), 45u);
    EXPECT_TRUE(notices_.sentences.empty()) << notices_.sentences[0];
}

TEST_F(FileSource, AClockThatBeginsAgainIsContinued) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "-output_ts_offset 5000 a.ts");
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "-mpegts_flags +initial_discontinuity b.ts");
    Shell("cat a.ts b.ts > ab.ts");
    const auto source = OpenSource(Fast("ab.ts"), notices_, nullptr);
    const auto units = ReadAll(*source);
    ExpectFrames(Of(Medium::kVideo, units), 50, 3600);
    EXPECT_EQ(source->Counts().lostFrames, 0u);
    ExpectGapless(Of(Medium::kAudio, units));
    EXPECT_EQ(notices_.CountOf("the source's clock jumped by"), 1u);
}

TEST_F(FileSource, AClockThatLeapsToTheEndOf64BitsIsContinued) {
    Ffmpeg(string(kPicture) + kPlainH264 + "a.ts");
    for (const string leap : {"9000000000000000000", "1000000000000000000"}) {
        Ffmpeg("-i a.ts -c copy -bsf:v 'setts=ts=if(gte(N\\,12)\\,PTS+" + leap + "\\,PTS)' a.nut");
        ExpectFrames(Of(Medium::kVideo, ReadFile("a.nut")), 25, 3600);
    }
}

TEST_F(FileSource, KlvComesByteForByteAtItsTimes) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "plain.ts");
    endtoend::AddKlvStream(Path("plain.ts"), Path("a.ts"), 5);
    const auto source = OpenSource(Fast("a.ts"), notices_, nullptr);
    EXPECT_EQ(source->Description().summary,
              "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo, KLV");
    const auto klv = Of(Medium::kKlv, ReadAll(*source));
    ASSERT_EQ(klv.size(), 5u);
    for (std::size_t n = 0; n < klv.size(); ++n) {
        const auto packet = endtoend::MakeKlvPacket(n);
        EXPECT_EQ(BytesOf(klv[n]), string(packet.begin(), packet.end()));
        EXPECT_EQ(klv[n].time, static_cast<std::int64_t>(n) * 5 * 3600);
    }
    EXPECT_EQ(source->Counts().damagedPackets, 0u);
}

TEST_F(FileSource, WithoutTimecodeThereIsNone) {
    Ffmpeg(string(kPicture) + kPlainH264 + "a.ts");
    for (const SourceUnit& unit : Of(Medium::kVideo, ReadFile("a.ts"))) {
        EXPECT_FALSE(unit.timecode);
    }
}

TEST_F(FileSource, ATimecodeTagIsCountedOn) {
    Ffmpeg(string(kPicture) + kPlainH264 + "-timecode 10:20:30:12 a.mov");
    const auto video = Of(Medium::kVideo, ReadFile("a.mov"));
    ASSERT_EQ(video.size(), 25u);
    EXPECT_EQ(video[0].timecode, (Timecode{10, 20, 30, 12, false}));
    EXPECT_EQ(video[12].timecode, (Timecode{10, 20, 30, 24, false}));
    EXPECT_EQ(video[13].timecode, (Timecode{10, 20, 31, 0, false}));
}

TEST_F(FileSource, ADropFrameTagDropsFrames) {
    Ffmpeg(string("-f lavfi -i testsrc2=size=128x96:rate=30000/1001:duration=1") + kPlainH264 +
           "-timecode '10:00:59;20' a.mov");
    const auto video = Of(Medium::kVideo, ReadFile("a.mov"));
    ASSERT_EQ(video.size(), 30u);
    EXPECT_EQ(video[0].timecode, (Timecode{10, 0, 59, 20, true}));
    EXPECT_EQ(video[9].timecode, (Timecode{10, 0, 59, 29, true}));
    EXPECT_EQ(video[10].timecode, (Timecode{10, 1, 0, 2, true}));
}

TEST_F(FileSource, ComesInRealTimeTimesItsSpeed) {
    Ffmpeg(string(kPicture) + kTone + kPlainH264 + kPlainAac + "a.ts");
    SourceOptions options = Fast("a.ts");
    options.speed = 4;
    const auto source = OpenSource(options, notices_, nullptr);
    const auto begin = std::chrono::steady_clock::now();
    ReadAll(*source);
    EXPECT_GE(std::chrono::steady_clock::now() - begin, std::chrono::milliseconds(230));
}

}  // namespace
}  // namespace receiver
