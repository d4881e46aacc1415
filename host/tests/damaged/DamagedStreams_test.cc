// Transport streams that a network, a sender or a disk has damaged, each from a file at full speed.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "damaged/Damage.h"
#include "damaged/DamagedFixture.h"

namespace endtoend {
namespace {

struct StreamCase {
    const char* name;
    Damage damage;
    Expectation expected;
    std::uint32_t seed = 1;
};

std::ostream& operator<<(std::ostream& out, const StreamCase& parameters) {
    return out << parameters.name;
}

class DamagedStreamTest : public DamagedFixture, public ::testing::WithParamInterface<StreamCase> {};

TEST_P(DamagedStreamTest, IsRecordedInStepOrRefusedWithASentence) {
    const DamagedMaterial& material = DamagedMaterial::Get();
    Random random(GetParam().seed);
    const auto file = folder.Path() / "damaged.ts";
    const Pieces damaged = GetParam().damage(material.pieces, random);
    WritePieces(damaged, file);
    const auto receiver = Start(FastOptions(file));
    ExpectEnd(*receiver, GetParam().expected, IntactOf(material.pieces, damaged));
}

constexpr std::int64_t kSecond = 90000;
constexpr const char* kGaps = "the source has gaps: ";
constexpr const char* kSilence = "missing and filled with silence";
constexpr const char* kJumped = "the source's clock jumped by ";
const Pids kVideo{kVideoPid};
const Pids kAudio{kAudioPid};
const Pids kTables{kTablePid, kMapPid};

const Expectation kUnharmed{.code = kEverything, .unharmed = true};
const Expectation kPicturesLost{.sentence = kGaps};
const Expectation kSoundsLost{.sentence = kSilence};
/// The pictures of a group and the sound with them: where a recording ends, the next one begins with an IDR
/// frame.
const Owed kGroup{10, 19};

INSTANTIATE_TEST_SUITE_P(
    OneInAHundred, DamagedStreamTest,
    ::testing::Values(
        StreamCase{"NoneAtAll", JumpBy(0, 0), kUnharmed}, StreamCase{"Dropped", Drop(), kPicturesLost},
        // Of the first picture nobody tells that it lacks a packet.
        StreamCase{"DroppedOtherwise", Drop(), {.sentence = kGaps, .damaged = 1}, 2},
        StreamCase{"DroppedVideo", Drop(kVideo), kPicturesLost},
        StreamCase{"DroppedAudio", Drop(kAudio), kSoundsLost},
        StreamCase{"DroppedTables", Drop(kTables), kUnharmed},
        StreamCase{"Reordered", Reorder(), kPicturesLost},
        StreamCase{"ReorderedOtherwise", Reorder(), {.sentence = kGaps, .damaged = 1}, 2},
        StreamCase{"ReorderedVideo", Reorder(kVideo), kPicturesLost},
        StreamCase{"ReorderedAudio", Reorder(kAudio), kSoundsLost},
        StreamCase{"ReorderedTables", Reorder(kTables), kUnharmed},
        // libavformat takes a packet that comes twice for a loss, and stamps the sound behind it late by what
        // came twice.
        StreamCase{"Doubled", Double(), {.sentence = kGaps, .outOfStep = 0.25}},
        StreamCase{"DoubledVideo", Double(kVideo), kPicturesLost},
        StreamCase{"DoubledAudio", Double(kAudio), {.sentence = kSilence, .outOfStep = 0.25}},
        StreamCase{"DoubledTables", Double(kTables), kUnharmed},
        // A transport stream has no checksum of its media: what was flipped in a picture is recorded.
        StreamCase{"Flipped", Flip(), {.maybeUnharmed = true, .sentence = kGaps, .damaged = 30}},
        StreamCase{"FlippedVideo", Flip(kVideo), {.maybeUnharmed = true, .sentence = kGaps, .damaged = 30}},
        StreamCase{"FlippedAudio", Flip(kAudio), {.maybeUnharmed = true, .sentence = kSilence}},
        StreamCase{"FlippedTables", Flip(kTables), kUnharmed},
        StreamCase{"FlippedHeaders", FlipHeaders(), kPicturesLost},
        StreamCase{"FlippedHeadersOtherwise", FlipHeaders(), {.sentence = kGaps, .damaged = 1}, 2},
        // That nothing is missing behind a wrong counter, nobody can know.
        StreamCase{"Miscounted", MiscountPackets(), kPicturesLost},
        StreamCase{"MiscountedAudio", MiscountPackets(kAudio), kSoundsLost},
        StreamCase{"Erroneous", MarkAsErroneous(), kPicturesLost}),
    ::testing::PrintToStringParamName());

INSTANTIATE_TEST_SUITE_P(Tables, DamagedStreamTest,
                         ::testing::Values(StreamCase{"NoPat", Remove({kTablePid}), kUnharmed},
                                           StreamCase{"NoPmt", Remove({kMapPid}), kUnharmed},
                                           StreamCase{"None", Remove(kTables), kUnharmed},
                                           StreamCase{"LatePat", Remove({kTablePid}, 0, 0.4), kUnharmed},
                                           StreamCase{"LatePmt", Remove({kMapPid}, 0, 0.4), kUnharmed},
                                           StreamCase{"Stop", Remove(kTables, 0.2, 1), kUnharmed},
                                           StreamCase{"MoveTheVideo",
                                                      Rename(kVideoPid, kVideoPid + 0x20, 0.5),
                                                      {.sentence = "the video moved to another stream",
                                                       .besides = kGroup}}),
                         ::testing::PrintToStringParamName());

INSTANTIATE_TEST_SUITE_P(
    Missing, DamagedStreamTest,
    ::testing::Values(
        StreamCase{"AudioForAWhile", Remove(kAudio, 0.4, 0.6), kSoundsLost},
        StreamCase{"AudioForLong", Remove(kAudio, 0.2, 0.9), kSoundsLost},
        StreamCase{"AudioFromTheMiddleOn", Remove(kAudio, 0.5, 1), kSoundsLost},
        StreamCase{"AudioAlways",
                   Remove(kAudio),
                   {.code = kEverything, .sentence = "there is no audio: silence is recorded"}},
        StreamCase{"VideoForAWhile", Remove(kVideo, 0.4, 0.6), {.sentence = kGaps}},
        StreamCase{"VideoFromTheMiddleOn", Remove(kVideo, 0.5, 1), {.sentence = "the pictures ended"}},
        StreamCase{"VideoAtFirst", Remove(kVideo, 0, 0.5), {.code = kEverything}},
        StreamCase{
            "VideoAlways",
            Remove(kVideo),
            {.code = kUnsuitable, .sentence = "cannot be read: no parameter sets came", .refused = true}},
        StreamCase{"EverythingForAWhile", Remove({}, 0.4, 0.6), {.sentence = kGaps}},
        StreamCase{"TheFirstIdrFrame", Remove(kVideo, 0, 0.03), {.code = kEverything}},
        StreamCase{"TheClock", WithoutClock(), kUnharmed},
        // Sound without stamps is put where it comes.
        StreamCase{"AudioStamps", WithoutStamps(kAudio), {.code = kEverything, .outOfStep = 0.05}},
        StreamCase{"VideoStamps",
                   WithoutStamps(kVideo),
                   {.code = kUnsuitable, .sentence = "the video has no time stamps", .refused = true}}),
    ::testing::PrintToStringParamName());

INSTANTIATE_TEST_SUITE_P(
    Scrambled, DamagedStreamTest,
    ::testing::Values(
        StreamCase{
            "Video",
            Scramble(kVideo),
            {.code = kUnsuitable, .sentence = "cannot be read: no parameter sets came", .refused = true}},
        StreamCase{"Audio",
                   Scramble(kAudio),
                   {.code = kEverything, .sentence = "there is no audio: silence is recorded"}},
        StreamCase{"VideoForAWhile", Scramble(kVideo, 0.4, 0.6), {.sentence = kGaps}},
        StreamCase{"AudioForAWhile", Scramble(kAudio, 0.4, 0.6), kSoundsLost},
        StreamCase{"BothAtFirst", Scramble({kVideoPid, kAudioPid}, 0, 0.3), {.code = kEverything}}),
    ::testing::PrintToStringParamName());

INSTANTIATE_TEST_SUITE_P(
    Bytes, DamagedStreamTest,
    ::testing::Values(
        StreamCase{"NoiseInFront", NoiseInFront(1000), kUnharmed},
        StreamCase{"MuchNoiseInFront", NoiseInFront(300000), kUnharmed},
        StreamCase{"NoiseInside", NoiseAt(0.5, 1000), kUnharmed},
        StreamCase{"MuchNoiseInside", NoiseAt(0.5, 300000), kUnharmed},
        StreamCase{"PacketCutInside", CutAt(0.5, 100), {.sentence = kGaps}},
        // Comes again, and is recorded again. Sound and picture are cut at two places there.
        StreamCase{"Repeated", Repeat(0.4, 0.45), {.sentence = kGaps, .damaged = 15, .outOfStep = 0.022}},
        StreamCase{"PacketCutInFront", CutAt(0, 100), kUnharmed},
        // That the last picture is not whole, nobody can know.
        StreamCase{"EndInsideAPacket", EndAt(0.5), {.code = kEverything, .damaged = 1}},
        StreamCase{"EmptyFile",
                   Nothing(),
                   {.code = kUnavailable,
                    .sentence = "carries nothing that is known as audio and video",
                    .refused = true}},
        StreamCase{"NoiseAlone",
                   OnlyNoise(100000),
                   {.code = kUnavailable,
                    .sentence = "carries nothing that is known as audio and video",
                    .refused = true}},
        StreamCase{"EmptyVideoUnits", EmptyUnits(kVideoPid), kUnharmed},
        StreamCase{"EmptyAudioUnits", EmptyUnits(kAudioPid), kUnharmed},
        StreamCase{"ParameterSetsForAWhile", BreakParameterSets(0.4, 0.6), kUnharmed},
        StreamCase{
            "ParameterSetsAlways",
            BreakParameterSets(0, 1),
            {.code = kUnsuitable, .sentence = "cannot be read: no parameter sets came", .refused = true}},
        StreamCase{"TwoSenders",
                   [](const Pieces& pieces, Random& random) {
                       return Interleave(pieces, JumpBy(777777, 0)(pieces, random));
                   },
                   {.code = kUnavailable,
                    .sentence = "look for a second sender at the same address",
                    .refused = true}}),
    ::testing::PrintToStringParamName());

const Expectation kGoesOn{.code = kEverything, .sentence = kJumped};
/// The first stamp that stands is that of a unit ten frames of sound later.
const Expectation kStands{
    .code = kEverything, .sentence = "the source's clock jumped by -213 ms", .unharmed = true};

INSTANTIATE_TEST_SUITE_P(
    Stamps, DamagedStreamTest,
    ::testing::Values(
        StreamCase{"Wrap", WrapAt(0.5), kUnharmed}, StreamCase{"WrapEarly", WrapAt(0.05), kUnharmed},
        StreamCase{"JumpForward", JumpBy(3600 * kSecond, 0.5), kGoesOn},
        StreamCase{"JumpBack", JumpBy(-3600 * kSecond, 0.5), kGoesOn},
        StreamCase{"JumpForwardABit", JumpBy(20 * kSecond, 0.5), kGoesOn},
        StreamCase{"JumpBackABit", JumpBy(-3 * kSecond, 0.5), kGoesOn},
        // So much may as well be missing. Sound and picture are cut at two places there.
        StreamCase{"LeaveOutThreeSeconds",
                   JumpBy(3 * kSecond, 0.5),
                   {.sentence = "75 video frames lost", .besides = {kGroup.pictures, kGroup.sounds + 2}}},
        StreamCase{"JumpForwardInTheAudio", JumpBy(20 * kSecond, 0.5, kAudio), kGoesOn},
        StreamCase{"JumpBackInTheAudio", JumpBy(-20 * kSecond, 0.5, kAudio), kGoesOn},
        StreamCase{"JumpForwardInTheVideo", JumpBy(20 * kSecond, 0.5, kVideo), kGoesOn},
        StreamCase{"JumpBackInTheVideo", JumpBy(-20 * kSecond, 0.5, kVideo), kGoesOn},
        // Of two clocks nobody knows what belongs together: the sound is put where it comes.
        StreamCase{"OfTwoClocks",
                   JumpBy(600 * kSecond, 0, kAudio),
                   {.code = kEverything, .sentence = kJumped, .outOfStep = 0.05}},
        StreamCase{"StandStill", StandStillAt(0.5), kStands},
        StreamCase{"StandStillInTheVideo", StandStillAt(0.5, kVideo), kUnharmed},
        StreamCase{"StandStillInTheAudio", StandStillAt(0.5, kAudio), kStands}),
    ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
