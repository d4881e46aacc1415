#include <future>

#include "SentMedia.h"
#include "SourceTesting.h"
#include "StreamServer.h"
#include "support/CodedMedia.h"
#include "support/FreePorts.h"
#include "support/Senders.h"

namespace receiver {
namespace {

using std::string;

/// Sources that are found in the middle of a group of pictures: 1.8 seconds of audio and of pictures that
/// cannot be decoded come before the first IDR frame.
class Joining : public SourceTest {
 protected:
    /// Groups of two seconds; noise, so that no two audio frames are alike.
    void Make(const string& name, const string& seconds, const string& options = "") const {
        Ffmpeg("-f lavfi -i testsrc2=size=128x96:rate=25:duration=" + seconds +
               " -f lavfi -i anoisesrc=sample_rate=48000:seed=7:duration=" + seconds + kPlainH264 +
               "-g 50 -x264-params repeat-headers=1" + kPlainAac + options + " " + name);
    }
    /// The same without its first 0.2 seconds.
    void MakeCut(const string& whole, const string& cut) const {
        Ffmpeg("-i " + whole +
               " -c copy -copyts -bsf:v 'noise=drop=lt(n\\,5)' -bsf:a 'noise=drop=lt(n\\,9)' " + cut);
    }
    std::vector<SourceUnit> ReadPictures(SourceInterface& source, std::size_t count) const {
        std::vector<SourceUnit> units;
        const auto deadline = std::chrono::steady_clock::now() + std::chrono::seconds(30);
        while (count > 0 && std::chrono::steady_clock::now() < deadline) {
            SourceUnit unit;
            const auto result = source.Read(unit);
            if (result == SourceInterface::Result::kUnit) {
                units.push_back(unit);
                count -= unit.medium == Medium::kVideo ? 1 : 0;
            } else if (result != SourceInterface::Result::kIdle) {
                break;
            }
        }
        EXPECT_EQ(count, 0u) << "pictures are missing";
        return units;
    }
    static SourceOptions Live(const string& url) {
        SourceOptions options;
        options.url = url;
        return options;
    }
    void ExpectNothingTold() const {
        EXPECT_EQ(notices_.CountOf("jumped"), 0u);
        EXPECT_EQ(notices_.CountOf("gaps"), 0u) << testing::PrintToString(notices_.sentences);
    }

    endtoend::FreePorts ports_;
    std::unique_ptr<endtoend::Process> sender_;
};

TEST_F(Joining, ALiveStreamIsInStepFromItsFirstIdrFrameOn) {
    Make("a.ts", "4");
    MakeCut("a.ts", "cut.ts");
    StreamServer server({HttpStream(FileBytes(Path("cut.ts")))});
    SourceOptions options = Live(server.Http());
    options.reconnect = false;
    const auto source = OpenSource(options, notices_, nullptr);
    const SentMedia sent(Path("a.ts"));
    ExpectInStep(sent, ReadAll(*source), 50);
    EXPECT_EQ(source->Counts().lostFrames, 0u);
    ExpectNothingTold();
}

/// A stamp of the very first picture that is none of the stream's clock, before and at an IDR frame.
TEST_F(Joining, ADamagedFirstStampMovesNothing) {
    Make("a.ts", "4");
    MakeCut("a.ts", "cut.ts");
    struct Case {
        const char* file;
        const char* stamp;
        std::size_t first;
    };
    for (const Case& damage : {Case{"a.ts", "PTS-90000", 0}, Case{"cut.ts", "PTS-90000", 50},
                               Case{"cut.ts", "PTS-90000*900", 50}}) {
        SCOPED_TRACE(std::string(damage.file) + ": " + damage.stamp);
        const string stamp = "if(eq(N\\,0)\\," + string(damage.stamp) + "\\,PTS)";
        Ffmpeg(string("-copyts -i ") + damage.file + " -c copy -copyinkf -bsf:v 'setts=pts=" + stamp +
               ":dts=" + stamp + "' -output_ts_offset 1000 damaged.ts");
        StreamServer server({HttpStream(FileBytes(Path("damaged.ts")))});
        SourceOptions options = Live(server.Http());
        options.reconnect = false;
        const auto source = OpenSource(options, notices_, nullptr);
        ExpectInStep(SentMedia(Path("a.ts")), ReadAll(*source), damage.first);
        EXPECT_EQ(source->Counts().lostFrames, 0u);
        ExpectNothingTold();
    }
}

/// Whether there is audio beside the pictures and their metadata.
class FirstPicture : public Joining, public testing::WithParamInterface<bool> {};

/// With its sound, which may be silence that is made, a picture is complete for the recorder.
TEST_P(FirstPicture, CarriesItsOwnMetadata) {
    Make("a.ts", "4");
    endtoend::AddKlvStream(Path("a.ts"), Path("klv.ts"), 1);
    Ffmpeg(string("-i klv.ts -map 0 -c copy -copyts -bsf:v 'noise=drop=lt(n\\,5)' ") +
           (GetParam() ? "-bsf:a 'noise=drop=lt(n\\,9)'" : "-an") + " cut.ts");
    StreamServer server({HttpStream(FileBytes(Path("cut.ts")))});
    SourceOptions options = Live(server.Http());
    options.reconnect = false;
    const auto units = ReadAll(*OpenSource(options, notices_, nullptr));
    const auto first = [&units](Medium medium) {
        return std::find_if(units.begin(), units.end(),
                            [medium](const SourceUnit& unit) { return unit.medium == medium; });
    };
    const auto klv = first(Medium::kKlv);
    ASSERT_NE(klv, units.end());
    EXPECT_EQ(klv->time, first(Medium::kVideo)->time);
    EXPECT_LT(klv, first(Medium::kVideo));
    EXPECT_LT(klv, first(Medium::kAudio));
    const auto packet = endtoend::MakeKlvPacket(50);
    EXPECT_EQ(BytesOf(*klv), string(packet.begin(), packet.end()));
}

INSTANTIATE_TEST_SUITE_P(WithAndWithoutAudio, FirstPicture, testing::Bool());

TEST_F(Joining, MetadataOfTheFirstPictureBehindAnOutageIsItsOwn) {
    Make("a.ts", "4");
    endtoend::AddKlvStream(Path("a.ts"), Path("klv.ts"), 1);
    Ffmpeg("-i klv.ts -map 0 -c copy -copyts -bsf:v 'noise=drop=lt(n\\,5)' cut.ts");
    StreamServer server({HttpStream(FileBytes(Path("klv.ts"))), HttpStream(FileBytes(Path("cut.ts")))});
    const auto source = OpenSource(Live(server.Http()), notices_, nullptr);
    const auto units = ReadPictures(*source, 100 + 50);
    const auto pictures = Of(Medium::kVideo, units);
    ASSERT_EQ(pictures.size(), 150u);
    const auto klv = std::find_if(units.begin(), units.end(), [&](const SourceUnit& unit) {
        return unit.medium == Medium::kKlv && unit.time >= pictures[100].time;
    });
    ASSERT_NE(klv, units.end());
    EXPECT_EQ(klv->time, pictures[100].time);
    const auto packet = endtoend::MakeKlvPacket(50);
    EXPECT_EQ(BytesOf(*klv), string(packet.begin(), packet.end()));
}

TEST_F(Joining, AStreamOverUdpIsInStepFromItsFirstIdrFrameOn) {
    Make("a.ts", "4");
    MakeCut("a.ts", "cut.ts");
    const string url = "udp://127.0.0.1:" + std::to_string(ports_.First());
    auto opened = std::async(std::launch::async, [&] { return OpenSource(Live(url), notices_, nullptr); });
    ASSERT_TRUE(endtoend::WaitUntilBound(ports_.First()));
    sender_ = endtoend::SendTransportStream(Path("cut.ts"), url + "?pkt_size=1316");
    const auto source = opened.get();
    ExpectInStep(SentMedia(Path("a.ts")), ReadPictures(*source, 40), 50);
    EXPECT_EQ(source->Counts().lostFrames, 0u);
    ExpectNothingTold();
}

TEST_F(Joining, ASourceThatComesBackIsInStepFromItsFirstIdrFrameOn) {
    Make("a.ts", "1");
    Make("b.ts", "4");
    MakeCut("b.ts", "cut.ts");
    StreamServer server({HttpStream(FileBytes(Path("a.ts"))), HttpStream(FileBytes(Path("cut.ts")))});
    const auto source = OpenSource(Live(server.Http()), notices_, nullptr);
    auto units = ReadPictures(*source, 25 + 50);
    const auto back = std::find_if(units.begin() + 1, units.end(), [](const SourceUnit& unit) {
        return unit.medium == Medium::kVideo && unit.keyFrame && unit.time > 90000;
    });
    ASSERT_NE(back, units.end());
    // The audio in front of the picture is not the source's.
    units.erase(units.begin(), back);
    // The recorder chooses among audio frames to within half of one; they stand where they were sent.
    ExpectInStep(SentMedia(Path("b.ts")), units, 50, 10);
    EXPECT_EQ(source->Counts().lostFrames, 0u);
    ExpectNothingTold();
}

/// The sender's clocks of picture and sound are tied to each other by reports, five seconds apart.
TEST_F(Joining, RtpThatIsFoundBetweenTwoReportsIsInStepFromItsFirstIdrFrameOn) {
    Make("a.ts", "9");
    Ffmpeg("-i a.ts -c copy -bsf:a aac_adtstoasc a.mp4");
    endtoend::WriteSessionDescription(Path("a.mp4"), ports_, Path("a.sdp"));
    sender_ = endtoend::SendRtp(Path("a.mp4"), ports_);
    // What the sender has sent before is gone.
    ASSERT_TRUE(endtoend::TakePackets(ports_.First(), 30));
    const auto source = OpenSource(Live(Path("a.sdp")), notices_, nullptr);
    const auto units = ReadPictures(*source, 100);
    const SentMedia sent(Path("a.ts"));
    const auto pictures = sent.Find(Medium::kVideo, units);
    ASSERT_FALSE(pictures.empty());
    // The next group of pictures, or one behind it where the machine is busy.
    EXPECT_GT(pictures.front().number, 0u);
    EXPECT_EQ(pictures.front().number % 50, 0u);
    ExpectInStep(sent, units, pictures.front().number);
    EXPECT_EQ(source->Counts().lostFrames, 0u);
    ExpectNothingTold();
}

/// A step of the source's clock, and how many audio frames come before it: fewer than belong to the pictures
/// in front of it, as many, and more.
struct Step {
    const char* seconds;
    std::size_t sounds;
};
void PrintTo(const Step& step, std::ostream* out) {
    *out << step.seconds << " behind " << step.sounds << " audio frames";
}

/// A step behind 50 pictures.
class ClockStep : public Joining, public testing::WithParamInterface<Step> {
 protected:
    /// Reads the whole stream. Its packets are counted anew behind the step, `marked` as such.
    std::vector<SourceUnit> ReadStep(bool marked = true) {
        Make("whole.ts", "4");
        const string sounds = std::to_string(GetParam().sounds);
        Ffmpeg("-copyts -i whole.ts -c copy -bsf:v 'noise=drop=gte(n\\,50)' -bsf:a 'noise=drop=gte(n\\," +
               sounds + ")' -muxdelay 0 a.ts");
        Ffmpeg("-copyts -i whole.ts -c copy -bsf:v 'noise=drop=lt(n\\,50)' -bsf:a 'noise=drop=lt(n\\," +
               sounds + ")' -muxdelay 0 -output_ts_offset " + GetParam().seconds +
               (marked ? " -mpegts_flags +initial_discontinuity" : "") + " b.ts");
        Shell("cat a.ts b.ts > ab.ts");
        StreamServer server({HttpStream(FileBytes(Path("ab.ts")))});
        SourceOptions options = Live(server.Http());
        options.reconnect = false;
        source_ = OpenSource(options, notices_, nullptr);
        return ReadAll(*source_);
    }
    std::unique_ptr<SourceInterface> source_;
};

class ClockStepBack : public ClockStep {};

TEST_P(ClockStepBack, LosesNothingAndLeavesSoundAndPictureInStep) {
    const auto units = ReadStep();
    const SentMedia sent(Path("whole.ts"));
    const auto pictures = sent.Find(Medium::kVideo, units);
    ASSERT_EQ(pictures.size(), 100u);
    for (std::size_t at = 0; at < pictures.size(); ++at) {
        EXPECT_EQ(pictures[at].number, at);
        // The grid follows by a tick a picture while only one medium has made the step.
        EXPECT_NEAR(static_cast<double>(pictures[at].offset), static_cast<double>(pictures.front().offset),
                    90);
    }
    const auto sounds = sent.Find(Medium::kAudio, units);
    ASSERT_FALSE(sounds.empty());
    for (const SentMedia::Arrival& sound : sounds) {
        // Sound that steps before the picture is known to follow a step of the clock when the picture does.
        if (sound.number < GetParam().sounds || sound.number >= 100) {
            EXPECT_LE(std::abs(sound.offset - pictures.front().offset), 960) << sound.number;
        }
    }
    EXPECT_GE(sounds.size(), sent.Sounds() - 4);
    EXPECT_EQ(source_->Counts().lostFrames, 0u);
    EXPECT_EQ(notices_.CountOf(string("the source's clock jumped by ") +
                               (string(GetParam().seconds) == "-0.5"   ? "-500"
                                : string(GetParam().seconds) == "-0.1" ? "-100"
                                                                       : "-40") +
                               " ms"),
              1u)
        << testing::PrintToString(notices_.sentences);
}

INSTANTIATE_TEST_SUITE_P(All, ClockStepBack,
                         testing::Values(Step{"-0.5", 82}, Step{"-0.5", 95}, Step{"-0.5", 105},
                                         Step{"-0.1", 95}, Step{"-0.1", 105}, Step{"-0.04", 82},
                                         Step{"-0.04", 95}, Step{"-0.04", 105}));

class ClockStepForward : public ClockStep {};

/// No packet is missing by its counters.
TEST_P(ClockStepForward, LosesNothingAndLeavesSoundAndPictureInStep) {
    const auto units = ReadStep();
    const SentMedia sent(Path("whole.ts"));
    const auto pictures = sent.Find(Medium::kVideo, units);
    ASSERT_EQ(pictures.size(), 100u);
    const auto sounds = sent.Find(Medium::kAudio, units);
    ASSERT_FALSE(sounds.empty());
    for (const SentMedia::Arrival& picture : pictures) {
        EXPECT_NEAR(static_cast<double>(picture.offset), static_cast<double>(pictures.front().offset), 90);
    }
    for (const SentMedia::Arrival& sound : sounds) {
        EXPECT_LE(std::abs(sound.offset - pictures.front().offset), 960) << sound.number;
    }
    EXPECT_GE(sounds.size(), sent.Sounds() - 4);
    EXPECT_EQ(source_->Counts().lostFrames, 0u);
    EXPECT_EQ(notices_.CountOf(string("the source's clock jumped by ") +
                               std::to_string(std::stoi(GetParam().seconds) * 1000) + " ms"),
              1u)
        << testing::PrintToString(notices_.sentences);
}

TEST_P(ClockStepForward, IsALossWherePacketsAreMissing) {
    ReadStep(false);
    EXPECT_NEAR(static_cast<double>(source_->Counts().lostFrames), 75, 2);
    EXPECT_EQ(notices_.CountOf("jumped"), 0u);
}

INSTANTIATE_TEST_SUITE_P(All, ClockStepForward,
                         testing::Values(Step{"3.0", 82}, Step{"3.0", 95}, Step{"3.0", 105}));

class ShortClockStepForward : public ClockStep {};

/// As a loss of both media would: what stands behind it is the same, and nobody can tell.
TEST_P(ShortClockStepForward, LeavesSoundAndPictureInStep) {
    const auto units = ReadStep();
    const SentMedia sent(Path("whole.ts"));
    const auto pictures = sent.Find(Medium::kVideo, units);
    ASSERT_EQ(pictures.size(), 100u);
    const auto sounds = sent.Find(Medium::kAudio, units);
    ASSERT_FALSE(sounds.empty());
    for (const SentMedia::Arrival& sound : sounds) {
        const bool before = sound.number < std::min<std::size_t>(GetParam().sounds, 93);
        if (before || sound.number >= std::max<std::size_t>(GetParam().sounds, 100)) {
            const std::int64_t offset = (before ? pictures.front() : pictures.back()).offset;
            EXPECT_LE(std::abs(sound.offset - offset), 960) << sound.number;
        }
    }
    const auto lost = static_cast<double>(source_->Counts().lostFrames);
    EXPECT_NEAR(lost, std::stod(GetParam().seconds) * 25, 0.6);
    EXPECT_NEAR(static_cast<double>(pictures.back().offset - pictures.front().offset), lost * 3600, 90);
}

INSTANTIATE_TEST_SUITE_P(All, ShortClockStepForward, testing::Values(Step{"0.04", 95}));

}  // namespace
}  // namespace receiver
