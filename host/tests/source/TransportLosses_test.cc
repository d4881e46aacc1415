// What a network loses of a transport stream, in bursts of any length and at any place: what is left is in
// step.

#include <gtest/gtest.h>

#include <algorithm>
#include <random>

#include "SentMedia.h"
#include "SourceTesting.h"
#include "damaged/TransportStream.h"

namespace receiver {
namespace {

using endtoend::Pieces;

/// Packets of a datagram, of the longest burst, and between two bursts, at the least and beyond that.
constexpr std::size_t kDatagram = 7;
constexpr std::size_t kLongestBurst = 120;
constexpr std::size_t kShortBurst = 12;
constexpr std::size_t kQuiet = 400;

/// Takes bursts out, in steps of so many packets, short ones and long ones. The tables stay.
Pieces TakeBursts(const Pieces& pieces, std::size_t step, std::mt19937& random) {
    Pieces left;
    std::size_t next = kQuiet;
    for (std::size_t at = 0; at < pieces.size();) {
        if (at >= next) {
            const std::size_t length = 1 + random() % (random() % 2 == 0 ? kShortBurst : kLongestBurst);
            at += (length + step - 1) / step * step;
            next = at + kQuiet + random() % kQuiet;
            continue;
        }
        const std::size_t end = std::min(at + step, pieces.size());
        left.insert(left.end(), pieces.begin() + static_cast<std::ptrdiff_t>(at),
                    pieces.begin() + static_cast<std::ptrdiff_t>(end));
        at = end;
    }
    return left;
}

class TransportLosses : public SourceTest {
 protected:
    /// Thirty seconds. `more`: arguments of ffmpeg, `encoder`: of x264.
    void Make(const std::string& more, const std::string& encoder = "bframes=0") const {
        Ffmpeg(
            "-f lavfi -i testsrc2=size=96x64:rate=25:duration=30 -f lavfi -i "
            "anoisesrc=sample_rate=48000:seed=7:amplitude=0.2:duration=30" +
            std::string(kPlainH264) + "-x264-params repeat-headers=1:" + encoder + " " + more + " whole.ts");
    }
    /// Takes some fifteen bursts out for each seed, and expects that each frame of audio that came stands as
    /// the pictures do, and that at least `sounds` of them came.
    void ExpectInStepBehindLosses(std::size_t sounds, unsigned seeds = kSeeds) {
        const SentMedia sent(Path("whole.ts"));
        const Pieces pieces = endtoend::ReadPieces(Path("whole.ts"));
        for (unsigned seed = 1; seed <= seeds; ++seed) {
            SCOPED_TRACE(seed);
            std::mt19937 random(seed);
            endtoend::WritePieces(TakeBursts(pieces, seed % 2 == 0 ? kDatagram : 1, random),
                                  Path("damaged.ts"));
            const auto source = OpenSource(Fast("damaged.ts"), notices_, nullptr);
            const auto units = ReadAll(*source);
            const auto pictures = sent.Find(Medium::kVideo, units);
            ASSERT_FALSE(pictures.empty());
            const auto found = sent.Find(Medium::kAudio, units);
            EXPECT_GE(found.size(), sounds);
            std::int64_t furthest = 0;
            for (const SentMedia::Arrival& sound : found) {
                furthest = std::max(furthest, std::abs(sound.offset - pictures.front().offset));
            }
            EXPECT_LE(furthest, kHalfAudioFrame);
            for (const SentMedia::Arrival& picture : pictures) {
                EXPECT_NEAR(static_cast<double>(picture.offset), static_cast<double>(pictures.front().offset),
                            90);
            }
            ExpectTurnsOfWhatIsShown(units);
            EXPECT_GT(source->Counts().lostFrames, 0u);
        }
        EXPECT_GT(notices_.CountOf("the source has gaps: "), 0u);
    }

 private:
    /// Each picture is shown in the turn of another one, or of itself, and each turn has one.
    static void ExpectTurnsOfWhatIsShown(const std::vector<SourceUnit>& units) {
        std::vector<std::int64_t> turns;
        std::vector<std::int64_t> shown;
        for (const SourceUnit& unit : Of(Medium::kVideo, units)) {
            turns.push_back(unit.time);
            shown.push_back(unit.time + unit.later);
        }
        EXPECT_TRUE(std::is_sorted(turns.begin(), turns.end()));
        std::sort(shown.begin(), shown.end());
        EXPECT_EQ(turns, shown);
    }

    static constexpr unsigned kSeeds = 24;
};

/// A unit of the stream holds eleven frames in sixteen packets, and the counter of packets has four bits:
/// what is lost as a whole leaves no mark.
TEST_F(TransportLosses, LeaveAacInStep) {
    Make("-c:a aac -ar 48000 -ac 2 -b:a 96k");
    ExpectInStepBehindLosses(1100);
}

TEST_F(TransportLosses, LeaveAacInStepThatComesFrameByFrame) {
    Make("-c:a aac -ar 48000 -ac 2 -b:a 96k -pes_payload_size 0");
    ExpectInStepBehindLosses(1100);
}

TEST_F(TransportLosses, LeaveReorderedPicturesInTheirTurnsAndInStep) {
    Make("-c:a aac -ar 48000 -ac 2 -b:a 96k -pes_payload_size 0",
         "bframes=3:b-adapt=0:b-pyramid=normal:open-gop=0:keyint=24");
    ExpectInStepBehindLosses(1000, 8);
}

/// Sound that is converted is not left to the stamps of its frames alone: what is missing is told all the
/// same.
struct Converted {
    const char* name;
    /// Arguments of ffmpeg.
    const char* codec;
    /// Samples of a frame at 48 kHz.
    std::int64_t frame;
};
void PrintTo(const Converted& sound, std::ostream* out) {
    *out << sound.name;
}

class ConvertedSound : public TransportLosses, public testing::WithParamInterface<Converted> {
 protected:
    /// Takes the frames `first` to `last` out.
    std::vector<SourceUnit> ReadWithout(int first, int last) {
        Make(GetParam().codec);
        Ffmpeg("-copyts -i whole.ts -c copy -bsf:a 'noise=drop=between(n\\," + std::to_string(first) + "\\," +
               std::to_string(last) + ")' -muxdelay 0 cut.ts");
        source_ = OpenSource(Fast("cut.ts"), notices_, nullptr);
        return ReadAll(*source_);
    }
    /// No frame of audio may be missing, whatever stands in for it.
    static void ExpectSteady(const std::vector<SourceUnit>& units) {
        const auto sounds = Of(Medium::kAudio, units);
        ASSERT_FALSE(sounds.empty());
        for (std::size_t at = 1; at < sounds.size(); ++at) {
            EXPECT_EQ(sounds[at].time - sounds[at - 1].time, 1024);
        }
    }
    std::unique_ptr<SourceInterface> source_;
};

TEST_P(ConvertedSound, ThatIsMissingIsCountedFrameByFrame) {
    ExpectSteady(ReadWithout(400, 439));
    const double missing = static_cast<double>(40 * GetParam().frame) / 1024;
    EXPECT_NEAR(static_cast<double>(source_->Counts().silentFrames), missing, 1);
    EXPECT_EQ(source_->Counts().lostFrames, 0u);
    EXPECT_GE(notices_.CountOf("missing and filled with silence"), 1u)
        << testing::PrintToString(notices_.sentences);
}

TEST_P(ConvertedSound, OfASingleFrameThatIsMissingIsTold) {
    ExpectSteady(ReadWithout(400, 400));
    EXPECT_GE(source_->Counts().silentFrames, 1u);
    EXPECT_LE(source_->Counts().silentFrames, 2u);
    EXPECT_GE(notices_.CountOf("missing and filled with silence"), 1u)
        << testing::PrintToString(notices_.sentences);
}

TEST_P(ConvertedSound, ThatIsWholeHasNoSilence) {
    ExpectSteady(ReadWithout(-1, -1));
    EXPECT_EQ(source_->Counts().silentFrames, 0u);
    EXPECT_EQ(notices_.CountOf("gaps"), 0u) << testing::PrintToString(notices_.sentences);
}

INSTANTIATE_TEST_SUITE_P(All, ConvertedSound,
                         testing::Values(Converted{"MP2", "-c:a mp2 -ar 48000 -ac 2", 1152},
                                         Converted{"AC-3", "-c:a ac3 -ar 48000 -ac 2", 1536}));

}  // namespace
}  // namespace receiver
