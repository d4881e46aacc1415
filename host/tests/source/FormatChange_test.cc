#include <fstream>

#include "SentMedia.h"
#include "SourceTesting.h"
#include "StreamServer.h"
#include "damaged/TransportStream.h"

namespace receiver {
namespace {

using std::string;

struct Change {
    const char* name;
    /// Arguments of ffmpeg for what comes first and what follows, without its end.
    string before;
    string after;
    const char* notice;
    /// What the source is then, and how many pictures come behind the change in a file: from the IDR frame on
    /// that tells of it, or from the next one on.
    const char* summary;
    std::size_t pictures;
    bool transcode = false;
};
void PrintTo(const Change& change, std::ostream* out) {
    *out << change.name;
}

string Picture(const string& size, const string& rate) {
    return " -f lavfi -i testsrc2=size=" + size + ":rate=" + rate + ":duration=1 ";
}
string Tone(int rate) {
    return " -f lavfi -i sine=frequency=500:sample_rate=" + std::to_string(rate) + ":duration=1 ";
}
string H264(const string& more = "-bf 0") {
    return " -pix_fmt yuv420p -c:v libx264 -preset ultrafast -g 12 -sc_threshold 0 " + more + " ";
}
string Plain(const string& size, const string& rate) {
    return Picture(size, rate) + Tone(48000) + H264() + kPlainAac;
}

class FormatChange : public SourceTest, public testing::WithParamInterface<Change> {
 protected:
    /// The second part goes on where the first one ends, in the same programme.
    void Make() {
        Ffmpeg(GetParam().before + " -muxdelay 0 a.ts");
        Ffmpeg(GetParam().after +
               " -muxdelay 0 -output_ts_offset 1 -mpegts_flags +initial_discontinuity b.ts");
        Shell("cat a.ts b.ts > ab.ts");
    }
    struct Read {
        std::vector<SourceUnit> before;
        std::vector<SourceUnit> after;
        string summary;
        int changes = 0;
    };
    static Read ReadAround(SourceInterface& source) {
        Read read;
        for (;;) {
            SourceUnit unit;
            const auto result = source.Read(unit);
            if (result == SourceInterface::Result::kUnit) {
                (read.changes == 0 ? read.before : read.after).push_back(unit);
            } else if (result == SourceInterface::Result::kChanged) {
                ++read.changes;
                read.summary = source.Description().summary;
            } else if (result != SourceInterface::Result::kIdle) {
                return read;
            }
        }
    }
    static double Period(const SourceInterface& source) {
        return 90000.0 / source.Description().frameRate.timecodeFrames;
    }
    static void ExpectSteady(const std::vector<SourceUnit>& pictures, double period) {
        for (std::size_t at = 1; at < pictures.size(); ++at) {
            EXPECT_NEAR(static_cast<double>(pictures[at].time - pictures[at - 1].time), period, 1);
        }
    }
    void Expect(const Read& read, const SourceInterface& source, std::size_t pictures) const {
        EXPECT_EQ(read.changes, 1);
        EXPECT_EQ(source.Counts().changes, 1u);
        EXPECT_EQ(read.summary, GetParam().summary);
        EXPECT_EQ(notices_.CountOf(string(GetParam().notice) + ": the recording goes on in a new file"), 1u)
            << testing::PrintToString(notices_.sentences);
        const auto before = Of(Medium::kVideo, read.before);
        const auto after = Of(Medium::kVideo, read.after);
        EXPECT_GE(before.size(), 24u);
        ASSERT_EQ(after.size(), pictures);
        EXPECT_TRUE(after.front().keyFrame);
        EXPECT_GT(after.front().time, before.back().time);
        const double period = Period(source);
        ExpectSteady(after, period);
        const auto audio = Of(Medium::kAudio, read.after);
        // Seconds, times frames of 1024 samples at 48 kHz, less one that overlaps at each end and the
        // priming.
        ASSERT_GE(static_cast<double>(audio.size()),
                  static_cast<double>(after.size()) * period / 90000 * 46.875 - 3);
        EXPECT_LE(std::abs(audio.front().time * 15 / 8 - after.front().time), 1920 + 960);
        for (std::size_t at = 1; at < audio.size(); ++at) {
            EXPECT_EQ(audio[at].time - audio[at - 1].time, 1024);
        }
    }
};

TEST_P(FormatChange, OfAFileIsToldAndEverythingBehindItComes) {
    Make();
    SourceOptions options = Fast("ab.ts");
    options.transcode = GetParam().transcode;
    const auto source = OpenSource(options, notices_, nullptr);
    Expect(ReadAround(*source), *source, GetParam().pictures);
}

TEST_P(FormatChange, OfALiveStreamIsToldAndItGoesOnWithAnIdrFrame) {
    Make();
    StreamServer server({HttpStream(FileBytes(Path("ab.ts")))});
    SourceOptions options = Fast(server.Http());
    options.reconnect = false;
    options.transcode = GetParam().transcode;
    const auto source = OpenSource(options, notices_, nullptr);
    const Read read = ReadAround(*source);
    EXPECT_EQ(read.changes, 1);
    EXPECT_EQ(read.summary, GetParam().summary);
    EXPECT_EQ(notices_.CountOf(string(GetParam().notice) + ": the recording goes on in a new file"), 1u)
        << testing::PrintToString(notices_.sentences);
    EXPECT_GE(Of(Medium::kVideo, read.before).size(), 24u);
    const auto after = Of(Medium::kVideo, read.after);
    // Of the second, the group at its beginning may be lost.
    const std::size_t second = source->Description().frameRate.timecodeFrames;
    ASSERT_GE(after.size(), second - 12);
    EXPECT_LE(after.size(), second);
    EXPECT_TRUE(after.front().keyFrame);
    ExpectSteady(after, Period(*source));
}

INSTANTIATE_TEST_SUITE_P(
    All, FormatChange,
    testing::Values(
        Change{"audio rate", Plain("128x96", "25"),
               Picture("128x96", "25") + Tone(44100) + H264() + "-c:a aac -ar 44100 -ac 2 ",
               "the audio is no longer AAC LC 48 kHz stereo",
               "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo", 13},
        Change{"audio channels", Plain("128x96", "25"),
               Picture("128x96", "25") + Tone(48000) + H264() + "-c:a aac -ar 48000 -ac 1 ",
               "the audio is no longer AAC LC 48 kHz stereo",
               "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo", 13},
        Change{"rate of converted audio",
               Picture("128x96", "25") + Tone(44100) + H264() + "-c:a aac -ar 44100 -ac 2 ",
               Picture("128x96", "25") + Tone(44100) + H264() + "-c:a aac -ar 32000 -ac 2 ",
               "the audio changed from 44.1 kHz stereo to 32 kHz stereo",
               "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo", 13},
        Change{"channels of converted audio",
               Picture("128x96", "25") + Tone(48000) + H264() + "-c:a mp2 -ac 2 ",
               Picture("128x96", "25") + Tone(48000) + H264() + "-c:a mp2 -ac 1 ",
               "the audio changed from 48 kHz stereo to 48 kHz mono",
               "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo", 13},
        Change{"audio begins", Picture("128x96", "25") + H264(), Plain("128x96", "25"), "audio has begun",
               "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo", 13},
        Change{"rate", Plain("128x96", "25"), Plain("128x96", "50"), "the frame rate of the video changed",
               "H.264 Constrained Baseline 128x96 50 fps, AAC LC 48 kHz stereo", 50},
        Change{"size", Plain("128x96", "25"), Plain("160x112", "25"),
               "the picture changed from 128x96 to 160x112",
               "H.264 Constrained Baseline 160x112 25 fps, AAC LC 48 kHz stereo", 25},
        Change{"reordered", Plain("128x96", "25"),
               Picture("128x96", "25") + Tone(48000) + H264("-bf 2") + kPlainAac,
               "the video begins to send its pictures reordered (B frames)",
               "H.264 Main 128x96 25 fps, AAC LC 48 kHz stereo", 13},
        Change{"reordered no more", Picture("128x96", "25") + Tone(48000) + H264("-bf 2") + kPlainAac,
               Plain("128x96", "25"), "the video no longer sends its pictures reordered (B frames)",
               "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo", 25},
        Change{"HEVC", Plain("128x96", "25"),
               Picture("128x96", "25") + Tone(48000) +
                   "-pix_fmt yuv420p -c:v libx265 -preset ultrafast -x265-params "
                   "log-level=none:bframes=0:keyint=12 " +
                   kPlainAac,
               "the video changed from h264 to hevc", "H.264 128x96 25 fps, AAC LC 48 kHz stereo", 25,
               true}));

/// A file of a container that describes its streams at its beginning, and in which they become others.
struct FileChange {
    const char* name;
    const char* file;
    string before;
    string after;
    const char* notice;
    const char* summary;
    std::size_t pictures;
};
void PrintTo(const FileChange& change, std::ostream* out) {
    *out << change.name;
}

class FormatChangeInAFile : public SourceTest, public testing::WithParamInterface<FileChange> {
 protected:
    void Make() {
        const string file = GetParam().file;
        if (file.ends_with(".flv")) {
            Ffmpeg(GetParam().before + " a.flv");
            Ffmpeg(GetParam().after + " -output_ts_offset 1 b.flv");
            // Header and first size, which the second part does not need.
            Shell("(cat a.flv; tail -c +14 b.flv) > " + file);
        } else {
            // The first part begins with the priming of its audio, 1024 samples before its pictures.
            Ffmpeg(GetParam().before + " -muxdelay 0 a.ts");
            Ffmpeg(GetParam().after +
                   " -muxdelay 0 -output_ts_offset 1.021333 -mpegts_flags +initial_discontinuity b.ts");
            Shell("cat a.ts b.ts > ab.ts");
            Ffmpeg("-i ab.ts -c copy " + file);
        }
    }
};

TEST_P(FormatChangeInAFile, IsToldAndEverythingBehindItComes) {
    Make();
    const auto source = OpenSource(Fast(GetParam().file), notices_, nullptr);
    std::vector<SourceUnit> before;
    std::vector<SourceUnit> after;
    string summary;
    for (auto result = SourceInterface::Result::kIdle; result != SourceInterface::Result::kEnd;) {
        SourceUnit unit;
        result = source->Read(unit);
        if (result == SourceInterface::Result::kChanged) {
            EXPECT_EQ(summary, "") << "a second change";
            summary = source->Description().summary;
        } else if (result == SourceInterface::Result::kUnit) {
            (summary.empty() ? before : after).push_back(unit);
        }
    }
    EXPECT_EQ(summary, GetParam().summary);
    EXPECT_EQ(notices_.CountOf(string(GetParam().notice) + ": the recording goes on in a new file"), 1u)
        << testing::PrintToString(notices_.sentences);
    EXPECT_GE(Of(Medium::kVideo, before).size(), 24u);
    const auto pictures = Of(Medium::kVideo, after);
    ASSERT_EQ(pictures.size(), GetParam().pictures);
    EXPECT_TRUE(pictures.front().keyFrame);
    // The priming of MP2 is shorter, and its splice with it.
    EXPECT_NEAR(static_cast<double>(pictures.back().time), 2 * 90000 - 3600, 3600);
    const auto sounds = Of(Medium::kAudio, after);
    ASSERT_FALSE(sounds.empty());
    EXPECT_LE(std::abs(sounds.front().time * 15 / 8 - pictures.front().time), 1920);
}

INSTANTIATE_TEST_SUITE_P(
    All, FormatChangeInAFile,
    testing::Values(FileChange{"parameter sets of FLV", "ab.flv", Plain("128x96", "25"),
                               Plain("160x112", "25"), "the parameter sets of the video changed",
                               "H.264 Constrained Baseline 160x112 25 fps, AAC LC 48 kHz stereo", 25},
                    FileChange{"audio of FLV", "ab.flv", Plain("128x96", "25"),
                               Picture("128x96", "25") + Tone(44100) + H264() + "-c:a aac -ar 44100 -ac 2 ",
                               "the audio is no longer AAC LC 48 kHz stereo",
                               "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo", 25},
                    FileChange{"converted audio of FLV", "ab.flv",
                               Picture("128x96", "25") + Tone(44100) + H264() + "-c:a aac -ar 44100 -ac 2 ",
                               Picture("128x96", "25") + Tone(22050) + H264() + "-c:a aac -ar 22050 -ac 1 ",
                               "the parameters of the audio changed",
                               "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo", 25},
                    FileChange{"size in MP4", "ab.mp4", Plain("128x96", "25"), Plain("160x112", "25"),
                               "the picture changed from 128x96 to 160x112",
                               "H.264 Constrained Baseline 160x112 25 fps, AAC LC 48 kHz stereo", 25},
                    FileChange{"size in MKV", "ab.mkv", Plain("128x96", "25"), Plain("160x112", "25"),
                               "the picture changed from 128x96 to 160x112",
                               "H.264 Constrained Baseline 160x112 25 fps, AAC LC 48 kHz stereo", 25},
                    FileChange{"channels of MP2 in MKV", "ab.mkv",
                               Picture("128x96", "25") + Tone(48000) + H264() + "-c:a mp2 -ac 2 ",
                               Picture("128x96", "25") + Tone(48000) + H264() + "-c:a mp2 -ac 1 ",
                               "the audio changed from 48 kHz stereo to 48 kHz mono",
                               "H.264 Constrained Baseline 128x96 25 fps, AAC LC 48 kHz stereo", 13}));

/// A medium that goes on under another number in the tables of its programme.
struct Move {
    const char* name;
    const char* stream;
    const char* notice;
    /// Pictures that may be left out: until the next IDR frame, and what the splice of two files costs.
    std::size_t leftOut;
};
void PrintTo(const Move& move, std::ostream* out) {
    *out << move.name;
}

class MovedMedium : public SourceTest, public testing::WithParamInterface<Move> {};

TEST_P(MovedMedium, IsToldAndRecordedOn) {
    // Noise, so that no two audio frames are alike.
    Ffmpeg(
        "-f lavfi -i testsrc2=size=128x96:rate=25:duration=9 -f lavfi -i "
        "anoisesrc=sample_rate=48000:seed=7:duration=9" +
        string(kPlainH264) + kPlainAac + "whole.ts");
    // 168 pictures are 14 groups, 6.72 s. What comes first is longer than what is looked at.
    Ffmpeg(
        "-copyts -i whole.ts -c copy -bsf:v 'noise=drop=gte(n\\,168)' -bsf:a 'noise=drop=gte(n\\,315)' "
        "-muxdelay 0 a.ts");
    Ffmpeg(
        "-copyts -i whole.ts -c copy -bsf:v 'noise=drop=lt(n\\,168)' -bsf:a 'noise=drop=lt(n\\,315)' "
        "-muxdelay 0 -streamid " +
        string(GetParam().stream) + " b.ts");
    Shell("cat a.ts b.ts > ab.ts");
    const auto source = OpenSource(Fast("ab.ts"), notices_, nullptr);
    std::vector<SourceUnit> before;
    std::vector<SourceUnit> after;
    bool changed = false;
    for (auto result = SourceInterface::Result::kIdle; result != SourceInterface::Result::kEnd;) {
        SourceUnit unit;
        result = source->Read(unit);
        changed |= result == SourceInterface::Result::kChanged;
        if (result == SourceInterface::Result::kUnit) {
            (changed ? after : before).push_back(unit);
        }
    }
    EXPECT_EQ(notices_.CountOf(string(GetParam().notice) + ": the recording goes on in a new file"), 1u)
        << testing::PrintToString(notices_.sentences);
    const SentMedia sent(Path("whole.ts"));
    const auto pictures = sent.Find(Medium::kVideo, after);
    ASSERT_FALSE(pictures.empty());
    EXPECT_EQ(pictures.front().number % 12, 0u);
    EXPECT_EQ(pictures.back().number, sent.Pictures() - 1);
    EXPECT_LE(sent.Pictures() - Of(Medium::kVideo, before).size() - pictures.size(), GetParam().leftOut);
    ExpectInStep(sent, after, pictures.front().number);
}

INSTANTIATE_TEST_SUITE_P(All, MovedMedium,
                         testing::Values(Move{"audio", "1:300", "the audio moved to another stream", 15},
                                         Move{"video", "0:301", "the video moved to another stream", 2}));

/// Files whose change cannot be followed: what came before is there, and a sentence tells of the rest.
class FormatChangeToTheUnknown : public SourceTest {
 protected:
    static constexpr const char* kHevc =
        " -pix_fmt yuv420p -c:v libx265 -preset ultrafast -x265-params "
        "log-level=none:bframes=0:keyint=12:repeat-headers=1 ";

    /// A complete playlist of two segments.
    void WritePlaylist(const string& seconds) const {
        std::ofstream(Path("vod.m3u8"))
            << "#EXTM3U\n#EXT-X-VERSION:3\n#EXT-X-TARGETDURATION:10\n#EXTINF:" << seconds
            << ",\na.ts\n#EXTINF:" << seconds << ",\nb.ts\n#EXT-X-ENDLIST\n";
    }
    void ExpectLeftOut(const string& file, const string& notice, std::size_t pictures) {
        const auto source = OpenSource(Fast(file), notices_, nullptr);
        std::size_t came = 0;
        string sentence;
        try {
            // A change that is followed over and over again would not end.
            for (int changes = 0; changes < kManyChanges;) {
                SourceUnit unit;
                const auto result = source->Read(unit);
                ASSERT_NE(result, SourceInterface::Result::kEnd);
                changes += result == SourceInterface::Result::kChanged ? 1 : 0;
                came += result == SourceInterface::Result::kUnit && unit.medium == Medium::kVideo ? 1 : 0;
            }
        } catch (const ReceiverError& error) {
            EXPECT_EQ(error.Code(), ExitCode::kSourceUnsuitable);
            sentence = error.what();
        }
        EXPECT_EQ(sentence, notice + ": what follows in this file cannot be understood, and is left out");
        EXPECT_GE(came, pictures);
    }

 private:
    static constexpr int kManyChanges = 5;
};

TEST_F(FormatChangeToTheUnknown, EndsAPlaylistWhoseCodecChanges) {
    Ffmpeg(Plain("128x96", "25") + " -muxdelay 0 a.ts");
    Ffmpeg(Picture("128x96", "25") + Tone(48000) + kHevc + kPlainAac +
           " -muxdelay 0 -output_ts_offset 1 b.ts");
    WritePlaylist("1.0");
    ExpectLeftOut("vod.m3u8", "the video changed from h264 to hevc", 24);
}

TEST_F(FormatChangeToTheUnknown, EndsAPlaylistWhoseVideoMoves) {
    const string source =
        " -f lavfi -i testsrc2=size=128x96:rate=25:duration=7 -f lavfi -i "
        "sine=frequency=500:sample_rate=48000:duration=7 ";
    Ffmpeg(source + H264() + kPlainAac + "-muxdelay 0 a.ts");
    Ffmpeg(source + H264() + kPlainAac + "-muxdelay 0 -output_ts_offset 7 -streamid 0:301 b.ts");
    WritePlaylist("7.0");
    ExpectLeftOut("vod.m3u8", "the video moved to another stream", 173);
}

/// The tables go on to tell of H.264, and pictures of it stand right in front of the change.
TEST_F(FormatChangeToTheUnknown, EndsATransportStreamWhoseTablesAreWrong) {
    const string black = " -f lavfi -i color=black:size=128x96:rate=25:duration=2 ";
    Ffmpeg(black + H264("-bf 0 -g 1 -x264-params repeat-headers=1") + "-muxdelay 0 a.ts");
    Ffmpeg(black + kHevc + "-muxdelay 0 -output_ts_offset 2 b.ts");
    endtoend::Pieces pieces = endtoend::ReadPieces(Path("a.ts"));
    const auto isMap = [](const endtoend::Bytes& piece) {
        return endtoend::PidOf(piece) == endtoend::kMapPid;
    };
    const endtoend::Bytes map = *std::find_if(pieces.begin(), pieces.end(), isMap);
    for (const endtoend::Bytes& piece : endtoend::ReadPieces(Path("b.ts"))) {
        pieces.push_back(isMap(piece) ? map : piece);
    }
    endtoend::WritePieces(pieces, Path("ab.ts"));
    ExpectLeftOut("ab.ts", "the video changed from h264 to hevc", 49);
}

}  // namespace
}  // namespace receiver
