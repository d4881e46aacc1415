// Transport streams that a network, a sender or a disk has damaged, each from a file at full speed.

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "damaged/Damage.h"
#include "damaged/DamagedFixture.h"

namespace endtoend {
namespace {

struct Case {
    const char* name;
    Damage damage;
    Expectation expected;
    std::uint32_t seed = 1;
};

std::ostream& operator<<(std::ostream& out, const Case& parameters) {
    return out << parameters.name;
}

class DamagedStreamTest : public DamagedFixture, public ::testing::WithParamInterface<Case> {};

TEST_P(DamagedStreamTest, IsRecordedInStepOrRefusedWithASentence) {
    const DamagedMaterial& material = DamagedMaterial::Get();
    Random random(GetParam().seed);
    const auto file = folder.Path() / "damaged.ts";
    WritePieces(GetParam().damage(material.pieces, random), file);
    const auto receiver = Start(FastOptions(file));
    ExpectEnd(*receiver, GetParam().expected, material.file);
}

constexpr std::int64_t kSecond = 90000;
constexpr const char* kGaps = "the source has gaps: ";
constexpr const char* kSilence = "missing and filled with silence";
constexpr const char* kJumped = "the source's clock jumped by ";
const Pids kVideo{kVideoPid};
const Pids kAudio{kAudioPid};
const Pids kTables{kTablePid, kMapPid};

const Expectation kUnharmed{.code = kEverything, .pictures = 200};
const Expectation kPicturesLost{.sentence = kGaps};
const Expectation kSoundsLost{.sentence = kSilence, .pictures = 200};

INSTANTIATE_TEST_SUITE_P(
    OneInAHundred, DamagedStreamTest,
    ::testing::Values(
        Case{"NoneAtAll", JumpBy(0, 0), kUnharmed}, Case{"Dropped", Drop(), kPicturesLost},
        // Of the first picture nobody tells that it lacks a packet.
        Case{"DroppedOtherwise", Drop(), {.sentence = kGaps, .damaged = 1}, 2},
        Case{"DroppedVideo", Drop(kVideo), kPicturesLost}, Case{"DroppedAudio", Drop(kAudio), kSoundsLost},
        Case{"DroppedTables", Drop(kTables), kUnharmed}, Case{"Reordered", Reorder(), kPicturesLost},
        Case{"ReorderedOtherwise", Reorder(), {.sentence = kGaps, .damaged = 1}, 2},
        Case{"ReorderedVideo", Reorder(kVideo), kPicturesLost},
        Case{"ReorderedAudio", Reorder(kAudio), kSoundsLost},
        Case{"ReorderedTables", Reorder(kTables), kUnharmed},
        // libavformat takes a packet that comes twice for a loss, and stamps the sound behind it late by what
        // came twice.
        Case{"Doubled", Double(), {.sentence = kGaps, .outOfStep = 0.25}},
        Case{"DoubledVideo", Double(kVideo), kPicturesLost},
        Case{"DoubledAudio", Double(kAudio), {.sentence = kSilence, .pictures = 200, .outOfStep = 0.25}},
        Case{"DoubledTables", Double(kTables), kUnharmed},
        // A transport stream has no checksum of its media: what was flipped in a picture is recorded.
        Case{"Flipped", Flip(), {.code = kEverything, .otherCode = kLost, .damaged = 30}},
        Case{"FlippedVideo", Flip(kVideo), {.code = kEverything, .otherCode = kLost, .damaged = 30}},
        Case{"FlippedTables", Flip(kTables), kUnharmed}, Case{"FlippedHeaders", FlipHeaders(), kPicturesLost},
        Case{"FlippedHeadersOtherwise", FlipHeaders(), {.sentence = kGaps, .damaged = 1}, 2},
        // That nothing is missing behind a wrong counter, nobody can know.
        Case{"Miscounted", MiscountPackets(), kPicturesLost},
        Case{"MiscountedAudio", MiscountPackets(kAudio), kSoundsLost},
        Case{"Erroneous", MarkAsErroneous(), kPicturesLost}),
    ::testing::PrintToStringParamName());

INSTANTIATE_TEST_SUITE_P(
    Tables, DamagedStreamTest,
    ::testing::Values(Case{"NoPat", Remove({kTablePid}), kUnharmed},
                      Case{"NoPmt", Remove({kMapPid}), kUnharmed}, Case{"None", Remove(kTables), kUnharmed},
                      Case{"LatePat", Remove({kTablePid}, 0, 0.4), kUnharmed},
                      Case{"LatePmt", Remove({kMapPid}, 0, 0.4), kUnharmed},
                      Case{"Stop", Remove(kTables, 0.2, 1), kUnharmed},
                      Case{"MoveTheVideo",
                           Rename(kVideoPid, kVideoPid + 0x20, 0.5),
                           {.sentence = "the video moved to another stream", .pictures = 95}}),
    ::testing::PrintToStringParamName());

INSTANTIATE_TEST_SUITE_P(
    Missing, DamagedStreamTest,
    ::testing::Values(
        Case{"AudioForAWhile", Remove(kAudio, 0.4, 0.6), kSoundsLost},
        Case{"AudioAlways",
             Remove(kAudio),
             {.code = kEverything,
              .sentence = "there is no audio: silence is recorded",
              .pictures = 200,
              .audio = false}},
        Case{"VideoForAWhile", Remove(kVideo, 0.4, 0.6), {.sentence = kGaps, .pictures = 140}},
        Case{"VideoFromTheMiddleOn",
             Remove(kVideo, 0.5, 1),
             {.sentence = "the pictures ended", .pictures = 95}},
        Case{"VideoAtFirst", Remove(kVideo, 0, 0.5), {.code = kEverything, .pictures = 80}},
        Case{"VideoAlways",
             Remove(kVideo),
             {.code = kUnsuitable, .sentence = "cannot be read: no parameter sets came", .pictures = 0}},
        Case{"EverythingForAWhile", Remove({}, 0.4, 0.6), {.sentence = kGaps, .pictures = 140}},
        Case{"TheFirstIdrFrame", Remove(kVideo, 0, 0.03), {.code = kEverything, .pictures = 180}},
        Case{"TheClock", WithoutClock(), kUnharmed},
        // Sound without stamps is put where it comes.
        Case{"AudioStamps", WithoutStamps(kAudio), {.code = kEverything, .pictures = 200, .outOfStep = 0.05}},
        Case{"VideoStamps",
             WithoutStamps(kVideo),
             {.code = kUnsuitable, .sentence = "the video has no time stamps", .pictures = 0}}),
    ::testing::PrintToStringParamName());

INSTANTIATE_TEST_SUITE_P(
    Scrambled, DamagedStreamTest,
    ::testing::Values(
        Case{"Video",
             Scramble(kVideo),
             {.code = kUnsuitable, .sentence = "cannot be read: no parameter sets came", .pictures = 0}},
        Case{"Audio",
             Scramble(kAudio),
             {.code = kEverything,
              .sentence = "there is no audio: silence is recorded",
              .pictures = 200,
              .audio = false}},
        Case{"VideoForAWhile", Scramble(kVideo, 0.4, 0.6), {.sentence = kGaps, .pictures = 140}},
        Case{"AudioForAWhile", Scramble(kAudio, 0.4, 0.6), kSoundsLost},
        Case{
            "BothAtFirst", Scramble({kVideoPid, kAudioPid}, 0, 0.3), {.code = kEverything, .pictures = 120}}),
    ::testing::PrintToStringParamName());

INSTANTIATE_TEST_SUITE_P(
    Bytes, DamagedStreamTest,
    ::testing::Values(
        Case{"NoiseInFront", NoiseInFront(1000), kUnharmed},
        Case{"MuchNoiseInFront", NoiseInFront(300000), kUnharmed},
        Case{"NoiseInside", NoiseAt(0.5, 1000), kUnharmed},
        Case{"MuchNoiseInside", NoiseAt(0.5, 300000), kUnharmed},
        Case{"PacketCutInside", CutAt(0.5, 100), {.sentence = kGaps, .pictures = 195}},
        Case{"PacketCutInFront", CutAt(0, 100), kUnharmed},
        // That the last picture is not whole, nobody can know.
        Case{"EndInsideAPacket", EndAt(0.5), {.code = kEverything, .pictures = 95, .damaged = 1}},
        Case{"EmptyFile",
             Nothing(),
             {.code = kUnavailable,
              .sentence = "carries nothing that is known as audio and video",
              .pictures = 0}},
        Case{"NoiseAlone",
             OnlyNoise(100000),
             {.code = kUnavailable,
              .sentence = "carries nothing that is known as audio and video",
              .pictures = 0}},
        Case{"EmptyVideoUnits", EmptyUnits(kVideoPid), kUnharmed},
        Case{"EmptyAudioUnits", EmptyUnits(kAudioPid), kUnharmed},
        Case{"ParameterSetsForAWhile", BreakParameterSets(0.4, 0.6), kUnharmed},
        Case{"ParameterSetsAlways",
             BreakParameterSets(0, 1),
             {.code = kUnsuitable, .sentence = "cannot be read: no parameter sets came", .pictures = 0}},
        Case{"TwoSenders",
             [](const Pieces& pieces, Random& random) {
                 return Interleave(pieces, JumpBy(777777, 0)(pieces, random));
             },
             {.code = kUnavailable,
              .sentence = "look for a second sender at the same address",
              .pictures = 0}}),
    ::testing::PrintToStringParamName());

const Expectation kGoesOn{.code = kEverything, .sentence = kJumped, .pictures = 200};

INSTANTIATE_TEST_SUITE_P(
    Stamps, DamagedStreamTest,
    ::testing::Values(
        Case{"Wrap", WrapAt(0.5), kUnharmed}, Case{"WrapEarly", WrapAt(0.05), kUnharmed},
        Case{"JumpForward", JumpBy(3600 * kSecond, 0.5), kGoesOn},
        Case{"JumpBack", JumpBy(-3600 * kSecond, 0.5), kGoesOn},
        Case{"JumpForwardABit", JumpBy(20 * kSecond, 0.5), kGoesOn},
        Case{"JumpBackABit", JumpBy(-3 * kSecond, 0.5), kGoesOn},
        // So much may as well be missing.
        Case{"LeaveOutThreeSeconds", JumpBy(3 * kSecond, 0.5), {.sentence = "75 video frames lost"}},
        Case{"JumpForwardInTheAudio", JumpBy(20 * kSecond, 0.5, kAudio), kGoesOn},
        Case{"JumpBackInTheAudio", JumpBy(-20 * kSecond, 0.5, kAudio), kGoesOn},
        Case{"JumpForwardInTheVideo", JumpBy(20 * kSecond, 0.5, kVideo), kGoesOn},
        Case{"JumpBackInTheVideo", JumpBy(-20 * kSecond, 0.5, kVideo), kGoesOn},
        // Of two clocks nobody knows what belongs together: the sound is put where it comes.
        Case{"OfTwoClocks",
             JumpBy(600 * kSecond, 0, kAudio),
             {.code = kEverything, .sentence = kJumped, .pictures = 200, .outOfStep = 0.05}},
        Case{"StandStillInTheVideo", StandStillAt(0.5, kVideo), kUnharmed}),
    ::testing::PrintToStringParamName());

}  // namespace
}  // namespace endtoend
