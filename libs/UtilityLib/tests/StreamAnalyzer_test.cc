#include "StreamAnalyzer.h"

#include <gtest/gtest.h>

#include <cstdint>
#include <limits>
#include <random>
#include <type_traits>

#include "LogCapture.h"
#include "test_units.h"

namespace nal_access {
namespace {

using namespace testing;

using Units = std::vector<std::shared_ptr<StreamData>>;
using Samples = std::vector<std::shared_ptr<SampleData>>;

ByteVector Stream(std::initializer_list<ByteVector> nals) {
    ByteVector stream;
    for (const auto& nal : nals) {
        stream = Join({stream, kStart4, nal});
    }
    return stream;
}

ByteVector WithLength(const ByteVector& nal) {
    return Join({{0, 0, 0, static_cast<unsigned char>(nal.size())}, nal});
}

std::shared_ptr<SampleData> ConvertOneVideo(StreamAnalyzer& analyzer,
                                            const std::shared_ptr<StreamData>& unit) {
    Units units = {unit};
    Samples samples;
    analyzer.ConvertVideo(units, samples);
    EXPECT_EQ(samples.size(), 1U);
    return samples.at(0);
}

ByteVector ConvertOneMeta(const ByteVector& payload, ByteVector block) {
    Units units = {MakeUnit(payload)};
    Samples samples;
    StreamAnalyzer().ConvertMeta(units, samples, block);
    EXPECT_EQ(samples.size(), 1U);
    EXPECT_TRUE(samples.at(0)->GetSync());
    return BytesOf(*samples.at(0));
}

struct Tmcd {
    ByteVector bytes;
    bool dropFrame = false;
    bool found = false;
};

Tmcd ReadTmcd(const ByteVector& item, unsigned int frames, int offset) {
    Tmcd result;
    std::shared_ptr<SampleData> sample;
    StreamAnalyzer().ConvertTmcd(MakeUnit(LocalSet(Join({kOwnIdentifier, item}))), sample, result.dropFrame,
                                 frames, offset);
    if (sample) {
        result.found = true;
        result.bytes = BytesOf(*sample);
    }
    return result;
}

TEST(StreamAnalyzer, HasAVirtualDestructorAndNeedsNoSetup) {
    static_assert(std::has_virtual_destructor_v<StreamAnalyzer>);
    static_assert(std::is_default_constructible_v<StreamAnalyzer>);
}

// IsAccessUnitStart

TEST(IsAccessUnitStart, FindsAnIdrPictureAndItsParameterSets) {
    StreamAnalyzer analyzer;
    NalUnit sps;
    NalUnit pps;
    EXPECT_TRUE(analyzer.IsAccessUnitStart(MakeUnit(Stream({kDelimiter, kSps0, kPps0, kIdrPps0})), sps, pps));
    EXPECT_EQ(BytesOf(sps), kSps0);
    EXPECT_EQ(BytesOf(pps), kPps0);
}

TEST(IsAccessUnitStart, TakesStartCodesOfThreeBytes) {
    StreamAnalyzer analyzer;
    NalUnit sps;
    NalUnit pps;
    EXPECT_TRUE(analyzer.IsAccessUnitStart(
        MakeUnit(Join({kStart3, kSps0, kStart3, kPps0, kStart3, kIdrPps0})), sps, pps));
    EXPECT_EQ(BytesOf(sps), kSps0);
    EXPECT_EQ(BytesOf(pps), kPps0);
}

TEST(IsAccessUnitStart, TakesTheParameterSetsThatTheSliceRefersTo) {
    StreamAnalyzer analyzer;
    NalUnit sps;
    NalUnit pps;
    EXPECT_TRUE(
        analyzer.IsAccessUnitStart(MakeUnit(Stream({kSps0, kSps1, kPps0, kPps1Sps1, kIdrPps1})), sps, pps));
    EXPECT_EQ(BytesOf(sps), kSps1);
    EXPECT_EQ(BytesOf(pps), kPps1Sps1);
}

TEST(IsAccessUnitStart, GivesSizeZeroForASetThatIsNotInTheUnit) {
    StreamAnalyzer analyzer;
    NalUnit sps;
    NalUnit pps;
    EXPECT_TRUE(analyzer.IsAccessUnitStart(MakeUnit(Stream({kIdrPps0})), sps, pps));
    EXPECT_EQ(sps.size, 0U);
    EXPECT_EQ(pps.size, 0U);
    EXPECT_TRUE(analyzer.IsAccessUnitStart(MakeUnit(Stream({kSps0, kIdrPps0})), sps, pps));
    EXPECT_EQ(BytesOf(sps), kSps0);
    EXPECT_EQ(pps.size, 0U);
    EXPECT_TRUE(analyzer.IsAccessUnitStart(MakeUnit(Stream({kPps0, kIdrPps0})), sps, pps));
    EXPECT_EQ(sps.size, 0U);
    EXPECT_EQ(BytesOf(pps), kPps0);
}

TEST(IsAccessUnitStart, IsFalseWithoutAnIdrSliceThatStartsThePicture) {
    StreamAnalyzer analyzer;
    NalUnit sps;
    NalUnit pps;
    EXPECT_TRUE(analyzer.IsAccessUnitStart(MakeUnit(Stream({kSps0, kPps0, kIdrPps0})), sps, pps));
    EXPECT_FALSE(analyzer.IsAccessUnitStart(MakeUnit(Stream({kSps0, kPps0, kSlice})), sps, pps));
    EXPECT_EQ(sps.size, 0U);
    EXPECT_EQ(pps.size, 0U);
    EXPECT_FALSE(analyzer.IsAccessUnitStart(MakeUnit(Stream({kSps0, kPps0, kIdrSecondSlice})), sps, pps));
    EXPECT_TRUE(
        analyzer.IsAccessUnitStart(MakeUnit(Stream({kIdrSecondSlice, kSps0, kPps0, kIdrPps0})), sps, pps));
}

TEST(IsAccessUnitStart, IsFalseForUnitsWithoutPayload) {
    StreamAnalyzer analyzer;
    NalUnit sps;
    NalUnit pps;
    EXPECT_FALSE(analyzer.IsAccessUnitStart(nullptr, sps, pps));
    EXPECT_FALSE(analyzer.IsAccessUnitStart(std::make_shared<StreamData>(), sps, pps));
    EXPECT_FALSE(analyzer.IsAccessUnitStart(MakeUnit({}), sps, pps));
}

TEST(IsAccessUnitStart, GivesCopiesThatOutliveTheUnit) {
    NalUnit sps;
    NalUnit pps;
    StreamAnalyzer().IsAccessUnitStart(MakeUnit(Stream({kSps0, kPps0, kIdrPps0})), sps, pps);
    EXPECT_EQ(BytesOf(sps), kSps0);
}

// ConvertVideo

TEST(ConvertVideo, WritesNalUnitsBehindTheirLengths) {
    StreamAnalyzer analyzer;
    const auto sample = ConvertOneVideo(analyzer, MakeUnit(Stream({kSlice, kSlice}), 90003, 1000));
    EXPECT_EQ(BytesOf(*sample),
              (ByteVector{0, 0, 0, 4, 0x41, 0x9A, 0x21, 0x55, 0, 0, 0, 4, 0x41, 0x9A, 0x21, 0x55}));
    EXPECT_EQ(sample->GetRtpTimestamp(), 90003U);
    EXPECT_EQ(sample->GetTimestamp(), 1000U);
    EXPECT_EQ(sample->GetDuration(), 0U);
    EXPECT_FALSE(sample->GetSync());
}

TEST(ConvertVideo, WritesLengthsBigEndian) {
    ByteVector nal(70000, 0xEE);
    nal[0] = 0x41;
    StreamAnalyzer analyzer;
    const auto sample = ConvertOneVideo(analyzer, MakeUnit(Stream({nal})));
    EXPECT_EQ(BytesOf(*sample), Join({{0x00, 0x01, 0x11, 0x70}, nal}));
}

TEST(ConvertVideo, MarksASampleWithAnIdrSliceAsSync) {
    StreamAnalyzer analyzer;
    EXPECT_TRUE(ConvertOneVideo(analyzer, MakeUnit(Stream({kSps0, kPps0, kIdrPps0})))->GetSync());
    EXPECT_TRUE(ConvertOneVideo(analyzer, MakeUnit(Stream({kIdrSecondSlice})))->GetSync());
    EXPECT_FALSE(ConvertOneVideo(analyzer, MakeUnit(Stream({kSps0, kPps0, kSlice})))->GetSync());
}

TEST(ConvertVideo, DropsDelimitersEndsAndFiller) {
    StreamAnalyzer analyzer;
    const auto sample = ConvertOneVideo(
        analyzer,
        MakeUnit(Stream({kDelimiter, {0x06, 0x05, 0x01, 0x80}, kSlice, {0x0C, 0xFF, 0x80}, {0x0A}, {0x0B}})));
    EXPECT_EQ(BytesOf(*sample), Join({WithLength({0x06, 0x05, 0x01, 0x80}), WithLength(kSlice)}));
}

TEST(ConvertVideo, DropsParameterSetsEqualToTheFirst) {
    StreamAnalyzer analyzer;
    EXPECT_EQ(BytesOf(*ConvertOneVideo(analyzer, MakeUnit(Stream({kSps0, kPps0, kIdrPps0})))),
              WithLength(kIdrPps0));
    EXPECT_EQ(BytesOf(*ConvertOneVideo(analyzer, MakeUnit(Stream({kSps0, kPps0, kIdrPps0})))),
              WithLength(kIdrPps0));
}

TEST(ConvertVideo, KeepsOtherParameterSetsInBand) {
    StreamAnalyzer analyzer;
    EXPECT_EQ(BytesOf(*ConvertOneVideo(analyzer, MakeUnit(Stream({kSps0, kPps0, kPps1Sps0, kIdrPps0})))),
              Join({WithLength(kPps1Sps0), WithLength(kIdrPps0)}));
}

TEST(ConvertVideo, KeepsEverySetAfterAReplacementSoThatNoPictureBecomesUndecodable) {
    StreamAnalyzer analyzer;
    ConvertOneVideo(analyzer, MakeUnit(Stream({kSps0, kPps0, kIdrPps0})));
    EXPECT_EQ(BytesOf(*ConvertOneVideo(analyzer, MakeUnit(Stream({kSps0Other, kPps0, kIdrPps0})))),
              Join({WithLength(kSps0Other), WithLength(kPps0), WithLength(kIdrPps0)}));
    EXPECT_EQ(BytesOf(*ConvertOneVideo(analyzer, MakeUnit(Stream({kSps0, kPps0, kIdrPps0})))),
              Join({WithLength(kSps0), WithLength(kPps0), WithLength(kIdrPps0)}));
}

TEST(ConvertVideo, RemembersParameterSetsPerAnalyser) {
    StreamAnalyzer first;
    ConvertOneVideo(first, MakeUnit(Stream({kSps0, kPps0, kIdrPps0})));
    StreamAnalyzer second;
    EXPECT_EQ(BytesOf(*ConvertOneVideo(second, MakeUnit(Stream({kSps0Other, kPps0, kIdrPps0})))),
              WithLength(kIdrPps0));
}

TEST(ConvertVideo, LeavesOutZeroBytesThatTrailANalUnit) {
    StreamAnalyzer analyzer;
    EXPECT_EQ(BytesOf(*ConvertOneVideo(
                  analyzer, MakeUnit(Join({kStart4, kSlice, {0, 0, 0}, kStart4, kSlice, {0, 0}})))),
              Join({WithLength(kSlice), WithLength(kSlice)}));
}

TEST(ConvertVideo, GivesAnEmptySampleAndOneLineForAUnitWithoutNalUnit) {
    const LogCapture log;
    StreamAnalyzer analyzer;
    const auto sample = ConvertOneVideo(analyzer, MakeUnit({0x12, 0x34, 0x56}, 77, 5));
    EXPECT_EQ(sample->GetDataSize(), 0U);
    EXPECT_EQ(sample->GetRtpTimestamp(), 77U);
    EXPECT_EQ(sample->GetTimestamp(), 5U);
    EXPECT_FALSE(sample->GetSync());
    ASSERT_EQ(log.Lines().size(), 1U);
    const CapturedLine line = log.Lines()[0];
    EXPECT_EQ(line.priority, LOG_PRIORITY_WARNING);
    EXPECT_EQ(line.text, "no nal unit. rtp_timestamp = 77, size = 3.");
    EXPECT_EQ(line.function, "nal_access::StreamAnalyzer::ConvertVideo");
    EXPECT_EQ(line.file, "libs/UtilityLib/src/StreamAnalyzer.cc");
}

TEST(ConvertVideo, GivesAnEmptySampleAndOneLineWhenNothingIsLeft) {
    const LogCapture log;
    StreamAnalyzer analyzer;
    EXPECT_EQ(ConvertOneVideo(analyzer, MakeUnit(Stream({kDelimiter}), 78))->GetDataSize(), 0U);
    EXPECT_EQ(log.Texts(), (std::vector<std::string>{"no nal unit. rtp_timestamp = 78, size = 6."}));
}

TEST(ConvertVideo, GivesAnEmptySampleForAUnitBeyond32Bits) {
    const LogCapture log;
    const auto unit = MakeUnit(Stream({kSlice}), 79);
    unit->size = std::uint64_t{1} << 32;
    StreamAnalyzer analyzer;
    EXPECT_EQ(ConvertOneVideo(analyzer, unit)->GetDataSize(), 0U);
    EXPECT_TRUE(log.Contains("no nal unit. rtp_timestamp = 79, size = 4294967296."));
}

TEST(ConvertVideo, AppendsExactlyOneSampleAUnitInOrder) {
    const LogCapture log;
    Units units = {MakeUnit(Stream({kSlice}), 1), MakeUnit({}, 2), std::make_shared<StreamData>(), nullptr,
                   MakeUnit(Stream({kIdrPps0}), 5)};
    Samples samples = {std::make_shared<SampleData>(ByteVector{1}, 100, 0, false)};
    StreamAnalyzer().ConvertVideo(units, samples);
    ASSERT_EQ(samples.size(), 6U);
    EXPECT_EQ(samples[0]->GetRtpTimestamp(), 100U);
    EXPECT_EQ(samples[1]->GetRtpTimestamp(), 1U);
    EXPECT_EQ(samples[2]->GetRtpTimestamp(), 2U);
    EXPECT_EQ(samples[5]->GetRtpTimestamp(), 5U);
    EXPECT_EQ(log.Lines().size(), 3U);
}

// ConvertAudio

TEST(ConvertAudio, RemovesAdtsHeadersAndPassesRawFrames) {
    Units units = {
        MakeUnit({0xFF, 0xF1, 0x4C, 0x80, 0x01, 0x5F, 0xFC, 0x21, 0x1A, 0x2B}, 1024, 21),
        MakeUnit({0xFF, 0xF0, 0x4C, 0x80, 0x01, 0x9F, 0xFC, 0xC1, 0xC2, 0x21, 0x1A, 0x2B}, 2048, 42),
        MakeUnit({0x21, 0x1A, 0x2B}, 3072, 64), nullptr};
    Samples samples;
    StreamAnalyzer().ConvertAudio(units, samples);
    ASSERT_EQ(samples.size(), 4U);
    for (unsigned int i = 0; i < 3; ++i) {
        EXPECT_EQ(BytesOf(*samples[i]), (ByteVector{0x21, 0x1A, 0x2B}));
        EXPECT_EQ(samples[i]->GetRtpTimestamp(), 1024U * (i + 1));
        EXPECT_TRUE(samples[i]->GetSync());
        EXPECT_EQ(samples[i]->GetDuration(), 0U);
    }
    EXPECT_EQ(samples[1]->GetTimestamp(), 42U);
    EXPECT_EQ(samples[3]->GetDataSize(), 0U);
}

// ConvertMeta

TEST(ConvertMeta, PutsTheBlockBehindThePayload) {
    EXPECT_EQ(ConvertOneMeta(kForeignPacket, kBlock), Join({kForeignPacket, kBlock}));
    EXPECT_EQ(ConvertOneMeta(LocalSet(kOwnIdentifier), kBlock), Join({LocalSet(kOwnIdentifier), kBlock}));
}

TEST(ConvertMeta, LeavesTheBlockOutWhenThePayloadHasItsSet) {
    const ByteVector payload = Join({kForeignPacket, kBlock});
    EXPECT_EQ(ConvertOneMeta(payload, kBlock), payload);
    // The same identifier with other items, in a set with a short length.
    const ByteVector set = LocalSet(Join({ByteVector(kBlock.begin() + 21, kBlock.begin() + 41), kFlagOn}));
    EXPECT_EQ(ConvertOneMeta(set, kBlock), set);
}

TEST(ConvertMeta, PassesThePayloadWithAnEmptyBlock) {
    EXPECT_EQ(ConvertOneMeta(kForeignPacket, {}), kForeignPacket);
}

TEST(ConvertMeta, AddsABlockWithoutIdentifierAlways) {
    EXPECT_EQ(ConvertOneMeta(kBlock, {0x55}), Join({kBlock, {0x55}}));
}

TEST(ConvertMeta, GivesExactlyOneSampleAUnit) {
    Units units = {MakeUnit(kForeignPacket, 3003, 33), MakeUnit({}, 6006, 67), nullptr};
    Samples samples;
    ByteVector block = kBlock;
    StreamAnalyzer().ConvertMeta(units, samples, block);
    ASSERT_EQ(samples.size(), 3U);
    EXPECT_EQ(samples[0]->GetRtpTimestamp(), 3003U);
    EXPECT_EQ(samples[0]->GetTimestamp(), 33U);
    EXPECT_EQ(samples[0]->GetDuration(), 0U);
    EXPECT_EQ(BytesOf(*samples[1]), kBlock);
    EXPECT_EQ(BytesOf(*samples[2]), kBlock);
    EXPECT_EQ(block, kBlock);
}

// ConvertTmcd

TEST(ConvertTmcd, ReadsTheRawValueWithoutARate) {
    std::shared_ptr<SampleData> sample;
    bool dropFrame = false;
    StreamAnalyzer().ConvertTmcd(
        MakeUnit(Join({kForeignPacket,
                       LocalSet(Join({kOwnIdentifier, kFlagOn, TimecodeItem(10, 11, 12, 13, 1)}))}),
                 900, 10),
        sample, dropFrame, 0, 0);
    ASSERT_TRUE(sample);
    EXPECT_EQ(BytesOf(*sample), (ByteVector{10, 11, 12, 13}));
    EXPECT_EQ(sample->GetRtpTimestamp(), 900U);
    EXPECT_EQ(sample->GetTimestamp(), 10U);
    EXPECT_TRUE(dropFrame);
}

TEST(ConvertTmcd, IgnoresTheOffsetWithoutARate) {
    EXPECT_EQ(ReadTmcd(TimecodeItem(1, 2, 3, 99, 0), 0, 7).bytes, (ByteVector{1, 2, 3, 99}));
}

TEST(ConvertTmcd, AddsTheOffsetAtTheNominalRate) {
    EXPECT_EQ(ReadTmcd(TimecodeItem(0, 59, 59, 24, 0), 25, 1).bytes, (ByteVector{1, 0, 0, 0}));
    EXPECT_EQ(ReadTmcd(TimecodeItem(1, 0, 0, 0, 0), 25, -1).bytes, (ByteVector{0, 59, 59, 24}));
    EXPECT_EQ(ReadTmcd(TimecodeItem(0, 0, 0, 0, 0), 25, -1).bytes, (ByteVector{23, 59, 59, 24}));
    EXPECT_EQ(ReadTmcd(TimecodeItem(1, 2, 3, 4, 0), 50, 0).bytes, (ByteVector{1, 2, 3, 4}));
}

TEST(ConvertTmcd, FollowsTheDropFrameRuleWhenTheFlagIsSet) {
    EXPECT_EQ(ReadTmcd(TimecodeItem(0, 0, 59, 29, 1), 30, 1).bytes, (ByteVector{0, 1, 0, 2}));
    EXPECT_EQ(ReadTmcd(TimecodeItem(0, 0, 59, 29, 0), 30, 1).bytes, (ByteVector{0, 1, 0, 0}));
    EXPECT_EQ(ReadTmcd(TimecodeItem(0, 0, 59, 59, 1), 60, 1).bytes, (ByteVector{0, 1, 0, 4}));
    EXPECT_EQ(ReadTmcd(TimecodeItem(0, 0, 59, 24, 1), 25, 1).bytes, (ByteVector{0, 1, 0, 0}));
}

TEST(ConvertTmcd, TakesTheDropFrameFlagAtEveryRate) {
    for (const unsigned int rate : {0U, 24U, 25U, 30U, 50U, 60U}) {
        EXPECT_TRUE(ReadTmcd(TimecodeItem(1, 2, 3, 4, 1), rate, 0).dropFrame) << rate;
        EXPECT_FALSE(ReadTmcd(TimecodeItem(1, 2, 3, 4, 0), rate, 0).dropFrame) << rate;
    }
}

TEST(ConvertTmcd, CountsATimecodeOutOfRangeAsNone) {
    EXPECT_FALSE(ReadTmcd(TimecodeItem(24, 0, 0, 0, 0), 0, 0).found);
    EXPECT_FALSE(ReadTmcd(TimecodeItem(0, 60, 0, 0, 0), 0, 0).found);
    EXPECT_FALSE(ReadTmcd(TimecodeItem(0, 0, 60, 0, 0), 0, 0).found);
    EXPECT_TRUE(ReadTmcd(TimecodeItem(0, 0, 0, 30, 0), 0, 0).found);
    EXPECT_FALSE(ReadTmcd(TimecodeItem(0, 0, 0, 30, 0), 30, 0).found);
}

TEST(ConvertTmcd, LeavesItsResultsAloneWithoutATimecode) {
    StreamAnalyzer analyzer;
    std::shared_ptr<SampleData> sample;
    bool dropFrame = true;
    for (const auto& unit : {std::shared_ptr<StreamData>(), std::make_shared<StreamData>(), MakeUnit({}),
                             MakeUnit(kForeignPacket), MakeUnit(LocalSet(Join({kOwnIdentifier, kFlagOn})))}) {
        analyzer.ConvertTmcd(unit, sample, dropFrame, 25, 1);
        EXPECT_FALSE(sample);
        EXPECT_TRUE(dropFrame);
    }
}

// GetRecFlg

TEST(GetRecFlg, ReadsTheRecordFlag) {
    StreamAnalyzer analyzer;
    const ByteVector on = Join({kForeignPacket, LocalSet(Join({kOwnIdentifier, kFlagOn}))});
    const ByteVector off = LocalSet(Join({kOwnIdentifier, kFlagOff}));
    EXPECT_TRUE(analyzer.GetRecFlg(on.data(), on.size()));
    EXPECT_FALSE(analyzer.GetRecFlg(off.data(), off.size()));
}

TEST(GetRecFlg, ReadsNoFlagAsFalse) {
    StreamAnalyzer analyzer;
    EXPECT_FALSE(analyzer.GetRecFlg(kForeignPacket.data(), kForeignPacket.size()));
    EXPECT_FALSE(analyzer.GetRecFlg(kForeignPacket.data(), 0));
    EXPECT_FALSE(analyzer.GetRecFlg(nullptr, 0));
    EXPECT_FALSE(analyzer.GetRecFlg(nullptr, 100));
}

// The worked example of docs/metadata-format.md.
const ByteVector kWorkedExample = {0x01,  // packet
                                   0x06, 0x0E, 0x2B, 0x34, 0x02, 0x53, 0x01, 0x01, 0x0C,
                                   0x02, 0x01, 0x01, 0x7F, 0x01, 0x00, 0x00,  // local set
                                   0x22,                                      // length 34
                                   0xE0, 0x00, 0x00, 0x10,                    // identifier
                                   0x9B, 0x1F, 0x5C, 0x2E, 0x4D, 0x60, 0x4A, 0x17, 0xA6,
                                   0x3B, 0x0E, 0x72, 0xD8, 0x41, 0xC5, 0x93,              //
                                   0xE1, 0x01, 0x00, 0x01, 0x01,                          // flag: on
                                   0xE1, 0x02, 0x00, 0x05, 0x0A, 0x14, 0x1E, 0x0C, 0x01,  // timecode
                                   0x01,                                                  // packet
                                   0x06, 0x0E, 0x2B, 0x34, 0x02, 0x0B, 0x01, 0x01, 0x0E,
                                   0x01, 0x03, 0x01, 0x01, 0x00, 0x00, 0x00,  // foreign label
                                   0x81, 0x05,                                // length 5
                                   0x41, 0x01, 0x13, 0x00, 0x00};

TEST(MetadataFormat, WorkedExampleReadsAsThePageSays) {
    ASSERT_EQ(kWorkedExample.size(), 76U);
    StreamAnalyzer analyzer;
    EXPECT_TRUE(analyzer.GetRecFlg(kWorkedExample.data(), kWorkedExample.size()));
    std::shared_ptr<SampleData> sample;
    bool dropFrame = false;
    analyzer.ConvertTmcd(MakeUnit(kWorkedExample), sample, dropFrame, 60, 0);
    ASSERT_TRUE(sample);
    EXPECT_EQ(BytesOf(*sample), (ByteVector{10, 20, 30, 12}));
    EXPECT_TRUE(dropFrame);
    EXPECT_EQ(ConvertOneMeta(kWorkedExample, kBlock), Join({kWorkedExample, kBlock}));
    EXPECT_EQ(ConvertOneMeta(kWorkedExample, kBlock).size(), 140U);
}

// ConvertTimestamp

TEST(ConvertTimestamp, RoundsToTheNearestAndHalvesUp) {
    StreamAnalyzer analyzer;
    EXPECT_EQ(analyzer.ConvertTimestamp(1024, 48000, 90000), 1920U);
    EXPECT_EQ(analyzer.ConvertTimestamp(1024, 48000, 30000), 640U);
    EXPECT_EQ(analyzer.ConvertTimestamp(1, 90000, 45000), 1U);  // 0.5
    EXPECT_EQ(analyzer.ConvertTimestamp(3, 90000, 45000), 2U);  // 1.5
    EXPECT_EQ(analyzer.ConvertTimestamp(1, 90000, 30000), 0U);  // 0.33
    EXPECT_EQ(analyzer.ConvertTimestamp(2, 90000, 30000), 1U);  // 0.67
    EXPECT_EQ(analyzer.ConvertTimestamp(12345, 48000, 48000), 12345U);
    EXPECT_EQ(analyzer.ConvertTimestamp(12345, 48000, 0), 0U);
}

TEST(ConvertTimestamp, GivesZeroFromRateZero) {
    EXPECT_EQ(StreamAnalyzer().ConvertTimestamp(12345, 0, 90000), 0U);
}

TEST(ConvertTimestamp, IsExactAtTheEndsOf64Bits) {
    StreamAnalyzer analyzer;
    constexpr std::uint64_t kMax = std::numeric_limits<std::uint64_t>::max();
    EXPECT_EQ(analyzer.ConvertTimestamp(kMax, 90000, 90000), kMax);
    EXPECT_EQ(analyzer.ConvertTimestamp(kMax, 0xFFFFFFFF, 0xFFFFFFFF), kMax);
    EXPECT_EQ(analyzer.ConvertTimestamp(kMax, 90000, 30000), kMax / 3);
    EXPECT_EQ(analyzer.ConvertTimestamp(kMax, 2, 1), std::uint64_t{1} << 63);  // 2^63 - 0.5
    EXPECT_EQ(analyzer.ConvertTimestamp(kMax, 0xFFFFFFFF, 1), 0x100000001U);
}

TEST(ConvertTimestamp, GivesTheLargestValueWhenTheResultDoesNotFit) {
    StreamAnalyzer analyzer;
    constexpr std::uint64_t kMax = std::numeric_limits<std::uint64_t>::max();
    EXPECT_EQ(analyzer.ConvertTimestamp(kMax, 1, 2), kMax);
    EXPECT_EQ(analyzer.ConvertTimestamp(kMax, 30000, 90000), kMax);
}

TEST(ConvertTimestamp, IsTheNearestValueForAnyInput) {
    __extension__ using Wide = __int128;
    StreamAnalyzer analyzer;
    std::mt19937_64 random(20261120);
    const std::vector<unsigned int> rates = {1,     2,     3,     1000,  24000,      25000,      30000,
                                             48000, 50000, 60000, 90000, 0x7FFFFFFF, 0xFFFFFFFE, 0xFFFFFFFF};
    for (int i = 0; i < 1000000; ++i) {
        // All sizes of numbers, not only the largest.
        std::uint64_t value = random() >> (random() % 64);
        const unsigned int from =
            i % 2 == 0 ? rates[random() % rates.size()] : static_cast<unsigned int>(random() >> 32) | 1U;
        const unsigned int to =
            i % 3 == 0 ? rates[random() % rates.size()] : static_cast<unsigned int>(random() >> 32);
        const Wide twice = 2 * static_cast<Wide>(value) * to;
        const std::uint64_t result = analyzer.ConvertTimestamp(value, from, to);
        // result - 1/2 <= value * to / from < result + 1/2
        const Wide middle = 2 * static_cast<Wide>(result) * from;
        const bool nearest = middle - from <= twice && twice < middle + from;
        const bool saturated = result == std::numeric_limits<std::uint64_t>::max() && twice >= middle + from;
        ASSERT_TRUE(nearest || saturated) << value << " from " << from << " to " << to << " gave " << result;
    }
}

}  // namespace
}  // namespace nal_access
